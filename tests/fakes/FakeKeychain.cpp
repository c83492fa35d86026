#include "tests/fakes/FakeKeychain.h"

namespace fakes {
namespace {

std::shared_ptr<const RVAccountCredential> credentialOf(const std::string& token) {
  return std::make_shared<const RVAccountCredential>(RVSecret(token), RVSecret(""), kRVDistantFuture);
}

RVError refusal(int code, const char* text) {
  return {std::string(RVErrorDomain), code, {{std::string(kRVErrorLocalizedDescriptionKey), text}}};
}

RVError clientIDMissing() {
  return refusal(kRVErrorClientWithoutBundleID, "An account's own credential is not changed here.");
}

}  // namespace

FakeKeychain::FakeKeychain()
    : Fake("keychain") {
}

std::shared_ptr<const RVAccountCredential> FakeKeychain::credentialForAccount(
    const RVAccount& account,
    const std::optional<std::string>& clientID) {
  begin("credentialForAccount");
  return stored(account.identifier(), clientID);
}

std::optional<RVError> FakeKeychain::setCredentialForAccount(const RVAccount& account,
                                                             const std::optional<std::string>& clientID) {
  begin("setCredentialForAccount");
  const Key key(account.identifier(), clientID);
  const auto credential = account.credential();
  if (!clientID) return clientIDMissing();
  if (credential == nullptr)
    return refusal(kRVErrorInvalidOptions, "The account object carries no credential.");
  const std::lock_guard lock(mutex_);
  if (writeError_) return writeError_;
  credentials_[key] = credential;
  return std::nullopt;
}

std::optional<RVError> FakeKeychain::removeCredentialForAccount(const RVAccount& account,
                                                                const std::optional<std::string>& clientID) {
  begin("removeCredentialForAccount");
  const Key key(account.identifier(), clientID);
  const std::lock_guard lock(mutex_);
  removals_.push_back(key);
  if (!clientID) return clientIDMissing();
  if (writeError_) return writeError_;
  credentials_.erase(key);
  return std::nullopt;
}

void FakeKeychain::setMasterToken(const std::string& accountID, std::optional<std::string> token) {
  const std::lock_guard lock(mutex_);
  if (token) {
    credentials_[{accountID, std::nullopt}] = credentialOf(*token);
  } else {
    credentials_.erase({accountID, std::nullopt});
  }
}

void FakeKeychain::putCredential(const std::string& accountID,
                                 const std::string& clientID,
                                 const std::string& token) {
  const std::lock_guard lock(mutex_);
  credentials_[{accountID, clientID}] = credentialOf(token);
}

void FakeKeychain::failWritesWith(std::optional<RVError> error) {
  const std::lock_guard lock(mutex_);
  writeError_ = std::move(error);
}

std::shared_ptr<const RVAccountCredential> FakeKeychain::stored(
    const std::string& accountID,
    const std::optional<std::string>& clientID) const {
  const std::lock_guard lock(mutex_);
  const auto found = credentials_.find({accountID, clientID});
  return found != credentials_.end() ? found->second : nullptr;
}

std::size_t FakeKeychain::storedCount() const {
  const std::lock_guard lock(mutex_);
  return credentials_.size();
}

std::vector<std::pair<std::string, std::optional<std::string>>> FakeKeychain::removals() const {
  const std::lock_guard lock(mutex_);
  return removals_;
}

}  // namespace fakes
