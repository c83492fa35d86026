// The accounts that were set up on the device.
#pragma once

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/Result.h"
#include "daemon/records/Database.h"
#include "daemon/state/RandomIdentifier.h"

namespace records {

struct AccountRecord {
  std::string identifier;
  std::string accountType;
  std::string username;
};

// Reads come from memory; a write is on the disk when it returns. Thread-safe.
//
// An account is there for requests, and is found and listed, from finishSetUp until it is retired or removed.
class Accounts {
 public:
  // Removes the accounts whose set-up was interrupted; nobody was told of them yet. The database outlives
  // the object.
  static base::Result<std::unique_ptr<Accounts>> load(Database& database,
                                                      state::IdentifierSource newIdentifier);

  // Begins to set up an account. A start removes it again until finishSetUp.
  base::Result<AccountRecord> add(const std::string& accountType, const std::string& username);

  // The account has all that it needs. kNotFound where no such account is being set up.
  base::Result<void> finishSetUp(const std::string& identifier);

  // In the order in which they were added.
  std::vector<AccountRecord> list() const;
  std::vector<AccountRecord> listOfType(std::string_view accountType) const;

  std::optional<AccountRecord> find(std::string_view identifier) const;

  // Takes the account away from requests and deletes its clients' sealed credentials, but keeps its own, for
  // what is still owed to the server. kNotFound where no such account is set up.
  base::Result<void> retire(const std::string& identifier);

  // The retired accounts, in the order in which they were added.
  base::Result<std::vector<AccountRecord>> retired() const;

  // Removes the account, also one that is being set up or retired, and every sealed credential stored for
  // it, in one go. kNotFound where there is no such account.
  base::Result<void> remove(const std::string& identifier);

 private:
  Accounts(Database& database, state::IdentifierSource newIdentifier);
  base::Result<void> reload();
  base::Result<void> write(const Database::Work& work);

  Database& database_;
  const state::IdentifierSource newIdentifier_;
  std::mutex writes_;  // held from before a write until memory shows it
  mutable std::mutex mutex_;
  std::vector<AccountRecord> accounts_;  // those that are set up; guarded by mutex_
};

}  // namespace records
