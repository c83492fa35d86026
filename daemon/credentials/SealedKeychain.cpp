#include "daemon/credentials/SealedKeychain.h"

#include <functional>

#include "daemon/credentials/CredentialBytes.h"
#include "daemon/log/Log.h"
#include "daemon/records/Account.h"
#include "daemon/records/StorageError.h"

namespace credentials {
namespace {

using records::Connection;

// A client's credential without a granted record, by its row.
constexpr const char* kWithoutGrant =
    "client_id IS NOT NULL AND NOT EXISTS (SELECT 1 FROM accounts JOIN authorizations USING (account_type) "
    "WHERE accounts.identifier = credentials.account AND authorizations.client_id = credentials.client_id "
    "AND authorizations.granted = 1)";

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

base::Result<bool> holdsCredentials(records::Database& database) {
  bool holds = false;
  const auto done = database.read([&](Connection& connection) -> base::Result<void> {
    auto statement = connection.prepare("SELECT EXISTS (SELECT 1 FROM credentials)");
    if (!statement) return statement.failure();
    if (auto row = (*statement)->step(); !row) return row.failure();
    holds = (*statement)->number(0) != 0;
    return {};
  });
  if (!done) return done.failure();
  return holds;
}

}  // namespace

SealedKeychain::SealedKeychain(records::Database& database, SealingKey key, RVLogService& log)
    : database_(database),
      key_(std::move(key)),
      log_(log) {
}

base::Result<std::unique_ptr<SealedKeychain>> SealedKeychain::open(
    records::Database& database,
    const state::Directory& directory,
    const std::optional<std::filesystem::path>& handedInKey,
    RVLogService& log) {
  auto key = SealingKey::open(directory, handedInKey);
  if (!key) return key.failure();
  if (key->isNew) {
    const auto holds = holdsCredentials(database);
    if (!holds) return holds.failure();
    if (*holds)
      logging::error(log,
                     "The key of the stored credentials is gone, and a new one was made: the credentials "
                     "cannot be read any more. Accounts have to be added again.");
  }
  return std::unique_ptr<SealedKeychain>(new SealedKeychain(database, std::move(key->key), log));
}

std::shared_ptr<const RVAccountCredential> SealedKeychain::read(const Place& place, bool onlyGranted) {
  std::optional<std::string> sealed;
  const auto done = database_.read([&](Connection& connection) -> base::Result<void> {
    static const std::string kAny = "SELECT sealed FROM credentials WHERE account = ?1 AND client_id IS ?2";
    static const std::string kGranted = kAny + " AND NOT (" + kWithoutGrant + ")";
    auto statement = connection.prepare((onlyGranted ? kGranted : kAny).c_str());
    if (!statement) return statement.failure();
    (*statement)->bind(place.accountId).bind(place.clientId);
    const auto row = (*statement)->step();
    if (!row) return row.failure();
    if (*row) sealed = (*statement)->blob(0);
    return {};
  });
  const std::string who = place.clientId ? "of the client " + *place.clientId : std::string("of its own");
  if (!done) {
    logging::error(log_,
                   "The credential of account %@, %@, cannot be read: %@",
                   {RVValue(place.accountId), RVValue(who), RVValue(done.failure().message)});
    return nullptr;
  }
  if (!sealed) return nullptr;
  const auto bytes = key_.open(*sealed, bindingOf(place.accountId, place.clientId));
  auto credential = bytes ? credentialFromBytes(*bytes) : std::nullopt;
  if (!credential) {
    logging::error(log_,
                   "The credential of account %@, %@, cannot be opened: it was sealed under another key, or "
                   "changed since",
                   {RVValue(place.accountId), RVValue(who)});
    return nullptr;
  }
  return std::make_shared<const RVAccountCredential>(*std::move(credential));
}

base::Result<void> SealedKeychain::store(const Place& place, const RVAccountCredential& credential) {
  const records::Blob sealed{
      key_.seal(bytesFromCredential(credential), bindingOf(place.accountId, place.clientId))};
  return database_.write([&](Connection& connection) -> base::Result<void> {
    auto known = connection.prepare("SELECT 1 FROM accounts WHERE identifier = ?1");
    if (!known) return known.failure();
    const auto row = (*known)->bind(place.accountId).step();
    if (!row) return row.failure();
    if (!*row) return base::Failure{base::FailureKind::kNotFound, "there is no such account"};
    return connection.run(
        "INSERT OR REPLACE INTO credentials (account, client_id, sealed) VALUES (?1, ?2, ?3)",
        place.accountId,
        place.clientId,
        sealed);
  });
}

base::Result<void> SealedKeychain::remove(const Place& place) {
  return database_.write([&](Connection& connection) {
    return connection.run(
        "DELETE FROM credentials WHERE account = ?1 AND client_id IS ?2", place.accountId, place.clientId);
  });
}

std::shared_ptr<const RVAccountCredential> SealedKeychain::credentialForAccount(
    const RVAccount& account,
    const std::optional<std::string>& clientID) {
  return read({account.identifier(), clientID}, false);
}

std::optional<RVError> SealedKeychain::setCredentialForAccount(const RVAccount& account,
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

std::optional<RVError> SealedKeychain::removeCredentialForAccount(
    const RVAccount& account,
    const std::optional<std::string>& clientID) {
  if (!clientID) return withoutClientId();
  return writeFor(account, [&] { return remove({account.identifier(), clientID}); });
}

base::Result<void> SealedKeychain::setMasterCredential(const std::string& accountId, RVSecret token) {
  const RVAccountCredential credential(std::move(token), RVSecret(), kRVDistantFuture);
  return store({accountId, std::nullopt}, credential);
}

std::shared_ptr<const RVAccountCredential> SealedKeychain::credentialForClient(const std::string& accountId,
                                                                               const std::string& clientId) {
  return read({accountId, clientId}, true);
}

base::Result<void> SealedKeychain::reconcile() {
  return database_.write([&](Connection& connection) -> base::Result<void> {
    static const std::string kDelete =
        std::string("DELETE FROM credentials WHERE ") + kWithoutGrant + " RETURNING account, client_id";
    auto statement = connection.prepare(kDelete.c_str());
    if (!statement) return statement.failure();
    for (;;) {
      const auto row = (*statement)->step();
      if (!row) return row.failure();
      if (!*row) return {};
      logging::notice(log_,
                      "A credential of account %@ was stored for %@, which holds no grant; it is deleted.",
                      {RVValue((*statement)->text(0)), RVValue((*statement)->text(1))});
    }
  });
}

void SealedKeychain::requestEnded(const std::shared_ptr<requests::RequestContext>& request) {
  if (request == nullptr) return;
  const std::lock_guard lock(mutex_);
  for (auto entry = writers_.begin(); entry != writers_.end();) {
    if (entry->second.lock() != request) {
      ++entry;
      continue;
    }
    const auto done = database_.write([&](Connection& connection) {
      static const std::string kDelete =
          std::string("DELETE FROM credentials WHERE account = ?1 AND client_id IS ?2 AND ") + kWithoutGrant;
      return connection.run(kDelete.c_str(), entry->first.accountId, entry->first.clientId);
    });
    if (!done)
      logging::error(
          log_, "What a void request has stored cannot be deleted: %@", {RVValue(done.failure().message)});
    entry = writers_.erase(entry);
  }
}

}  // namespace credentials
