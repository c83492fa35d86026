#include "daemon/rehearsal/RehearsedStore.h"

#include <utility>

namespace rehearsal {
namespace {

// An empty secret stays empty, since plug-ins look at that.
RVSecret standInFor(const RVSecret& secret) {
  return RVSecret(secret.empty() ? "" : "rehearsal");
}

}  // namespace

RehearsedStore::RehearsedStore(std::shared_ptr<RVDAccountStore> real)
    : real_(std::move(real)) {
}

std::vector<std::shared_ptr<RVAccount>> RehearsedStore::accountsWithAccountTypeIdentifier(
    std::string_view identifier) {
  return real_->accountsWithAccountTypeIdentifier(identifier);
}

std::optional<RVDClientAuthorization> RehearsedStore::readRecord() const {
  const std::lock_guard lock(mutex_);
  return read_;
}

std::optional<RVDClientAuthorization> RehearsedStore::writtenRecord() const {
  const std::lock_guard lock(mutex_);
  return written_;
}

std::optional<RVDClientAuthorization> RehearsedStore::authorizationForClient(
    const RVDClient& client,
    const RVAccountType& accountType) {
  auto record = real_->authorizationManager().authorizationForClient(client, accountType);
  const std::lock_guard lock(mutex_);
  read_ = record;
  return record;
}

std::vector<RVDClientAuthorization> RehearsedStore::allAuthorizationsForAccountType(
    const RVAccountType& accountType) {
  return real_->authorizationManager().allAuthorizationsForAccountType(accountType);
}

std::optional<RVError> RehearsedStore::setAuthorization(const RVDClientAuthorization& authorization,
                                                        const RVDClient&,
                                                        const RVAccountType&) {
  const std::lock_guard lock(mutex_);
  written_ = authorization;
  return std::nullopt;
}

void RehearsedStore::removeAllClientAuthorizationsForAccountType(const RVAccountType&) {
}

std::shared_ptr<const RVAccountCredential> RehearsedKeychain::credentialForAccount(
    const RVAccount& account,
    const std::optional<std::string>& clientID) {
  const auto credential = real_.credentialForAccount(account, clientID);
  if (credential == nullptr) return nullptr;
  return std::make_shared<const RVAccountCredential>(
      standInFor(credential->oauthToken()), standInFor(credential->refreshToken()), credential->expiryDate());
}

std::optional<RVError> RehearsedKeychain::setCredentialForAccount(const RVAccount&,
                                                                  const std::optional<std::string>&) {
  return std::nullopt;
}

std::optional<RVError> RehearsedKeychain::removeCredentialForAccount(const RVAccount&,
                                                                     const std::optional<std::string>&) {
  return std::nullopt;
}

}  // namespace rehearsal
