#include "daemon/records/RequestStore.h"

#include <utility>

#include "daemon/log/Log.h"
#include "daemon/records/Account.h"
#include "daemon/records/StorageError.h"

namespace records {

RequestStore::RequestStore(AuthorizationRecords& records,
                           const Accounts& accounts,
                           std::shared_ptr<requests::RequestContext> request,
                           ClientLookup clients,
                           RVLogService& log)
    : records_(records),
      accounts_(accounts),
      request_(std::move(request)),
      clients_(std::move(clients)),
      log_(log) {
}

std::vector<std::shared_ptr<RVAccount>> RequestStore::accountsWithAccountTypeIdentifier(
    std::string_view identifier) {
  std::vector<std::shared_ptr<RVAccount>> found;
  for (AccountRecord& account : accounts_.listOfType(identifier))
    found.push_back(std::make_shared<Account>(std::move(account), request_));
  return found;
}

clients::Evidence RequestStore::evidence() const {
  return request_ != nullptr ? request_->evidence() : clients::Evidence::kUnknown;
}

RVDClientAuthorization RequestStore::authorizationFromRecord(const AuthorizationRecord& record) const {
  RVDClientAuthorization authorization(clients_(record.clientId));
  authorization.setIsGranted(record.granted);
  authorization.setGrantedPermissions(record.permissions);
  authorization.setOptions(record.options);
  return authorization;
}

std::optional<RVDClientAuthorization> RequestStore::authorizationForClient(const RVDClient& client,
                                                                           const RVAccountType& accountType) {
  const auto clientId = client.bundleID();
  if (!clientId) return std::nullopt;
  const auto record = records_.find(accountType.identifier(), *clientId);
  if (!record) return std::nullopt;
  // One that came up since the request began, or the caller would have been told apart from its client.
  if (evidence() != clients::Evidence::kUnknown && record->evidence > evidence()) {
    request_->makeVoid(requests::VoidReason::kWeakerEvidence);
    return std::nullopt;
  }
  return authorizationFromRecord(*record);
}

std::vector<RVDClientAuthorization> RequestStore::allAuthorizationsForAccountType(
    const RVAccountType& accountType) {
  std::vector<RVDClientAuthorization> all;
  for (const AuthorizationRecord& record : records_.list(accountType.identifier()))
    all.push_back(authorizationFromRecord(record));
  return all;
}

base::Result<void> RequestStore::unlessVoid(const std::function<base::Result<void>()>& write) {
  if (request_ == nullptr) return write();
  base::Result<void> result = base::Failure{base::FailureKind::kRefused, kRequestIsVoid};
  request_->unlessVoid([&] { result = write(); });
  return result;
}

std::optional<RVError> RequestStore::setAuthorization(const RVDClientAuthorization& authorization,
                                                      const RVDClient& client,
                                                      const RVAccountType& accountType) {
  const auto clientId = client.bundleID();
  if (!clientId)
    return storageError("nothing is stored for a client without an ID", kRVErrorClientWithoutBundleID);
  bool isWeaker = false;
  const auto done = unlessVoid([&] {
    AuthorizationRecord record{accountType.identifier(),
                               *clientId,
                               authorization.isGranted(),
                               authorization.grantedPermissions(),
                               authorization.options(),
                               {},
                               evidence()};
    // A caller that has an ID is known somehow.
    if (evidence() == clients::Evidence::kUnknown) return records_.putForUser(std::move(record));
    auto put = records_.put(std::move(record));
    isWeaker = !put && put.failure().kind == base::FailureKind::kRefused;
    return put;
  });
  if (done) {
    if (request_ != nullptr) request_->decisionStored();
    return std::nullopt;
  }
  if (isWeaker) request_->makeVoid(requests::VoidReason::kWeakerEvidence);
  logging::error(
      log_, "The record of %@ is not stored: %@", {RVValue(*clientId), RVValue(done.failure().message)});
  return storageError(done.failure().message);
}

void RequestStore::removeAllClientAuthorizationsForAccountType(const RVAccountType& accountType) {
  const auto done = unlessVoid([&] { return records_.removeAll(accountType.identifier()); });
  if (!done)
    logging::error(log_,
                   "The records of %@ are not removed: %@",
                   {RVValue(accountType.identifier()), RVValue(done.failure().message)});
}

}  // namespace records
