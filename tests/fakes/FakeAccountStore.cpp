#include "tests/fakes/FakeAccountStore.h"

#include <utility>

namespace fakes {

FakeAccount::FakeAccount(std::string identifier)
    : Fake("account"),
      identifier_(std::move(identifier)) {
}

std::string FakeAccount::identifier() const {
  begin("identifier");
  return identifier_;
}

std::string FakeAccount::description() const {
  begin("description");
  return "account " + identifier_;
}

std::shared_ptr<const RVAccountType> FakeAccount::accountType() const {
  begin("accountType");
  const std::lock_guard lock(mutex_);
  return accountType_;
}

void FakeAccount::setAccountType(std::shared_ptr<const RVAccountType> accountType) {
  begin("setAccountType");
  const std::lock_guard lock(mutex_);
  accountType_ = std::move(accountType);
}

std::shared_ptr<const RVAccountCredential> FakeAccount::credential() const {
  begin("credential");
  const std::lock_guard lock(mutex_);
  return credential_;
}

void FakeAccount::setCredential(std::shared_ptr<const RVAccountCredential> credential) {
  begin("setCredential");
  const std::lock_guard lock(mutex_);
  credential_ = std::move(credential);
}

FakeAuthorizationManager::FakeAuthorizationManager()
    : Fake("authorizationManager") {
}

std::optional<RVDClientAuthorization> FakeAuthorizationManager::authorizationForClient(
    const RVDClient& client,
    const RVAccountType& accountType) {
  begin("authorizationForClient");
  const std::optional<std::string> clientID = client.bundleID();
  return clientID ? record(*clientID, accountType.identifier()) : std::nullopt;
}

std::vector<RVDClientAuthorization> FakeAuthorizationManager::allAuthorizationsForAccountType(
    const RVAccountType& accountType) {
  begin("allAuthorizationsForAccountType");
  const std::lock_guard lock(mutex_);
  std::vector<RVDClientAuthorization> all;
  const auto ofType = records_.find(accountType.identifier());
  if (ofType == records_.end()) return all;
  for (const auto& [clientID, authorization] : ofType->second) all.push_back(authorization);
  return all;
}

std::optional<RVError> FakeAuthorizationManager::setAuthorization(const RVDClientAuthorization& authorization,
                                                                  const RVDClient& client,
                                                                  const RVAccountType& accountType) {
  begin("setAuthorization");
  const std::optional<std::string> clientID = client.bundleID();
  const std::lock_guard lock(mutex_);
  writes_.push_back(authorization);
  if (writeError_) return writeError_;
  if (!clientID) {
    const std::string text = "A client without a bundle ID has no authorization record.";
    return RVError{std::string(RVErrorDomain),
                   kRVErrorClientWithoutBundleID,
                   {{std::string(kRVErrorLocalizedDescriptionKey), text}}};
  }
  records_[accountType.identifier()].insert_or_assign(*clientID, authorization);
  return std::nullopt;
}

void FakeAuthorizationManager::removeAllClientAuthorizationsForAccountType(const RVAccountType& accountType) {
  begin("removeAllClientAuthorizationsForAccountType");
  const std::lock_guard lock(mutex_);
  records_.erase(accountType.identifier());
}

void FakeAuthorizationManager::failWritesWith(std::optional<RVError> error) {
  const std::lock_guard lock(mutex_);
  writeError_ = std::move(error);
}

std::optional<RVDClientAuthorization> FakeAuthorizationManager::record(const std::string& clientID,
                                                                       std::string_view accountType) const {
  const std::lock_guard lock(mutex_);
  const auto ofType = records_.find(accountType);
  if (ofType == records_.end()) return std::nullopt;
  const auto found = ofType->second.find(clientID);
  if (found == ofType->second.end()) return std::nullopt;
  return found->second;
}

std::size_t FakeAuthorizationManager::recordCount() const {
  const std::lock_guard lock(mutex_);
  std::size_t count = 0;
  for (const auto& [type, ofType] : records_) count += ofType.size();
  return count;
}

std::vector<RVDClientAuthorization> FakeAuthorizationManager::writes() const {
  const std::lock_guard lock(mutex_);
  return writes_;
}

FakeAccountStore::FakeAccountStore()
    : Fake("store") {
}

std::vector<std::shared_ptr<RVAccount>> FakeAccountStore::accountsWithAccountTypeIdentifier(
    std::string_view identifier) {
  begin("accountsWithAccountTypeIdentifier");
  const std::lock_guard lock(mutex_);
  std::vector<std::shared_ptr<RVAccount>> found;
  for (const auto& [type, account] : accounts_) {
    if (type != identifier) continue;
    auto object = std::make_shared<FakeAccount>(account);
    object->shareJournal(journal());
    handedOut_.push_back(object);
    found.push_back(std::move(object));
  }
  return found;
}

FakeAuthorizationManager& FakeAccountStore::authorizationManager() {
  begin("authorizationManager");
  return manager_;
}

void FakeAccountStore::addAccount(std::string identifier, std::string_view accountType) {
  const std::lock_guard lock(mutex_);
  accounts_.emplace_back(accountType, std::move(identifier));
}

void FakeAccountStore::removeAccounts() {
  const std::lock_guard lock(mutex_);
  accounts_.clear();
}

std::vector<std::shared_ptr<FakeAccount>> FakeAccountStore::handedOut() const {
  const std::lock_guard lock(mutex_);
  return handedOut_;
}

void FakeAccountStore::shareJournalWithAll(const std::shared_ptr<CallJournal>& journal) {
  shareJournal(journal);
  manager_.shareJournal(journal);
}

}  // namespace fakes
