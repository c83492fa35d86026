#include "daemon/records/Outbox.h"

#include <algorithm>
#include <functional>
#include <utility>

#include "daemon/log/Log.h"
#include "daemon/state/ValueText.h"
#include "host/Constants.h"

namespace records {
namespace {

// The columns that revocationFrom takes.
const std::string kSelect =
    "SELECT account_type, account, app_id, client_ids, since, attempts, failure FROM outbox";

std::set<std::string, std::less<>> clientsFrom(std::string_view text) {
  std::set<std::string, std::less<>> clientIds;
  const auto value = state::valueFromText(text);
  if (!value || value->array() == nullptr) return clientIds;
  for (const RVValue& element : *value->array())
    if (element.string() != nullptr) clientIds.insert(*element.string());
  return clientIds;
}

// Whom it concerns is for people to read: where that is damaged, the revocation is owed all the same.
OwedRevocation revocationFrom(const Statement& row) {
  return {row.text(0),
          row.text(1),
          row.text(2),
          clientsFrom(row.text(3)),
          std::chrono::sys_seconds(std::chrono::seconds(row.number(4))),
          row.number(5),
          row.optionalText(6)};
}

base::Result<void> forEach(Connection& connection,
                           const std::string& sql,
                           const std::vector<std::string>& arguments,
                           const std::function<void(const Statement&)>& take) {
  auto statement = connection.prepare(sql.c_str());
  if (!statement) return statement.failure();
  for (const std::string& argument : arguments) (*statement)->bind(argument);
  for (;;) {
    const auto row = (*statement)->step();
    if (!row) return row.failure();
    if (!*row) return {};
    take(**statement);
  }
}

}  // namespace

std::optional<std::string> appIDOf(const AuthorizationRecord& record) {
  const RVValue* value = record.options ? RVValueForKey(*record.options, RVFacebookAppIdKey) : nullptr;
  if (value == nullptr || value->string() == nullptr) return std::nullopt;
  return *value->string();
}

Outbox::Outbox(Database& database, state::Clock clock)
    : database_(database),
      clock_(std::move(clock)) {
}

base::Result<OwedRevocation> Outbox::owe(const std::string& accountType,
                                         const std::string& appId,
                                         const Accounts& accounts,
                                         const AuthorizationRecords& records) {
  const auto ofType = accounts.listOfType(accountType);
  if (ofType.empty()) return base::Failure{base::FailureKind::kNotFound, "there is no account"};
  OwedRevocation owed{accountType, ofType.front().identifier, appId, {}, clock_(), 0, std::nullopt};
  for (const AuthorizationRecord& record : records.list(accountType))
    if (appIDOf(record) == appId) owed.clientIds.insert(record.clientId);
  const auto written = database_.write([&](Connection& connection) -> base::Result<void> {
    auto known = forEach(connection,
                         kSelect + " WHERE account = ?1 AND app_id = ?2",
                         {owed.account, appId},
                         [&](const Statement& row) {
                           OwedRevocation earlier = revocationFrom(row);
                           earlier.clientIds.merge(owed.clientIds);
                           owed = std::move(earlier);
                         });
    if (!known) return known;
    return connection.run(
        "INSERT INTO outbox (account_type, account, app_id, client_ids, since, attempts, failure)"
        " VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7)"
        " ON CONFLICT (account, app_id) DO UPDATE SET client_ids = excluded.client_ids",
        owed.accountType,
        owed.account,
        owed.appId,
        state::textFromValue(RVArray(owed.clientIds.begin(), owed.clientIds.end())),
        std::int64_t{owed.since.time_since_epoch().count()},
        owed.attempts,
        owed.failure);
  });
  if (!written) return written.failure();
  return owed;
}

base::Result<std::vector<OwedRevocation>> Outbox::list() {
  std::vector<OwedRevocation> all;
  const auto done = database_.read([&](Connection& connection) {
    return forEach(connection, kSelect + " ORDER BY number", {}, [&](const Statement& row) {
      all.push_back(revocationFrom(row));
    });
  });
  if (!done) return done.failure();
  return all;
}

base::Result<void> Outbox::noteFailure(const OwedRevocation& revocation) {
  return database_.write([&](Connection& connection) {
    return connection.run("UPDATE outbox SET attempts = ?3, failure = ?4 WHERE account = ?1 AND app_id = ?2",
                          revocation.account,
                          revocation.appId,
                          revocation.attempts,
                          revocation.failure);
  });
}

base::Result<void> Outbox::remove(const OwedRevocation& revocation) {
  return database_.write([&](Connection& connection) {
    return connection.run(
        "DELETE FROM outbox WHERE account = ?1 AND app_id = ?2", revocation.account, revocation.appId);
  });
}

base::Result<void> Outbox::eraseSettledAccounts(Accounts& accounts, RVLogService& log) {
  const auto retired = accounts.retired();
  if (!retired) return retired.failure();
  const auto owed = list();
  if (!owed) return owed.failure();
  for (const AccountRecord& account : *retired) {
    const bool isOwed = std::any_of(owed->begin(), owed->end(), [&](const OwedRevocation& revocation) {
      return revocation.account == account.identifier;
    });
    if (isOwed) continue;
    if (auto removed = accounts.remove(account.identifier); !removed) return removed;
    logging::notice(log,
                    "The account %@ was removed, and the server is owed nothing for it; it is erased now.",
                    {RVValue(account.identifier)});
  }
  return {};
}

}  // namespace records
