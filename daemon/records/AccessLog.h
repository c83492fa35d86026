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

// How many entries are kept at most, so that the disk does not fill; the oldest go first.
inline constexpr std::int64_t kAccessLogEntries = 100'000;

// Keeps with each decision how the client was known in the calling thread's current request; unknown where it
// works for none, as the user does. Leaves out the decisions of a request that is void. Thread-safe.
class AccessLog : public RVDAccessLog {
 public:
  // keep: how long an entry is kept. The database and the log outlive the object.
  AccessLog(Database& database, RVLogService& log, state::Clock clock, std::chrono::days keep);

  // Deletes the entries that are too old. A new entry does so as well.
  base::Result<void> prune();

  void RVDLogAccessRequest(std::string_view accountTypeIdentifier,
                           const std::optional<std::string>& clientID,
                           bool granted,
                           bool requested,
                           double elapsed) override;

  // At most `limit` entries, newest first.
  base::Result<std::vector<AccessLogEntry>> newest(std::uint32_t limit) const;

 private:
  base::Result<void> pruneIn(Connection& connection) const;

  Database& database_;
  RVLogService& log_;
  const state::Clock clock_;
  const std::chrono::days keep_;
};

}  // namespace records
