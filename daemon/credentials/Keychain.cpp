#include "daemon/credentials/Keychain.h"

#include <algorithm>
#include <utility>
#include <vector>

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
        "SELECT accounts.state = 1, authorizations.granted, authorizations.evidence, "
        "undeleted_credentials.account IS NOT NULL FROM accounts "
        "LEFT JOIN authorizations ON authorizations.account_type = accounts.account_type "
        "AND authorizations.client_id = ?2 "
        "LEFT JOIN undeleted_credentials ON undeleted_credentials.account = accounts.identifier "
        "AND undeleted_credentials.client_id = ?2 WHERE accounts.identifier = ?1");
    if (!statement) return statement.failure();
    const auto row = (*statement)->bind(place.accountId).bind(place.clientId).step();
    if (!row) return row.failure();
    if (!*row) return {};
    standing = {!place.clientId || (*statement)->number(0) != 0,
                (*statement)->number(1) != 0,
                (*statement)->number(3) != 0,
                static_cast<clients::Evidence>((*statement)->number(2))};
    return {};
  });
  if (!done) return done.failure();
  return standing;
}

bool Keychain::mayBeRead(const Place& place, std::optional<clients::Evidence> client) {
  // Who has written comes first: a writer that has ended by then has its record.
  const Request writer = writerOf(place);
  const auto found = standing(place);
  if (!found)
    logging::error(log_,
                   "Whether the credential of account %@, %@, may be read cannot be found out: %@",
                   {RVValue(place.accountId), ownerOf(place), RVValue(found.failure().message)});
  if (!found || !found->isOfAnAccount || found->isDeleted) return false;
  if (!client) return true;
  return found->isGranted && found->evidence <= *client && (!writer || writer->evidence() <= *client);
}

std::shared_ptr<const RVAccountCredential> Keychain::read(const Place& place,
                                                          std::optional<clients::Evidence> client) {
  if (!mayBeRead(place, client)) return nullptr;
  auto credential = store_.read(place);
  if (!credential) {
    logging::error(log_,
                   "The credential of account %@, %@, cannot be read: %@",
                   {RVValue(place.accountId), ownerOf(place), RVValue(credential.failure().message)});
    return nullptr;
  }
  storeHasWorked();
  // While the store was read, access may have been taken away.
  if (!*credential || !mayBeRead(place, client)) return nullptr;
  return std::make_shared<const RVAccountCredential>(**std::move(credential));
}

void Keychain::storeHasWorked() {
  if (!isReconcileOwed_) return;
  if (const auto done = reconcile(); !done)
    logging::error(
        log_, "What is left of deleted credentials stays stored: %@", {RVValue(done.failure().message)});
}

std::optional<RVError> Keychain::changeFor(const Request& request,
                                           const Place& place,
                                           const std::function<base::Result<void>()>& change) {
  std::optional<base::Result<void>> result;
  const auto work = [&] {
    const std::lock_guard lock(changes_);
    result = checkEvidence(place, request);
    if (*result) result = change();
  };
  if (request == nullptr)
    work();
  else
    request->unlessVoid(work);
  if (!result) return records::storageError(records::kRequestIsVoid);
  if (!*result) return records::storageError(result->failure().message);
  return std::nullopt;
}

base::Result<void> Keychain::checkEvidence(const Place& place, const Request& request) {
  if (request == nullptr || request->evidence() == clients::Evidence::kUnknown) return {};
  const Request writer = writerOf(place);  // before the record: see mayBeRead
  const auto found = standing(place);
  if (!found) return found.failure();
  const auto strongest = std::max(found->evidence, writer ? writer->evidence() : clients::Evidence::kUnknown);
  if (strongest > request->evidence())
    return base::Failure{base::FailureKind::kRefused,
                         "what is stored for the client was stored with stronger evidence of who it is"};
  return {};
}

base::Result<void> Keychain::store(const Place& place, const RVAccountCredential& credential) {
  const auto found = standing(place);
  if (!found) return found.failure();
  if (!found->isOfAnAccount) return base::Failure{base::FailureKind::kNotFound, "there is no such account"};
  if (auto written = store_.write(place, credential); !written) {
    isReconcileOwed_ = true;  // it may be there all the same
    return written;
  }
  if (!found->isDeleted) return {};
  return database_.write([&](Connection& connection) {
    return connection.run("DELETE FROM undeleted_credentials WHERE account = ?1 AND client_id IS ?2",
                          place.accountId,
                          place.clientId);
  });
}

base::Result<void> Keychain::remove(const Place& place) {
  const auto removed = store_.remove(place);
  if (removed) return {};
  isReconcileOwed_ = true;
  if (!place.clientId) return removed;
  auto noted = database_.write([&](Connection& connection) {
    return connection.run("INSERT OR IGNORE INTO undeleted_credentials (account, client_id) VALUES (?1, ?2)",
                          place.accountId,
                          place.clientId);
  });
  if (!noted) return noted;
  logging::error(log_,
                 "The credential of account %@, %@, cannot be deleted now: %@. Nobody is handed it any more, "
                 "and it is deleted later.",
                 {RVValue(place.accountId), ownerOf(place), RVValue(removed.failure().message)});
  return {};
}

std::shared_ptr<const RVAccountCredential> Keychain::credentialForAccount(
    const RVAccount& account,
    const std::optional<std::string>& clientID) {
  return read({account.identifier(), clientID}, std::nullopt);
}

