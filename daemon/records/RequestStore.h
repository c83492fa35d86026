// The accounts and records as one request sees them.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "daemon/records/Accounts.h"
#include "daemon/records/AuthorizationRecords.h"
#include "daemon/requests/RequestContext.h"
#include "host/RVDAccountStore.h"
#include "host/RVLog.h"

namespace records {

// The client of an ID, also of one that is not installed any more. Never null. Called from any thread.
using ClientLookup = std::function<std::shared_ptr<const RVDClient>(const std::string& clientId)>;

// What a plug-in is given for one request. Nothing that it writes once the request is void is stored; it
// gets an error back. A request that meets a record which was made with stronger evidence than its own
// becomes void. The records and accounts outlive the store.
class RequestStore : public RVDAccountStore, private RVDAuthorizationManager {
 public:
  // request: may be null (a call that no request stands behind).
  RequestStore(AuthorizationRecords& records,
               const Accounts& accounts,
               std::shared_ptr<requests::RequestContext> request,
               ClientLookup clients,
               RVLogService& log);

  std::vector<std::shared_ptr<RVAccount>> accountsWithAccountTypeIdentifier(
      std::string_view identifier) override;
  RVDAuthorizationManager& authorizationManager() override { return *this; }

 private:
  std::optional<RVDClientAuthorization> authorizationForClient(const RVDClient& client,
                                                               const RVAccountType& accountType) override;
  std::vector<RVDClientAuthorization> allAuthorizationsForAccountType(
      const RVAccountType& accountType) override;
  std::optional<RVError> setAuthorization(const RVDClientAuthorization& authorization,
                                          const RVDClient& client,
                                          const RVAccountType& accountType) override;
  void removeAllClientAuthorizationsForAccountType(const RVAccountType& accountType) override;

  // How the caller is known; unknown where it is the user who acts, without a caller.
  clients::Evidence evidence() const;
  RVDClientAuthorization authorizationFromRecord(const AuthorizationRecord& record) const;
  base::Result<void> unlessVoid(const std::function<base::Result<void>()>& write);

  AuthorizationRecords& records_;
  const Accounts& accounts_;
  const std::shared_ptr<requests::RequestContext> request_;
  const ClientLookup clients_;
  RVLogService& log_;
};

}  // namespace records
