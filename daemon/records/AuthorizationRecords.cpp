#include "daemon/records/AuthorizationRecords.h"

#include <utility>

#include "daemon/log/Log.h"

namespace records {
namespace {

constexpr const char* kDeleteAuthorization =
    "DELETE FROM authorizations WHERE account_type = ?1 AND client_id = ?2";

}  // namespace

AuthorizationRecords::AuthorizationRecords(Database& database, RVLogService& log, state::Clock clock)
    : database_(database),
      log_(log),
      clock_(std::move(clock)) {
}

base::Result<std::unique_ptr<AuthorizationRecords>> AuthorizationRecords::load(Database& database,
                                                                               RVLogService& log,
                                                                               state::Clock clock) {
  std::unique_ptr<AuthorizationRecords> records(new AuthorizationRecords(database, log, std::move(clock)));
  if (auto removed = records->removeUnreadable(); !removed) return removed.failure();
  if (auto read = records->reload(); !read) return read.failure();
  return records;
}

void AuthorizationRecords::onChange(std::function<void(const std::string&)> listener) {
  listener_ = std::move(listener);
}

base::Result<void> AuthorizationRecords::reload() {
  std::map<std::string, OfType, std::less<>> all;
  const auto done = database_.read([&](Connection& connection) -> base::Result<void> {
    auto statement = connection.prepare(kSelectAuthorizations);
    if (!statement) return statement.failure();
    for (;;) {
      const auto row = (*statement)->step();
      if (!row) return row.failure();
      if (!*row) return {};
      auto record = readAuthorization(**statement);
      if (record) all[(*statement)->text(0)].insert_or_assign((*statement)->text(1), *std::move(record));
    }
  });
  if (!done) return done;
  const std::unique_lock lock(mutex_);
  records_ = std::move(all);
  return {};
}

base::Result<void> AuthorizationRecords::removeUnreadable() {
  return database_.write([&](Connection& connection) -> base::Result<void> {
    auto statement = connection.prepare(kSelectAuthorizations);
    if (!statement) return statement.failure();
    std::vector<std::pair<std::string, std::string>> unreadable;
    for (;;) {
      const auto row = (*statement)->step();
      if (!row) return row.failure();
      if (!*row) break;
      const auto record = readAuthorization(**statement);
      if (record) continue;
      unreadable.emplace_back((*statement)->text(0), (*statement)->text(1));
      logging::error(log_,
                     "The record of %@ cannot be read (%@); the client counts as one that never asked.",
                     {RVValue(unreadable.back().second), RVValue(record.failure().message)});
    }
    for (const auto& [accountType, clientId] : unreadable) {
      auto removed = connection.run(kDeleteAuthorization, accountType, clientId);
      if (!removed) return removed;
    }
    return {};
  });
}

base::Result<void> AuthorizationRecords::write(const std::string& accountType,
                                               const Database::Work& work,
                                               const std::function<void(OfType&)>& follow) {
  {
    const std::lock_guard writing(writes_);
    if (auto done = database_.write(work); !done) {
      // How much of it was done is known to the disk alone.
      if (const auto read = reload(); !read)
        logging::error(log_, "The records cannot be read again: %@", {RVValue(read.failure().message)});
      return done;
    }
    const std::unique_lock lock(mutex_);
    follow(records_[accountType]);
  }
  if (listener_) listener_(accountType);
  return {};
}

std::optional<AuthorizationRecord> AuthorizationRecords::find(std::string_view accountType,
                                                              std::string_view clientId) const {
  const std::shared_lock lock(mutex_);
  const auto ofType = records_.find(accountType);
  if (ofType == records_.end()) return std::nullopt;
  const auto found = ofType->second.find(clientId);
  if (found == ofType->second.end()) return std::nullopt;
  return found->second;
}

std::vector<AuthorizationRecord> AuthorizationRecords::list(std::string_view accountType) const {
  const std::shared_lock lock(mutex_);
  std::vector<AuthorizationRecord> all;
  const auto ofType = records_.find(accountType);
  if (ofType == records_.end()) return all;
  all.reserve(ofType->second.size());
  for (const auto& [clientId, record] : ofType->second) all.push_back(record);
  return all;
}

bool AuthorizationRecords::isStronger(std::string_view accountType,
                                      std::string_view clientId,
                                      clients::Evidence evidence) const {
  const auto record = find(accountType, clientId);
  return record && record->evidence > evidence;
}

base::Result<void> AuthorizationRecords::put(AuthorizationRecord record) {
  return replace(std::move(record), false);
}

base::Result<void> AuthorizationRecords::putForUser(AuthorizationRecord record) {
  return replace(std::move(record), true);
}

base::Result<void> AuthorizationRecords::replace(AuthorizationRecord record, bool isForUser) {
  record.changed = clock_();
  return write(
      record.accountType,
      [&](Connection& connection) -> base::Result<void> {
        // Asked while other writes wait, so that no stronger record comes in between.
        if (isForUser) {
          const auto earlier = find(record.accountType, record.clientId);
          record.evidence = earlier ? earlier->evidence : clients::Evidence::kUnknown;
        } else if (isStronger(record.accountType, record.clientId, record.evidence)) {
          return base::Failure{base::FailureKind::kRefused,
                               "the client's record was made with stronger evidence"};
        }
        return writeAuthorization(connection, record);
      },
      [&](OfType& ofType) { ofType.insert_or_assign(record.clientId, record); });
}

base::Result<void> AuthorizationRecords::removeAll(const std::string& accountType) {
  return write(
      accountType,
      [&](Connection& connection) {
        return connection.run("DELETE FROM authorizations WHERE account_type = ?1", accountType);
      },
      [](OfType& ofType) { ofType.clear(); });
}

base::Result<void> AuthorizationRecords::forgetRefusal(const std::string& accountType,
                                                       const std::string& clientId) {
  return write(
      accountType,
      [&](Connection& connection) -> base::Result<void> {
        // Asked while other writes wait, so that no grant comes in between.
        const auto record = find(accountType, clientId);
        if (!record) return base::Failure{base::FailureKind::kNotFound, "the client has no record"};
        if (record->granted) return base::Failure{base::FailureKind::kRefused, "the client holds a grant"};
        return connection.run(kDeleteAuthorization, accountType, clientId);
      },
      [&](OfType& ofType) { ofType.erase(clientId); });
}

}  // namespace records
