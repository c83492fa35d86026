#include "daemon/credentials/Keychain.h"

#include <functional>
#include <utility>

#include "daemon/log/Log.h"
#include "daemon/records/Account.h"
#include "daemon/records/StorageError.h"

namespace credentials {
namespace {

using records::Connection;

std::shared_ptr<requests::RequestContext> requestOf(const RVAccount& account) {
  const auto* ours = dynamic_cast<const records::Account*>(&account);
  return ours != nullptr ? ours->request() : nullptr;
}

// Writes for the request that the account object was handed out for.
std::optional<RVError> writeFor(const RVAccount& account, const std::function<base::Result<void>()>& write) {
  const auto request = requestOf(account);
  std::optional<base::Result<void>> result;
  if (request == nullptr) {
    result = write();
  } else {
    request->unlessVoid([&] { result = write(); });
  }
  if (!result) return records::storageError(records::kRequestIsVoid);
  if (!*result) return records::storageError(result->failure().message);
  return std::nullopt;
}

RVError withoutClientId() {
  return records::storageError("an account's own credential is not a client's to change",
                               kRVErrorClientWithoutBundleID);
}

// Whose the credential is, for a line of the log.
RVValue ownerOf(const Place& place) {
  return RVValue(place.clientId ? "of the client " + *place.clientId : std::string("of its own"));
}

}  // namespace

Keychain::Keychain(records::Database& database, CredentialStore& store, RVLogService& log)
    : database_(database),
      store_(store),
      log_(log) {
}

base::Result<Keychain::Standing> Keychain::standing(const Place& place) {
  Standing standing;
  const auto done = database_.read([&](Connection& connection) -> base::Result<void> {
    auto statement = connection.prepare(
        "SELECT authorizations.granted FROM accounts LEFT JOIN authorizations ON authorizations.account_type "
        "= accounts.account_type AND authorizations.client_id = ?2 WHERE accounts.identifier = ?1");
    if (!statement) return statement.failure();
    const auto row = (*statement)->bind(place.accountId).bind(place.clientId).step();
    if (!row) return row.failure();
    standing = {*row, *row && (*statement)->number(0) == 1};
    return {};
  });
  if (!done) return done.failure();
  return standing;
}

bool Keychain::isGranted(const Place& place) {
  const auto found = standing(place);
  if (!found)
    logging::error(log_,
                   "Whether the client %@ holds a grant cannot be read: %@",
                   {RVValue(place.clientId.value_or("")), RVValue(found.failure().message)});
  return found && found->isGranted;
}

std::shared_ptr<const RVAccountCredential> Keychain::read(const Place& place) {
  auto credential = store_.read(place);
  if (!credential) {
    logging::error(log_,
                   "The credential of account %@, %@, cannot be read: %@",
                   {RVValue(place.accountId), ownerOf(place), RVValue(credential.failure().message)});
    return nullptr;
  }
  if (!*credential) return nullptr;
  return std::make_shared<const RVAccountCredential>(**std::move(credential));
}

base::Result<void> Keychain::store(const Place& place, const RVAccountCredential& credential) {
  const auto found = standing(place);
  if (!found) return found.failure();
  if (!found->isOfAnAccount) return base::Failure{base::FailureKind::kNotFound, "there is no such account"};
  return store_.write(place, credential);
}

std::shared_ptr<const RVAccountCredential> Keychain::credentialForAccount(
    const RVAccount& account,
    const std::optional<std::string>& clientID) {
  return read({account.identifier(), clientID});
}

std::optional<RVError> Keychain::setCredentialForAccount(const RVAccount& account,
                                                         const std::optional<std::string>& clientID) {
  if (!clientID) return withoutClientId();
  const auto credential = account.credential();
  if (credential == nullptr) return records::storageError("the account object carries no credential");
  const Place place{account.identifier(), clientID};
  return writeFor(account, [&] {
    const std::lock_guard lock(mutex_);
    auto stored = store(place, *credential);
    if (stored) {
      std::erase_if(writers_, [](const auto& entry) { return entry.second.expired(); });
      writers_.insert_or_assign(place, requestOf(account));
    }
    return stored;
  });
}

std::optional<RVError> Keychain::removeCredentialForAccount(const RVAccount& account,
                                                            const std::optional<std::string>& clientID) {
  if (!clientID) return withoutClientId();
  return writeFor(account, [&] {
    const std::lock_guard lock(mutex_);
    return store_.remove({account.identifier(), clientID});
  });
}

base::Result<void> Keychain::setMasterCredential(const std::string& accountId, RVSecret token) {
  const RVAccountCredential credential(std::move(token), RVSecret(), kRVDistantFuture);
  const std::lock_guard lock(mutex_);
  return store({accountId, std::nullopt}, credential);
}

std::shared_ptr<const RVAccountCredential> Keychain::credentialForClient(const std::string& accountId,
                                                                         const std::string& clientId) {
  const Place place{accountId, clientId};
  if (!isGranted(place)) return nullptr;
  auto credential = read(place);
  // While the store was read, the grant may have been taken away.
  return isGranted(place) ? credential : nullptr;
}

base::Result<void> Keychain::eraseClients(const std::string& accountId,
                                          const std::optional<std::string>& clientId) {
  const std::lock_guard lock(mutex_);
  if (clientId) return store_.remove({accountId, clientId});
  const auto places = store_.places();
  if (!places) return places.failure();
  for (const Place& place : *places) {
    if (place.accountId != accountId || !place.clientId) continue;
    if (auto removed = store_.remove(place); !removed) return removed;
  }
  return {};
}

base::Result<void> Keychain::eraseAccount(const std::string& accountId) {
  const std::lock_guard lock(mutex_);
  const auto places = store_.places();
  if (!places) return places.failure();
  for (const Place& place : *places) {
    if (place.accountId != accountId) continue;
    if (auto removed = store_.remove(place); !removed) return removed;
  }
  return {};
}

base::Result<void> Keychain::reconcile() {
  const std::lock_guard lock(mutex_);
  const auto places = store_.places();
  if (!places) return places.failure();
  for (const Place& place : *places) {
    const auto found = standing(place);
    if (!found) return found.failure();
    if (found->isOfAnAccount && (!place.clientId || found->isGranted)) continue;
    if (auto removed = store_.remove(place); !removed) return removed;
    if (found->isOfAnAccount)
      logging::notice(log_,
                      "A credential of account %@ was stored for %@, which holds no grant; it is deleted.",
                      {RVValue(place.accountId), RVValue(*place.clientId)});
    else
      logging::notice(log_,
                      "A credential was stored for account %@, which is not there; it is deleted.",
                      {RVValue(place.accountId)});
  }
  return {};
}

void Keychain::requestEnded(const std::shared_ptr<requests::RequestContext>& request) {
  if (request == nullptr) return;
  const std::lock_guard lock(mutex_);
  for (auto entry = writers_.begin(); entry != writers_.end();) {
    if (entry->second.lock() != request) {
      ++entry;
      continue;
    }
    const auto found = standing(entry->first);
    base::Result<void> done;
    if (!found)
      done = found.failure();
    else if (!found->isGranted)
      done = store_.remove(entry->first);
    if (!done)
      logging::error(
          log_, "What a void request has stored cannot be deleted: %@", {RVValue(done.failure().message)});
    entry = writers_.erase(entry);
  }
}

}  // namespace credentials
