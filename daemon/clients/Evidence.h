// How it is known which application a client is.
#pragma once

#include <cstdint>
#include <string_view>

namespace clients {

// Weakest first. The numbers are stored with records and log entries.
enum class Evidence : std::int64_t {
  kUnknown = 0,     // it is not known
  kRegistered = 1,  // the connection said so, and the application is installed
  kScope = 2,       // the user's service manager started it as that application
  kSandbox = 3,     // the sandbox that it runs in says so
};

// "unknown", "registered", "scope", "sandbox".
std::string_view evidenceText(Evidence evidence);

}  // namespace clients
