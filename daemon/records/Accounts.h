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
class Accounts {
 public:
  // Removes what an interrupted run left half set up: an account whose own credential was never stored
  // (SealedKeychain::setMasterCredential), of which nobody was told yet. The database outlives the object.
  static base::Result<std::unique_ptr<Accounts>> load(Database& database,
                                                      state::IdentifierSource newIdentifier);

  // Answers the new account. It is set up, and stays, once its own credential is stored.
  base::Result<AccountRecord> add(const std::string& accountType, const std::string& username);

  // In the order in which they were added.
  std::vector<AccountRecord> list() const;
  std::vector<AccountRecord> listOfType(std::string_view accountType) const;

  std::optional<AccountRecord> find(std::string_view identifier) const;

  // Removes the account and every sealed credential stored for it, in one go. kNotFound where there is no
  // such account.
  base::Result<void> remove(const std::string& identifier);

 private:
  Accounts(Database& database, state::IdentifierSource newIdentifier);
  base::Result<void> reload();
  base::Result<void> write(const Database::Work& work);

  Database& database_;
  const state::IdentifierSource newIdentifier_;
  std::mutex writes_;  // held from before a write until memory shows it
  mutable std::mutex mutex_;
  std::vector<AccountRecord> accounts_;  // guarded by mutex_
};

}  // namespace records
