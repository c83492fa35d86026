// The daemon's settings, as they stand in rvd.conf.
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "base/Result.h"

namespace config {

enum class CredentialStore { kSealed, kSecretService };

struct Settings {
  // [Server]
  std::optional<std::string> serverURL;      // URL; absent where none is set: no exchange is possible
  std::chrono::seconds transferTimeout{60};  // TimeoutSeconds, 1 to 3600
  std::optional<std::string> caFile;         // CAFile, an absolute path; absent: the system's authorities

  // [Credentials]
  CredentialStore credentialStore = CredentialStore::kSealed;  // Store, "sealed" or "secret-service"

  // [AccessLog]
  std::size_t accessLogDays = 365;  // KeepDays, 1 to 36500

  // [Limits]
  std::size_t waitingRequestsPerClient = 8;  // WaitingRequestsPerClient, 1 to 4096
  std::size_t waitingRequests = 1024;        // WaitingRequests, 1 to 4096
  std::size_t callsPerSecond = 200;          // CallsPerSecond of one client, 1 to 1000000
  std::size_t messageBytes = 1024 * 1024;    // MessageBytes, 1024 to 128 MiB
  std::size_t permissionsPerRequest = 256;   // PermissionsPerRequest, 1 to 65536
  std::size_t nameBytes = 256;               // NameBytes, 1 to 65536
};

// What is wrong with a server's URL, absent where nothing is. The end of a sentence that begins with "The
// server URL".
using URLCheck = std::function<std::optional<std::string>(const std::string& url)>;

// Reads the files in order; what a later one sets goes before what an earlier one set. A file that is not
// there sets nothing where `mustExist` is false. The failure's message names the file, and where it is in a
// line, the line and the key.
base::Result<Settings> readSettings(const std::vector<std::string>& paths,
                                    bool mustExist,
                                    const URLCheck& checkURL);

}  // namespace config
