#include "daemon/credentials/SealedStore.h"

#include <utility>

#include "daemon/credentials/CredentialBytes.h"
#include "daemon/log/Log.h"

namespace credentials {

using records::Connection;

SealedStore::SealedStore(records::Database& database, SealingKey key)
    : database_(database),
      key_(std::move(key)) {
}

base::Result<std::unique_ptr<SealedStore>> SealedStore::open(
    records::Database& database,
    const state::Directory& directory,
    const std::optional<std::filesystem::path>& handedInKey,
    RVLogService& log) {
  auto key = SealingKey::open(directory, handedInKey);
  if (!key) return key.failure();
  const bool isNew = key->isNew;
  std::unique_ptr<SealedStore> store(new SealedStore(database, std::move(key->key)));
  const auto stored = store->places();
  if (!stored) return stored.failure();
  if (isNew && !stored->empty())
    logging::error(log,
                   "The key of the stored credentials is gone, and a new one was made: the credentials "
                   "cannot be read any more. Accounts have to be added again.");
  return store;
}

base::Result<std::optional<RVAccountCredential>> SealedStore::read(const Place& place) {
  std::optional<std::string> sealed;
  const auto done = database_.read([&](Connection& connection) -> base::Result<void> {
    auto statement =
        connection.prepare("SELECT sealed FROM credentials WHERE account = ?1 AND client_id IS ?2");
    if (!statement) return statement.failure();
    const auto row = (*statement)->bind(place.accountId).bind(place.clientId).step();
    if (!row) return row.failure();
    if (*row) sealed = (*statement)->blob(0);
    return {};
  });
  if (!done) return done.failure();
  if (!sealed) return std::optional<RVAccountCredential>();
  const auto bytes = key_.open(*sealed, bindingOf(place.accountId, place.clientId));
  auto credential = bytes ? credentialFromBytes(*bytes) : std::nullopt;
  if (!credential)
    return base::Failure{base::FailureKind::kDamaged, "it was sealed under another key, or changed since"};
  return credential;
}

base::Result<void> SealedStore::write(const Place& place, const RVAccountCredential& credential) {
  const records::Blob sealed{
      key_.seal(bytesFromCredential(credential), bindingOf(place.accountId, place.clientId))};
  return database_.write([&](Connection& connection) {
    return connection.run(
        "INSERT OR REPLACE INTO credentials (account, client_id, sealed) VALUES (?1, ?2, ?3)",
        place.accountId,
        place.clientId,
        sealed);
  });
}

base::Result<void> SealedStore::remove(const Place& place) {
  return database_.write([&](Connection& connection) {
    return connection.run(
        "DELETE FROM credentials WHERE account = ?1 AND client_id IS ?2", place.accountId, place.clientId);
  });
}

base::Result<std::vector<Place>> SealedStore::places() {
  std::vector<Place> places;
  const auto done = database_.read([&](Connection& connection) -> base::Result<void> {
    auto statement = connection.prepare("SELECT account, client_id FROM credentials");
    if (!statement) return statement.failure();
    for (;;) {
      const auto row = (*statement)->step();
      if (!row) return row.failure();
      if (!*row) return {};
      places.push_back({(*statement)->text(0), (*statement)->optionalText(1)});
    }
  });
  if (!done) return done.failure();
  return places;
}

}  // namespace credentials