std::optional<RVError> Keychain::setCredentialForAccount(const RVAccount& account,
                                                         const std::optional<std::string>& clientID) {
  if (!clientID) return withoutClientId();
  const auto credential = account.credential();
  if (credential == nullptr) return records::storageError("the account object carries no credential");
  const Place place{account.identifier(), clientID};
  const Request request = requestOf(account);
  auto error = changeFor(request, place, [&] {
    // Before it is stored, so that nobody reads it who may not.
    const Request earlier = writerOf(place);
    noteWriter(place, request);
    auto stored = store(place, *credential);
    if (!stored) noteWriter(place, earlier);
    return stored;
  });
  if (!error) storeHasWorked();
  return error;
}

std::optional<RVError> Keychain::removeCredentialForAccount(const RVAccount& account,
                                                            const std::optional<std::string>& clientID) {
  if (!clientID) return withoutClientId();
  const Place place{account.identifier(), clientID};
  return changeFor(requestOf(account), place, [&] { return remove(place); });
}

base::Result<void> Keychain::setMasterCredential(const std::string& accountId, RVSecret token) {
  const RVAccountCredential credential(std::move(token), RVSecret(), kRVDistantFuture);
  const std::lock_guard lock(changes_);
  return store({accountId, std::nullopt}, credential);
}

std::shared_ptr<const RVAccountCredential> Keychain::credentialForClient(const std::string& accountId,
                                                                         const std::string& clientId,
                                                                         clients::Evidence evidence) {
  return read({accountId, clientId}, evidence);
}

base::Result<void> Keychain::eraseClients(const std::string& accountId,
                                          const std::optional<std::string>& clientId) {
  const std::lock_guard lock(changes_);
  if (clientId) return remove({accountId, clientId});
  const auto places = store_.places();
  if (!places) {
    // Those of clients with a record are known, and count as deleted already.
    isReconcileOwed_ = true;
    logging::error(
        log_,
        "Whether the clients of account %@ have left credentials cannot be found out now: %@. They "
        "are deleted later.",
        {RVValue(accountId), RVValue(places.failure().message)});
    return {};
  }
  for (const Place& place : *places) {
    if (place.accountId != accountId || !place.clientId) continue;
    if (auto removed = remove(place); !removed) return removed;
  }
  return {};
}

void Keychain::eraseAccount(const std::string& accountId) {
  const auto erase = [&]() -> base::Result<void> {
    const auto places = store_.places();
    if (!places) return places.failure();
    for (const Place& place : *places) {
      if (place.accountId != accountId) continue;
      if (auto removed = store_.remove(place); !removed) return removed;
    }
    return {};
  };
  const std::lock_guard lock(changes_);
  const auto erased = erase();
  if (erased) return;
  isReconcileOwed_ = true;
  logging::error(log_,
                 "The credentials of account %@, which is gone, cannot be deleted now: %@. They are deleted "
                 "later.",
                 {RVValue(accountId), RVValue(erased.failure().message)});
}

base::Result<void> Keychain::reconcile() {
  const std::lock_guard lock(changes_);
  auto done = deleteWhatNobodyMayRead();
  isReconcileOwed_ = !done;
  return done;
}

base::Result<void> Keychain::deleteWhatNobodyMayRead() {
  const auto places = store_.places();
  if (!places) return places.failure();
  for (const Place& place : *places) {
    const auto found = standing(place);
    if (!found) return found.failure();
    const bool isInUse = !place.clientId || found->isGranted || writerOf(place) != nullptr;
    if (found->isOfAnAccount && !found->isDeleted && isInUse) continue;
    if (auto removed = store_.remove(place); !removed) return removed;
    if (!found->isOfAnAccount)
      logging::notice(log_,
                      "A credential was stored for account %@, which is not there; it is deleted.",
                      {RVValue(place.accountId)});
    else if (found->isDeleted)
      logging::notice(log_,
                      "The credential of account %@, %@, could not be deleted before; it is deleted now.",
                      {RVValue(place.accountId), ownerOf(place)});
    else
      logging::notice(log_,
                      "A credential of account %@ was stored for %@, which holds no grant; it is deleted.",
                      {RVValue(place.accountId), RVValue(*place.clientId)});
  }
  return database_.write(
      [](Connection& connection) { return connection.run("DELETE FROM undeleted_credentials"); });
}

Keychain::Request Keychain::writerOf(const Place& place) {
  const std::lock_guard lock(mutex_);
  const auto found = writers_.find(place);
  return found != writers_.end() ? found->second.lock() : nullptr;
}

void Keychain::noteWriter(const Place& place, const Request& request) {
  const std::lock_guard lock(mutex_);
  std::erase_if(writers_, [](const auto& entry) { return entry.second.expired(); });
  writers_.insert_or_assign(place, request);
}

void Keychain::requestEnded(const Request& request) {
  if (request == nullptr) return;
  std::vector<Place> written;
  {
    // Without changes_: a request that has stored nothing ends on the bus thread as well.
    const std::lock_guard lock(mutex_);
    for (const auto& [place, writer] : writers_)
      if (writer.lock() == request) written.push_back(place);
  }
  if (written.empty()) return;
  const std::lock_guard lock(changes_);
  for (const Place& place : written) {
    if (writerOf(place) != request) continue;
    const auto found = standing(place);
    // What stronger evidence has stored does not stay under a record of weaker evidence.
    const bool mayStay = found && found->isGranted && found->evidence >= request->evidence();
    const auto done = !found    ? base::Result<void>(found.failure())
                      : mayStay ? base::Result<void>()
                                : remove(place);
    if (!done)
      logging::error(
          log_, "What a void request has stored cannot be deleted: %@", {RVValue(done.failure().message)});
    const std::lock_guard writers(mutex_);
    writers_.erase(place);
  }
}

}  // namespace credentials
