#include "daemon/records/Accounts.h"

#include <algorithm>
#include <cstdint>
#include <utility>

namespace records {
namespace {

base::Failure thereIsNone() {
  return {base::FailureKind::kNotFound, "there is no such account"};
}

// What stands in the column `state`.
enum class State : std::int64_t { kBeingSetUp = 0, kSetUp = 1, kRetired = 2 };

std::int64_t number(State state) {
  return static_cast<std::int64_t>(state);
}

base::Result<std::vector<AccountRecord>> readAll(Database& database, State state) {
  std::vector<AccountRecord> accounts;
  const auto done = database.read([&](Connection& connection) -> base::Result<void> {
    auto statement = connection.prepare(
        "SELECT identifier, account_type, username FROM accounts WHERE state = ?1 ORDER BY number");
    if (!statement) return statement.failure();
    (*statement)->bind(number(state));
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

base::Result<void> changeState(Connection& connection, const std::string& identifier, State from, State to) {
  auto changed = connection.run("UPDATE accounts SET state = ?3 WHERE identifier = ?1 AND state = ?2",
                                identifier,
                                number(from),
                                number(to));
  if (changed && connection.changes() == 0) return thereIsNone();
  return changed;
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
    return connection.run("DELETE FROM accounts WHERE state = ?1", number(State::kBeingSetUp));
  });
  if (!removed) return removed.failure();
  if (auto read = accounts->reload(); !read) return read.failure();
  return accounts;
}

base::Result<void> Accounts::reload() {
  auto read = readAll(database_, State::kSetUp);
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
    return connection.run(
        "INSERT INTO accounts (identifier, account_type, username, state) VALUES (?1, ?2, ?3, ?4)",
        account.identifier,
        account.accountType,
        account.username,
        number(State::kBeingSetUp));
  });
  if (!done) return done.failure();
  return account;
}

base::Result<void> Accounts::finishSetUp(const std::string& identifier) {
  const std::lock_guard writing(writes_);
  return write([&](Connection& connection) {
    return changeState(connection, identifier, State::kBeingSetUp, State::kSetUp);
  });
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

base::Result<void> Accounts::retire(const std::string& identifier) {
  const std::lock_guard writing(writes_);
  return write([&](Connection& connection) -> base::Result<void> {
    auto changed = changeState(connection, identifier, State::kSetUp, State::kRetired);
    if (!changed) return changed;
    return connection.run("DELETE FROM credentials WHERE account = ?1 AND client_id IS NOT NULL", identifier);
  });
}

base::Result<std::vector<AccountRecord>> Accounts::retired() const {
  return readAll(database_, State::kRetired);
}

base::Result<void> Accounts::remove(const std::string& identifier) {
  const std::lock_guard writing(writes_);
  return write([&](Connection& connection) -> base::Result<void> {
    // The credentials go with the account (ON DELETE CASCADE).
    auto removed = connection.run("DELETE FROM accounts WHERE identifier = ?1", identifier);
    if (removed && connection.changes() == 0) return thereIsNone();
    return removed;
  });
}

}  // namespace records
