// The one place that says which server may be spoken to.
#pragma once

#include <optional>
#include <string>

namespace http {

// A server URL after it was read and found to be allowed.
struct ServerURL {
  std::string text;          // in its normal form, without a slash at its end
  bool isEncrypted = false;  // https; otherwise plain http to a loopback address
};

// The URL, or what is wrong with it, as the end of a sentence that begins with "The server URL". Allowed
// are https to any host, and plain http to a loopback address: 127.0.0.0/8, [::1] or "localhost". A port
// and a path may stand in it; a user name, a query or a fragment may not. Exactly one of the two is set.
struct ServerURLReading {
  std::optional<ServerURL> url;
  std::optional<std::string> problem;
};
ServerURLReading readServerURL(const std::string& text);

// readServerURL's problem alone, for whoever reads the settings.
std::optional<std::string> problemWithServerURL(const std::string& text);

}  // namespace http
