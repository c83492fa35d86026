#include "daemon/records/Accounts.h"

#include <algorithm>
#include <utility>

namespace records {
namespace {

base::Result<std::vector<AccountRecord>> readAll(Database& database) {
  std::vector<AccountRecord> accounts;
  const auto done = database.read([&](Connection& connection) -> base::Result<void> {
    auto statement =
        connection.prepare("SELECT identifier, account_type, username FROM accounts ORDER BY number");
    if (!statement) return statement.failure();
    for (;;) {
      const auto row = (*statement)->step();
      if (!row) return row.failure();
      if (!*row) return {};
      accounts.push_back({(*statement)->text(0), (*statement)->text(1), (*statement)->text(2)});
    }
  });
  if (!done) return done.failure();
  return accounts;
}

}  // namespace

Accounts::Accounts(Database& database, state::IdentifierSource newIdentifier)
    : database_(database),
      newIdentifier_(std::move(newIdentifier)) {
}

base::Result<std::unique_ptr<Accounts>> Accounts::load(Database& database,
                                                       state::IdentifierSource newIdentifier) {
  std::unique_ptr<Accounts> accounts(new Accounts(database, std::move(newIdentifier)));
  auto removed = database.write([](Connection& connection) {
    return connection.run(
        "DELETE FROM accounts WHERE NOT EXISTS (SELECT 1 FROM credentials WHERE account = "
        "accounts.identifier AND client_id IS NULL)");
  });
  if (!removed) return removed.failure();
  if (auto read = accounts->reload(); !read) return read.failure();
  return accounts;
}

base::Result<void> Accounts::reload() {
  auto read = readAll(database_);
  if (!read) return read.failure();
  const std::lock_guard lock(mutex_);
  accounts_ = *std::move(read);
  return {};
}

// Memory is made to show what the disk holds also where a write failed: how much of it was done is known
// to the disk alone.
base::Result<void> Accounts::write(const Database::Work& work) {
  auto written = database_.write(work);
  const auto read = reload();
  if (!written) return written;
  return read;
}

base::Result<AccountRecord> Accounts::add(const std::string& accountType, const std::string& username) {
  const AccountRecord account{newIdentifier_(), accountType, username};
  const std::lock_guard writing(writes_);
  const auto done = write([&](Connection& connection) {
    return connection.run("INSERT INTO accounts (identifier, account_type, username) VALUES (?1, ?2, ?3)",
                          account.identifier,
                          account.accountType,
                          account.username);
  });
  if (!done) return done.failure();
  return account;
}

std::vector<AccountRecord> Accounts::list() const {
  const std::lock_guard lock(mutex_);
  return accounts_;
}

std::vector<AccountRecord> Accounts::listOfType(std::string_view accountType) const {
  std::vector<AccountRecord> found = list();
  std::erase_if(found, [&](const AccountRecord& account) { return account.accountType != accountType; });
  return found;
}

std::optional<AccountRecord> Accounts::find(std::string_view identifier) const {
  const std::lock_guard lock(mutex_);
  const auto found = std::find_if(accounts_.begin(), accounts_.end(), [&](const AccountRecord& account) {
    return account.identifier == identifier;
  });
  if (found == accounts_.end()) return std::nullopt;
  return *found;
}

base::Result<void> Accounts::remove(const std::string& identifier) {
  const std::lock_guard writing(writes_);
  return write([&](Connection& connection) -> base::Result<void> {
    // The credentials go with the account (ON DELETE CASCADE).
    auto removed = connection.run("DELETE FROM accounts WHERE identifier = ?1", identifier);
    if (removed && connection.changes() == 0)
      return base::Failure{base::FailureKind::kNotFound, "there is no such account"};
    return removed;
  });
}

}  // namespace records
