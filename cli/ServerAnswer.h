// What has become, at the server, of access that was taken back.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>

#include "cli/Json.h"
#include "cli/Service.h"

namespace cli {

// Begun before access is taken back, asked after it. That the daemon's state cannot be read is no failure:
// access is taken back all the same.
class ServerAnswer {
 public:
  // clientID: whose access it is; absent: everybody's. The service outlives the object.
  ServerAnswer(Service& service, std::optional<std::string> clientID);

  // Waits a few seconds for the server's answer. Returns what to say about it in JSON ("told", "pending",
  // "nothing" where there was nothing to tell, "unknown") and in words.
  struct Report {
    const char* word;
    std::string text;
  };
  Report wait();

 private:
  using Attempts = std::map<std::pair<std::string, std::int64_t>, std::int64_t>;

  bool concerns(const Json& clientIDs) const;
  base::Result<Json> pending();
  static Attempts attemptsOf(const Json& pending);

  Service& service_;
  const std::optional<std::string> clientID_;
  bool isKnown_ = false;
  bool isThereSomethingToTell_ = false;
  Attempts before_;
};

}  // namespace cli
