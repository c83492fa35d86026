#include "daemon/records/AccessLog.h"

#include <utility>

#include "daemon/log/Log.h"
#include "daemon/requests/RequestContext.h"

namespace records {

AccessLog::AccessLog(Database& database, RVLogService& log, state::Clock clock, std::chrono::days keep)
    : database_(database),
      log_(log),
      clock_(std::move(clock)),
      keep_(keep) {
}

// What stands before the first entry that is young enough: no more than the old ones are looked at. An old
// one behind it, from when the clock was wrong, goes with it.
base::Result<void> AccessLog::pruneIn(Connection& connection) const {
  return connection.run(
      "DELETE FROM access_log WHERE number < coalesce((SELECT number FROM access_log WHERE time >= ?1 "
      "ORDER BY number LIMIT 1), 9223372036854775807)",
      std::int64_t{(clock_() - keep_).time_since_epoch().count()});
}

base::Result<void> AccessLog::prune() {
  return database_.write([this](Connection& connection) { return pruneIn(connection); });
}

void AccessLog::RVDLogAccessRequest(std::string_view accountTypeIdentifier,
                                    const std::optional<std::string>& clientID,
                                    bool granted,
                                    bool requested,
                                    double /*elapsed*/) {
  const auto request = requests::RequestContext::current();
  const auto evidence = request != nullptr ? request->evidence() : clients::Evidence::kUnknown;
  const auto write = [&] {
    const auto done = database_.write([&](Connection& connection) -> base::Result<void> {
      auto added = connection.run(
          "INSERT INTO access_log (time, account_type, client_id, granted, requested, evidence) "
          "VALUES (?1, ?2, ?3, ?4, ?5, ?6)",
          std::int64_t{clock_().time_since_epoch().count()},
          accountTypeIdentifier,
          clientID,
          std::int64_t{granted},
          std::int64_t{requested},
          static_cast<std::int64_t>(evidence));
      if (!added) return added;
      if (auto pruned = pruneIn(connection); !pruned) return pruned;
      return connection.run(
          "DELETE FROM access_log WHERE number <= (SELECT max(number) FROM access_log) - ?1",
          kAccessLogEntries);
    });
    if (!done)
      logging::error(log_, "An access decision could not be logged: %@", {RVValue(done.failure().message)});
  };
  if (request == nullptr) {
    write();
  } else {
    request->unlessVoid(write);
  }
}

base::Result<std::vector<AccessLogEntry>> AccessLog::newest(std::uint32_t limit) const {
  std::vector<AccessLogEntry> entries;
  const auto done = database_.read([&](Connection& connection) -> base::Result<void> {
    auto statement = connection.prepare(
        "SELECT time, account_type, client_id, granted, requested, evidence "
        "FROM access_log ORDER BY number DESC LIMIT ?1");
    if (!statement) return statement.failure();
    (*statement)->bind(std::int64_t{limit});
    for (;;) {
      const auto row = (*statement)->step();
      if (!row) return row.failure();
      if (!*row) return {};
      entries.push_back({std::chrono::sys_seconds(std::chrono::seconds((*statement)->number(0))),
                         (*statement)->text(1),
                         (*statement)->optionalText(2),
                         (*statement)->number(3) != 0,
                         (*statement)->number(4) != 0,
                         static_cast<clients::Evidence>((*statement)->number(5))});
    }
  });
  if (!done) return done.failure();
  return entries;
}

}  // namespace records
