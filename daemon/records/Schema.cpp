#include "daemon/records/Schema.h"

#include <sqlite3.h>

#include <array>
#include <string>
#include <vector>

namespace records {
namespace {

constexpr std::array<const char*, kSchemaVersion> kMigrations = {
    // To version 1.
    R"(
CREATE TABLE accounts (
  number INTEGER PRIMARY KEY,
  identifier TEXT NOT NULL UNIQUE,
  account_type TEXT NOT NULL,
  username TEXT NOT NULL
) STRICT;
CREATE TABLE authorizations (
  account_type TEXT NOT NULL,
  client_id TEXT NOT NULL,
  granted INTEGER NOT NULL CHECK (granted IN (0, 1)),
  permissions TEXT,
  options TEXT,
  changed INTEGER NOT NULL,
  digest BLOB NOT NULL,
  PRIMARY KEY (account_type, client_id)
) STRICT, WITHOUT ROWID;
CREATE TABLE access_log (
  number INTEGER PRIMARY KEY,
  time INTEGER NOT NULL,
  account_type TEXT NOT NULL,
  client_id TEXT,
  granted INTEGER NOT NULL CHECK (granted IN (0, 1)),
  requested INTEGER NOT NULL CHECK (requested IN (0, 1))
) STRICT;
CREATE TABLE credentials (
  account TEXT NOT NULL REFERENCES accounts (identifier) ON DELETE CASCADE,
  client_id TEXT,
  sealed BLOB NOT NULL
) STRICT;
CREATE UNIQUE INDEX credentials_of_clients ON credentials (account, client_id);
CREATE UNIQUE INDEX credentials_of_accounts ON credentials (account) WHERE client_id IS NULL;
CREATE TABLE intents (
  number INTEGER PRIMARY KEY,
  kind INTEGER NOT NULL CHECK (kind IN (1, 2, 3)),
  account_type TEXT NOT NULL,
  subject TEXT NOT NULL
) STRICT;
)",
    // To version 2. An account whose own credential was never stored was not set up; nothing told such a one
    // from the others but that. Of the decisions that are there it is not known how their clients were known.
    R"(
DELETE FROM accounts WHERE NOT EXISTS (
  SELECT 1 FROM credentials WHERE account = accounts.identifier AND client_id IS NULL
);
ALTER TABLE accounts ADD COLUMN state INTEGER NOT NULL DEFAULT 1 CHECK (state IN (0, 1, 2));
ALTER TABLE authorizations ADD COLUMN evidence INTEGER NOT NULL DEFAULT 0 CHECK (evidence IN (0, 1, 2, 3));
ALTER TABLE access_log ADD COLUMN evidence INTEGER NOT NULL DEFAULT 0 CHECK (evidence IN (0, 1, 2, 3));
)",
    // To version 3. Until now all credentials were sealed.
    R"(
CREATE TABLE credential_store (
  number INTEGER PRIMARY KEY CHECK (number = 1),
  store INTEGER NOT NULL CHECK (store IN (0, 1, 2)),
  leftovers INTEGER NOT NULL CHECK (leftovers IN (0, 1)),
  name TEXT NOT NULL
) STRICT;
INSERT INTO credential_store (number, store, leftovers, name)
  VALUES (1, EXISTS (SELECT 1 FROM credentials), 0, lower(hex(randomblob(16))));
CREATE TABLE undeleted_credentials (
  account TEXT NOT NULL,
  client_id TEXT NOT NULL,
  PRIMARY KEY (account, client_id)
) STRICT, WITHOUT ROWID;
)",
    // To version 4. What was owed to the server before is not known any more.
    R"(
CREATE TABLE outbox (
  number INTEGER PRIMARY KEY,
  account_type TEXT NOT NULL,
  account TEXT NOT NULL REFERENCES accounts (identifier),
  app_id TEXT NOT NULL,
  client_ids TEXT NOT NULL,
  since INTEGER NOT NULL,
  attempts INTEGER NOT NULL,
  failure TEXT,
  UNIQUE (account, app_id)
) STRICT;
)",
};

using Tables = std::vector<std::string>;

base::Result<Tables> tables(Connection& connection) {
  auto statement = connection.prepare(
      "SELECT type || ' ' || name || ' ' || tbl_name || ' ' || "
      "coalesce(sql, '') FROM sqlite_schema ORDER BY 1");
  if (!statement) return statement.failure();
  Tables found;
  for (;;) {
    const auto row = (*statement)->step();
    if (!row) return row.failure();
    if (!*row) return found;
    found.push_back((*statement)->text(0));
  }
}

base::Result<void> checkTables(Connection& connection, std::int64_t version) {
  auto model = Connection::open(":memory:");
  if (!model) return model.failure();
  if (auto migrated = migrate(*model, 0, version); !migrated) return migrated;
  const auto expected = tables(*model);
  const auto found = tables(connection);
  if (!expected) return expected.failure();
  if (!found) return found.failure();
  if (*found != *expected) return base::Failure{base::FailureKind::kDamaged, "its tables are not ours"};
  return {};
}

}  // namespace

base::Result<std::int64_t> schemaVersion(Connection& connection) {
  auto statement = connection.prepare("PRAGMA user_version");
  if (!statement) return statement.failure();
  const auto row = (*statement)->step();
  if (!row) return row.failure();
  return (*statement)->number(0);
}

base::Result<void> migrate(Connection& connection, std::int64_t from, std::int64_t to) {
  for (std::int64_t version = from; version < to; ++version) {
    const std::string script = std::string("BEGIN IMMEDIATE;") + kMigrations.at(version) +
                               "PRAGMA user_version = " + std::to_string(version + 1) + ";COMMIT;";
    if (auto done = connection.execute(script); !done) return done;
  }
  return {};
}

base::Result<void> checkSoundness(Connection& connection, std::int64_t version) {
  const base::FailureKind damaged = base::FailureKind::kDamaged;
  {
    auto statement = connection.prepare("PRAGMA integrity_check(1)");
    if (!statement) return statement.failure();
    const auto row = (*statement)->step();
    if (!row) return row.failure();
    if ((*statement)->text(0) != "ok") return base::Failure{damaged, (*statement)->text(0)};
  }
  if (auto checked = checkTables(connection, version); !checked) return checked;
  auto statement = connection.prepare("PRAGMA foreign_key_check");
  if (!statement) return statement.failure();
  const auto row = (*statement)->step();
  if (!row) return row.failure();
  if (*row) return base::Failure{damaged, "a credential or a revocation belongs to no account"};
  return {};
}

}  // namespace records
