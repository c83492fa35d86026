#include "tests/fakes/FakeHost.h"

#include <utility>

namespace fakes {

FakeHost::FakeHost()
    : accountType(std::make_shared<const RVAccountType>(std::string(RVAccountTypeIdentifierFacebook))) {
  store->shareJournalWithAll(journal);
  for (Fake* fake : std::initializer_list<Fake*>{&keychain,
                                                 &userNotifications,
                                                 &preferences,
                                                 &serialQueues,
                                                 &notifications,
                                                 &jsonReader,
                                                 &stringTable,
                                                 &log,
                                                 &accessLog,
                                                 &facebookRequests}) {
    fake->shareJournal(journal);
  }
  store->addAccount("account-1");
  keychain.setMasterToken("account-1", "master-token");
}

FakeHost::~FakeHost() {
  journal->setBeforeCall(nullptr);
}

RVDHostServices FakeHost::services() {
  RVDHostServices services;
  services.keychainManager = &keychain;
  services.facebookRequests = &facebookRequests;
  services.userNotifications = &userNotifications;
  services.preferences = &preferences;
  services.serialQueues = &serialQueues;
  services.notifications = &notifications;
  services.jsonReader = &jsonReader;
  services.stringTable = &stringTable;
  services.log = &log;
  services.accessLog = &accessLog;
  return services;
}

std::shared_ptr<FakeClient> FakeHost::makeClient(std::optional<std::string> bundleID,
                                                 std::set<std::string, std::less<>> entitlements) {
  auto client = std::make_shared<FakeClient>(std::move(bundleID), "Photo App", std::move(entitlements));
  client->shareJournal(journal);
  return client;
}

}  // namespace fakes
