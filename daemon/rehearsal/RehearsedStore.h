// Accounts, records and credentials that a plug-in can read and not change.
#pragma once

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/RVDAccountStore.h"
#include "host/RVDKeychainManager.h"

namespace rehearsal {

// Reads as the real store does. What it is asked to write it keeps for itself and reports as done; it is
// not read back. Thread-safe.
class RehearsedStore final : public RVDAccountStore, private RVDAuthorizationManager {
 public:
  explicit RehearsedStore(std::shared_ptr<RVDAccountStore> real);

  std::vector<std::shared_ptr<RVAccount>> accountsWithAccountTypeIdentifier(
      std::string_view identifier) override;
  RVDAuthorizationManager& authorizationManager() override { return *this; }

  // The client's record as it was read last, and as it was written last; absent where that was not done, or
  // there was none to read.
  std::optional<RVDClientAuthorization> readRecord() const;
  std::optional<RVDClientAuthorization> writtenRecord() const;

 private:
  std::optional<RVDClientAuthorization> authorizationForClient(const RVDClient& client,
                                                               const RVAccountType& accountType) override;
  std::vector<RVDClientAuthorization> allAuthorizationsForAccountType(
      const RVAccountType& accountType) override;
  std::optional<RVError> setAuthorization(const RVDClientAuthorization& authorization,
                                          const RVDClient& client,
                                          const RVAccountType& accountType) override;
  void removeAllClientAuthorizationsForAccountType(const RVAccountType& accountType) override;

  const std::shared_ptr<RVDAccountStore> real_;
  mutable std::mutex mutex_;
  std::optional<RVDClientAuthorization> read_;     // guarded by mutex_
  std::optional<RVDClientAuthorization> written_;  // guarded by mutex_
};

// Says which credentials there are and shows none of them: in place of each stands one that is worth
// nothing. Writes nothing and reports it as done. Thread-safe.
class RehearsedKeychain final : public RVDKeychainManager {
 public:
  // real: outlives this object.
  explicit RehearsedKeychain(RVDKeychainManager& real)
      : real_(real) {}

  std::shared_ptr<const RVAccountCredential> credentialForAccount(
      const RVAccount& account,
      const std::optional<std::string>& clientID) override;
  std::optional<RVError> setCredentialForAccount(const RVAccount& account,
                                                 const std::optional<std::string>& clientID) override;
  std::optional<RVError> removeCredentialForAccount(const RVAccount& account,
                                                    const std::optional<std::string>& clientID) override;

 private:
  RVDKeychainManager& real_;
};

}  // namespace rehearsal
