// What the device's user and their tools call: com.zentor.rvd.Management1.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/Result.h"
#include "daemon/bus/AccountsService.h"
#include "daemon/bus/Dispatcher.h"
#include "daemon/bus/Parts.h"

namespace bus {

class ManagementService {
 public:
  // Registers the interface with the object. The references outlive this object.
  ManagementService(sdbus::IObject& object,
                    Dispatcher& dispatcher,
                    BusLoop& loop,
                    AccountsService& accountsService,
                    Parts parts);

 private:
  using SharedCall = const std::shared_ptr<Call>&;
  // A plug-in's call that answers before it returns.
  using Revocation = std::function<void(RVDAccessCompletion completion)>;

  // Accounts: ManagedAccounts.cpp.
  void addAccount(SharedCall call);
  void addAccountWithToken(Call& call,
                           const std::string& accountType,
                           const std::string& username,
                           int descriptor);
  void removeAccount(SharedCall call);
  void listAccounts(SharedCall call);

  // Access: ManagementService.cpp.
  void listAuthorizations(SharedCall call);
  void authorizeAccess(SharedCall call);
  void revokeAccess(SharedCall call);
  void revokeAllAccess(SharedCall call);
  void revoke(Call& call,
              const records::Intent& intent,
              const Revocation& revocation,
              const std::function<bool()>& isDone,
              std::optional<requests::RequestTable::Barrier> barrier);
  base::Result<void> eraseCredentials(const records::Intent& intent);
  void finish(std::int64_t intent);
  void listPendingRevocations(SharedCall call);
  void forgetRefusal(SharedCall call);
  void listAccessLog(SharedCall call);
  std::vector<std::string> clientsWithRecord(const std::string& accountType) const;

  // Why a request would end as it would: ManagedExplanations.cpp.
  void explainAccess(SharedCall call);

  // Preferences: ManagedPreferences.cpp.
  void getPreference(SharedCall call);
  void setPreference(SharedCall call);
  void resetPreference(SharedCall call);
  void postNotification(SharedCall call);

  void announceAccounts();
  void announceAuthorizations(const std::string& accountType);

  sdbus::IObject& object_;
  Dispatcher& dispatcher_;
  BusLoop& loop_;
  AccountsService& accountsService_;
  const Parts parts_;
};

// Throws sdbus::Error for a failure: InvalidArgs where what was asked for makes no sense, else Failed.
void throwFailure(const base::Failure& failure);

// Throws sdbus::Error (InvalidArgs) for what can be no client's ID.
void checkClientID(const std::string& id);

}  // namespace bus
