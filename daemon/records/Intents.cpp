#include "daemon/records/Intents.h"

#include <optional>
#include <utility>
#include <vector>

#include "daemon/log/Log.h"

namespace records {
namespace {

struct Numbered {
  std::int64_t number;
  Intent intent;
};

// What is not there any more has been dealt with.
base::Result<void> unlessNotFound(base::Result<void> result) {
  if (!result && result.failure().kind == base::FailureKind::kNotFound) return {};
  return result;
}

// What is taken away from, and by what.
struct Stores {
  AuthorizationRecords& records;
  Accounts& accounts;
  Outbox& outbox;
};

// Whether or not the plug-in had come to it: once a record is changed, nobody knows what it stood for.
base::Result<void> owe(const AuthorizationRecord& record, const Stores& stores) {
  const auto appId = appIDOf(record);
  if (!appId) return {};
  const auto owed = stores.outbox.owe(record.accountType, *appId, stores.accounts, stores.records);
  return unlessNotFound(owed ? base::Result<void>() : owed.failure());
}

base::Result<void> removeRecords(const std::string& accountType, const Stores& stores) {
  for (const AuthorizationRecord& record : stores.records.list(accountType))
    if (auto owed = owe(record, stores); !owed) return owed;
  return stores.records.removeAll(accountType);
}

base::Result<void> complete(const Intent& intent, const Stores& stores) {
  switch (intent.kind) {
    case Intent::Kind::kRevokeClient: {
      auto record = stores.records.find(intent.accountType, intent.subject);
      if (!record) return {};
      if (auto owed = owe(*record, stores); !owed) return owed;
      record->granted = false;
      record->permissions.reset();
      return stores.records.putForUser(*std::move(record));
    }
    case Intent::Kind::kRevokeAll:
      return removeRecords(intent.accountType, stores);
    case Intent::Kind::kRemoveAccount:
      if (auto revoked = removeRecords(intent.accountType, stores); !revoked) return revoked;
      return unlessNotFound(stores.accounts.retire(intent.subject));
  }
  return base::Failure{base::FailureKind::kDamaged, "nobody knows what was begun"};
}

const char* describe(Intent::Kind kind) {
  switch (kind) {
    case Intent::Kind::kRevokeClient:
      return "Revoking the access of %@ to %@ was interrupted; it is revoked now.";
    case Intent::Kind::kRevokeAll:
      return "Revoking all access%@ to %@ was interrupted; it is revoked now.";
    case Intent::Kind::kRemoveAccount:
      return "Removing the account %@ of %@ was interrupted; it is removed now.";
  }
  return "%@%@";
}

}  // namespace

Intents::Intents(Database& database)
    : database_(database) {
}

base::Result<std::int64_t> Intents::begin(const Intent& intent) {
  std::int64_t number = 0;
  const auto done = database_.write([&](Connection& connection) -> base::Result<void> {
    auto statement = connection.prepare(
        "INSERT INTO intents (kind, account_type, subject) VALUES (?1, ?2, ?3) "
        "RETURNING number");
    if (!statement) return statement.failure();
    (*statement)->bind(static_cast<std::int64_t>(intent.kind)).bind(intent.accountType).bind(intent.subject);
    if (auto row = (*statement)->step(); !row) return row.failure();
    number = (*statement)->number(0);
    return (*statement)->run();
  });
  if (!done) return done.failure();
  return number;
}

base::Result<void> Intents::finish(std::int64_t number) {
  return database_.write([&](Connection& connection) {
    return connection.run("DELETE FROM intents WHERE number = ?1", number);
  });
}

base::Result<void> Intents::completeInterrupted(AuthorizationRecords& records,
                                                Accounts& accounts,
                                                Outbox& outbox,
                                                RVLogService& log) {
  std::vector<Numbered> interrupted;
  auto read = database_.read([&](Connection& connection) -> base::Result<void> {
    auto statement =
        connection.prepare("SELECT number, kind, account_type, subject FROM intents ORDER BY number");
    if (!statement) return statement.failure();
    for (;;) {
      const auto row = (*statement)->step();
      if (!row) return row.failure();
      if (!*row) return {};
      const auto kind = static_cast<Intent::Kind>((*statement)->number(1));
      interrupted.push_back({(*statement)->number(0), {kind, (*statement)->text(2), (*statement)->text(3)}});
    }
  });
  if (!read) return read;
  for (const auto& [number, intent] : interrupted) {
    if (auto done = complete(intent, {records, accounts, outbox}); !done) return done;
    logging::notice(log, describe(intent.kind), {RVValue(intent.subject), RVValue(intent.accountType)});
    if (auto finished = finish(number); !finished) return finished;
  }
  return {};
}

}  // namespace records
