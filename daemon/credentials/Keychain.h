// Who may store, read and delete which credential.
#pragma once

#include <atomic>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "base/Result.h"
#include "daemon/clients/Evidence.h"
#include "daemon/credentials/CredentialStore.h"
#include "daemon/records/Database.h"
#include "daemon/requests/RequestContext.h"
#include "host/RVDKeychainManager.h"
#include "host/RVLog.h"

namespace credentials {

// The daemon's keychain over a store that keeps the credentials. For an account object that was handed out
// for a request (records::Account), setting and removing answer an error where the request is void, or where
// a record or another living request of that client has stronger evidence of who the client is. A request
// whose evidence is unknown is the user's own, whom nothing outranks.
//
// A store can be out of reach. What cannot be deleted then counts as deleted: it is written down, read by
// nobody, and deleted when the store works again. Thread-safe. Only requestEnded is called on the bus thread.
class Keychain : public RVDKeychainManager {
 public:
  // The database, which holds the accounts and records, the store and the log outlive the keychain.
  Keychain(records::Database& database, CredentialStore& store, RVLogService& log);

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

  // What a client that is known by this evidence may be handed: its credential, and null unless a granted
  // record of no stronger evidence stands for it at this very moment, and no request of stronger evidence
  // has stored it for a record that is yet to come.
  std::shared_ptr<const RVAccountCredential> credentialForClient(const std::string& accountId,
                                                                 const std::string& clientId,
                                                                 clients::Evidence evidence);

  // Deletes the client's credential, or, where none is named, that of every client of the account; also what
  // no record stands for, as a request that became void may have stored it.
  base::Result<void> eraseClients(const std::string& accountId, const std::optional<std::string>& clientId);

  // Deletes every credential of the account, its own included. Called once the account is gone. What the
  // store cannot delete now it deletes when it works again, with a line in the log.
  void eraseAccount(const std::string& accountId);

  // At start, before anybody is served: deletes every client's credential for which no granted record
  // stands, and what is stored for an account that is not there, with a log line for each. After a failure it
  // is tried again when the store has worked.
  base::Result<void> reconcile();

  // When a request that is void has come to its end: deletes what it stored before it became void, unless a
  // granted record stands for that client or another request has stored a credential over it.
  void requestEnded(const std::shared_ptr<requests::RequestContext>& request);

 private:
  using Request = std::shared_ptr<requests::RequestContext>;

  // What the database says about a place.
  struct Standing {
    bool isOfAnAccount = false;  // the account is there; for a client's place, set up as well
    bool isGranted = false;      // a client's, and a granted record stands for it
    bool isDeleted = false;      // what may still be stored there counts as deleted
    clients::Evidence evidence = clients::Evidence::kUnknown;  // of the client's record
  };

  base::Result<Standing> standing(const Place& place);
  // client: how the client is known that asks; absent where the daemon itself does.
  bool mayBeRead(const Place& place, std::optional<clients::Evidence> client);
  std::shared_ptr<const RVAccountCredential> read(const Place& place,
                                                  std::optional<clients::Evidence> client);
  // What the store owes is done, now that a call of it has succeeded.
  void storeHasWorked();
  std::optional<RVError> changeFor(const Request& request,
                                   const Place& place,
                                   const std::function<base::Result<void>()>& change);

  // With changes_ held.
  base::Result<void> checkEvidence(const Place& place, const Request& request);
  base::Result<void> store(const Place& place, const RVAccountCredential& credential);
  base::Result<void> remove(const Place& place);
  base::Result<void> deleteWhatNobodyMayRead();

  // The living request that wrote there last; null where there is none.
  Request writerOf(const Place& place);
  void noteWriter(const Place& place, const Request& request);

  records::Database& database_;
  CredentialStore& store_;
  RVLogService& log_;
  std::mutex changes_;  // held while the store is changed
  std::atomic<bool> isReconcileOwed_ = false;
  std::mutex mutex_;  // taken last, and not held while the store or the database works
  std::map<Place, std::weak_ptr<requests::RequestContext>> writers_;  // who wrote last; guarded by mutex_
};

}  // namespace credentials
