// Accounts, clients, authorization records, and the store that hands them out.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "host/Values.h"

class RVAccountCredential;

// A kind of account, "com.zentor.facebook" for example. Immutable, shared between threads.
class RVAccountType {
 public:
  explicit RVAccountType(std::string identifier)
      : identifier_(std::move(identifier)) {}
  const std::string& identifier() const { return identifier_; }

 private:
  std::string identifier_;
};

// One account of the device, as handed out for one call of the plug-in. The object belongs to that
// call: what is attached to it is seen by nobody else. Used by one thread at a time.
class RVAccount {
 public:
  virtual ~RVAccount() = default;

  // Names the account in the daemon's stores.
  virtual std::string identifier() const = 0;

  // For log lines; holds no secret.
  virtual std::string description() const = 0;

  virtual std::shared_ptr<const RVAccountType> accountType() const = 0;
  virtual void setAccountType(std::shared_ptr<const RVAccountType> accountType) = 0;

  // The credential that the object carries, null at first. RVDKeychainManager stores it from here.
  virtual std::shared_ptr<const RVAccountCredential> credential() const = 0;
  virtual void setCredential(std::shared_ptr<const RVAccountCredential> credential) = 0;
};

// The application that asks. Immutable, shared between threads.
class RVDClient {
 public:
  virtual ~RVDClient() = default;

  // The application's ID; absent where the daemon could not tell which application it is.
  virtual std::optional<std::string> bundleID() const = 0;

  // The name that the user knows it by. Never empty.
  virtual std::string localizedAppName() const = 0;

  // Whether the device's policy gives the client this entitlement.
  virtual bool hasEntitlement(std::string_view entitlement) const = 0;

  // For log lines and error texts.
  virtual std::string description() const = 0;
};

// What is on record about one client's access to one account type. A plain value: changing one
// changes nothing that is stored until it is handed to RVDAuthorizationManager.
//
// Granted: the client may use the account with the granted permissions. Not granted: a standing
// refusal. A client without a record has never been decided about.
class RVDClientAuthorization {
 public:
  explicit RVDClientAuthorization(std::shared_ptr<const RVDClient> client)
      : client_(std::move(client)) {}

  const std::shared_ptr<const RVDClient>& client() const { return client_; }

  bool isGranted() const { return isGranted_; }
  void setIsGranted(bool isGranted) { isGranted_ = isGranted; }

  // Absent and empty are different, and both are kept.
  const std::optional<RVPermissionSet>& grantedPermissions() const { return grantedPermissions_; }
  void setGrantedPermissions(std::optional<RVPermissionSet> grantedPermissions) {
    grantedPermissions_ = std::move(grantedPermissions);
  }

  // What was remembered of the request's options; absent and empty are different, and both are kept.
  const std::optional<RVDictionary>& options() const { return options_; }
  void setOptions(std::optional<RVDictionary> options) { options_ = std::move(options); }

 private:
  std::shared_ptr<const RVDClient> client_;
  bool isGranted_ = false;
  std::optional<RVPermissionSet> grantedPermissions_;
  std::optional<RVDictionary> options_;
};

// The authorization records. Called from any thread; calls do not wait for the user or the network.
// Once a writing call has returned without an error, its effect survives the end of the process.
class RVDAuthorizationManager {
 public:
  virtual ~RVDAuthorizationManager() = default;

  // The client's record, absent where there is none. A record that cannot be read is absent too (the
  // host logs why), so that the user is asked again. A client without a bundle ID has no record.
  virtual std::optional<RVDClientAuthorization> authorizationForClient(const RVDClient& client,
                                                                       const RVAccountType& accountType) = 0;

  // All records of the account type, in byte order of their clients' IDs.
  virtual std::vector<RVDClientAuthorization> allAuthorizationsForAccountType(
      const RVAccountType& accountType) = 0;

  // Stores the record, replacing an earlier one. Returns why it could not; the earlier record then
  // stands unchanged. Nothing is ever stored for a client without a bundle ID.
  virtual std::optional<RVError> setAuthorization(const RVDClientAuthorization& authorization,
                                                  const RVDClient& client,
                                                  const RVAccountType& accountType) = 0;

  // Removes every record of the account type. A failure is logged by the host.
  virtual void removeAllClientAuthorizationsForAccountType(const RVAccountType& accountType) = 0;
};

// The daemon's accounts and records, as handed to one call of the plug-in. Called from any thread, and
// alive at least until the call's completion has run.
class RVDAccountStore {
 public:
  virtual ~RVDAccountStore() = default;

  // The accounts of the type, in the order in which they were set up; empty where there is none. New
  // objects on every call.
  virtual std::vector<std::shared_ptr<RVAccount>> accountsWithAccountTypeIdentifier(
      std::string_view identifier) = 0;

  // Lives as long as the store.
  virtual RVDAuthorizationManager& authorizationManager() = 0;
};
