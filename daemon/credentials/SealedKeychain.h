// Credentials, each sealed by itself, in the daemon's own database.
#pragma once

#include <filesystem>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <tuple>

#include "base/Result.h"
#include "daemon/credentials/SealingKey.h"
#include "daemon/records/Database.h"
#include "daemon/requests/RequestContext.h"
#include "daemon/state/Directory.h"
#include "host/RVDKeychainManager.h"
#include "host/RVLog.h"

namespace credentials {

// docs/storage.md describes how a credential is sealed. For an account object that was handed out for a
// request (records::Account), a request that is void has no effect: setting and removing answer an error.
// Thread-safe.
class SealedKeychain : public RVDKeychainManager {
 public:
  // Reads the key (SealingKey::open). Where credentials are stored but their key is gone, an error goes to
  // the log; they count as absent from then on. The database and the log outlive the keychain.
  static base::Result<std::unique_ptr<SealedKeychain>> open(
      records::Database& database,
      const state::Directory& directory,
      const std::optional<std::filesystem::path>& handedInKey,
      RVLogService& log);

  std::shared_ptr<const RVAccountCredential> credentialForAccount(
      const RVAccount& account,
      const std::optional<std::string>& clientID) override;
  std::optional<RVError> setCredentialForAccount(const RVAccount& account,
                                                 const std::optional<std::string>& clientID) override;
  std::optional<RVError> removeCredentialForAccount(const RVAccount& account,
                                                    const std::optional<std::string>& clientID) override;

  // Stores the account's own credential: this token, no refresh token, no expiry. kNotFound where there is
  // no such account.
  base::Result<void> setMasterCredential(const std::string& accountId, RVSecret token);

  // What a client may be handed: its credential, and null unless a granted record stands for it at this
  // very moment.
  std::shared_ptr<const RVAccountCredential> credentialForClient(const std::string& accountId,
                                                                 const std::string& clientId);

  // At start, before anybody is served: deletes every client's credential for which no granted record
  // stands, with a log line for each.
  base::Result<void> reconcile();

  // When a request that is void has come to its end: deletes what it stored before it became void, unless a
  // granted record stands for that client or another request has stored a credential over it.
  void requestEnded(const std::shared_ptr<requests::RequestContext>& request);

 private:
  struct Place {
    std::string accountId;
    std::optional<std::string> clientId;
    friend bool operator<(const Place& a, const Place& b) {
      return std::tie(a.accountId, a.clientId) < std::tie(b.accountId, b.clientId);
    }
  };

  SealedKeychain(records::Database& database, SealingKey key, RVLogService& log);
  base::Result<void> store(const Place& place, const RVAccountCredential& credential);
  base::Result<void> remove(const Place& place);
  std::shared_ptr<const RVAccountCredential> read(const Place& place, bool onlyGranted);

  records::Database& database_;
  const SealingKey key_;
  RVLogService& log_;
  std::mutex mutex_;
  std::map<Place, std::weak_ptr<requests::RequestContext>> writers_;  // who wrote last; guarded by mutex_
};

}  // namespace credentials
