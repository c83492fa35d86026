// Accounts and authorization records in memory.
#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/RVDAccountStore.h"
#include "host/RVDKeychainManager.h"
#include "tests/fakes/Fake.h"

namespace fakes {

class FakeAccount final : public RVAccount, public Fake {
 public:
  explicit FakeAccount(std::string identifier = "account-1");

  std::string identifier() const override;
  // "account <identifier>"
  std::string description() const override;
  std::shared_ptr<const RVAccountType> accountType() const override;
  void setAccountType(std::shared_ptr<const RVAccountType> accountType) override;
  std::shared_ptr<const RVAccountCredential> credential() const override;
  void setCredential(std::shared_ptr<const RVAccountCredential> credential) override;

 private:
  const std::string identifier_;
  mutable std::mutex mutex_;
  std::shared_ptr<const RVAccountType> accountType_;
  std::shared_ptr<const RVAccountCredential> credential_;
};

class FakeAuthorizationManager final : public RVDAuthorizationManager, public Fake {
 public:
  FakeAuthorizationManager();

  std::optional<RVDClientAuthorization> authorizationForClient(const RVDClient& client,
                                                               const RVAccountType& accountType) override;
  std::vector<RVDClientAuthorization> allAuthorizationsForAccountType(
      const RVAccountType& accountType) override;
  std::optional<RVError> setAuthorization(const RVDClientAuthorization& authorization,
                                          const RVDClient& client,
                                          const RVAccountType& accountType) override;
  void removeAllClientAuthorizationsForAccountType(const RVAccountType& accountType) override;

  // From now on nothing is stored and this comes back; absent: storing works again.
  void failWritesWith(std::optional<RVError> error);

  // What is stored, without a call being written down.
  std::optional<RVDClientAuthorization> record(const std::string& clientID,
                                               std::string_view accountType) const;
  std::size_t recordCount() const;
  // Every record handed to setAuthorization, stored or not, in order.
  std::vector<RVDClientAuthorization> writes() const;

 private:
  mutable std::mutex mutex_;
  std::optional<RVError> writeError_;
  std::map<std::string, std::map<std::string, RVDClientAuthorization>, std::less<>> records_;  // by type
  std::vector<RVDClientAuthorization> writes_;
};

class FakeAccountStore final : public RVDAccountStore, public Fake {
 public:
  FakeAccountStore();

  std::vector<std::shared_ptr<RVAccount>> accountsWithAccountTypeIdentifier(
      std::string_view identifier) override;
  FakeAuthorizationManager& authorizationManager() override;

  void addAccount(std::string identifier, std::string_view accountType = RVAccountTypeIdentifierFacebook);
  void removeAccounts();

  // Every account object that was handed out, in order.
  std::vector<std::shared_ptr<FakeAccount>> handedOut() const;

  // The records, without a call being written down.
  FakeAuthorizationManager& records() { return manager_; }

  // Shared by the accounts and the authorization manager as well.
  void shareJournalWithAll(const std::shared_ptr<CallJournal>& journal);

 private:
  FakeAuthorizationManager manager_;
  mutable std::mutex mutex_;
  std::vector<std::pair<std::string, std::string>> accounts_;  // type, identifier
  std::vector<std::shared_ptr<FakeAccount>> handedOut_;
};

}  // namespace fakes
