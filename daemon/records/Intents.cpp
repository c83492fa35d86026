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

base::Result<void> complete(const Intent& intent, AuthorizationRecords& records, Accounts& accounts) {
  switch (intent.kind) {
    case Intent::Kind::kRevokeClient: {
      auto record = records.find(intent.accountType, intent.subject);
      if (!record) return {};
      record->granted = false;
      record->permissions.reset();
      return records.putForUser(*std::move(record));
    }
    case Intent::Kind::kRevokeAll:
      return records.removeAll(intent.accountType);
    case Intent::Kind::kRemoveAccount:
      if (auto revoked = records.removeAll(intent.accountType); !revoked) return revoked;
      return unlessNotFound(accounts.remove(intent.subject));
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
    if (auto done = complete(intent, records, accounts); !done) return done;
    logging::notice(log, describe(intent.kind), {RVValue(intent.subject), RVValue(intent.accountType)});
    if (auto finished = finish(number); !finished) return finished;
  }
  return {};
}

}  // namespace records
