// One of every fake, and a device with one Facebook account on it.
#pragma once

#include <memory>
#include <set>
#include <string>

#include "host/RVDAccountAccessPlugin.h"
#include "tests/fakes/FakeAccountStore.h"
#include "tests/fakes/FakeClient.h"
#include "tests/fakes/FakeFacebookRequests.h"
#include "tests/fakes/FakeKeychain.h"
#include "tests/fakes/FakePreferences.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/fakes/FakeUserNotifications.h"

namespace fakes {

// The account is "account-1", with the master token "master-token". All calls to all of the fakes stand
// in one journal, those of clients made with makeClient included.
class FakeHost {
 public:
  FakeHost();
  // Takes the journal's hook away: a queue that outlives the host still writes its calls down.
  ~FakeHost();

  RVDHostServices services();

  std::shared_ptr<FakeClient> makeClient(std::optional<std::string> bundleID = "org.example.PhotoApp",
                                         std::set<std::string, std::less<>> entitlements = {});

  const std::shared_ptr<CallJournal> journal = std::make_shared<CallJournal>();
  const std::shared_ptr<const RVAccountType> accountType;
  const std::shared_ptr<FakeAccountStore> store = std::make_shared<FakeAccountStore>();
  FakeKeychain keychain;
  FakeUserNotifications userNotifications;
  FakePreferences preferences;
  FakeSerialQueues serialQueues;
  FakeNotificationCenter notifications;
  FakeJSONReader jsonReader;
  FakeStringTable stringTable;
  FakeLog log;
  FakeAccessLog accessLog;
  // Last, so that its thread has ended before the others go.
  FakeFacebookRequests facebookRequests;
};

}  // namespace fakes
