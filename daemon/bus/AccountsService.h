// What applications call: com.zentor.rvd.Accounts1.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "daemon/bus/Dispatcher.h"
#include "daemon/bus/Parts.h"

namespace bus {

class AccountsService {
 public:
  // Registers the interface with the object. The references outlive this object.
  AccountsService(sdbus::IObject& object, Dispatcher& dispatcher, BusLoop& loop, Parts parts);

  // Tells the connections of the clients that their access was changed by someone else. From any thread,
  // without a lock.
  void accessChanged(const std::string& accountType, const std::vector<std::string>& clientIDs);

 private:
  void registerCaller(const std::shared_ptr<Call>& call);
  void requestAccess(const std::shared_ptr<Call>& call);
  void getAccess(const std::shared_ptr<Call>& call);
  void getCredential(const std::shared_ptr<Call>& call);
  void checkRate(const std::string& uniqueName) const;

  sdbus::IObject& object_;
  Dispatcher& dispatcher_;
  BusLoop& loop_;
  const Parts parts_;
};

}  // namespace bus
