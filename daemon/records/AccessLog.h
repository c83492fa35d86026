// The log of access decisions.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/Result.h"
#include "daemon/clients/Evidence.h"
#include "daemon/records/Database.h"
#include "daemon/state/Clock.h"
#include "host/RVLog.h"

namespace records {

struct AccessLogEntry {
  std::chrono::sys_seconds time{};
  std::string accountType;
  std::optional<std::string> clientId;
  bool granted = false;
  bool requested = false;
  clients::Evidence evidence = clients::Evidence::kUnknown;
};

// How many entries are kept; the oldest go first.
inline constexpr std::int64_t kAccessLogEntries = 10'000;

// Keeps with each decision how the client was known in the calling thread's current request; unknown where it
// works for none, as the user does. Leaves out the decisions of a request that is void. Thread-safe.
class AccessLog : public RVDAccessLog {
 public:
  // The database and the log outlive the object.
  AccessLog(Database& database, RVLogService& log, state::Clock clock);

  void RVDLogAccessRequest(std::string_view accountTypeIdentifier,
                           const std::optional<std::string>& clientID,
                           bool granted,
                           bool requested,
                           double elapsed) override;

  // At most `limit` entries, newest first.
  base::Result<std::vector<AccessLogEntry>> newest(std::uint32_t limit) const;

 private:
  Database& database_;
  RVLogService& log_;
  const state::Clock clock_;
};

}  // namespace records
