// The plug-in object: what it serves, what it is made of, the account and the preference.
#include <atomic>
#include <stdexcept>

#include "tests/unit/plugin_fixture.h"

extern "C" const RVDAccountAccessPluginEntry RVDAccountAccessPluginEntryPoint;

namespace plugin_tests {
namespace {

using testing::ElementsAre;
using testing::UnorderedElementsAre;

using Plugin = TKFacebookAccountAccessPlugin;
using Access = TKFacebookAccountAccessPluginTestAccess;

TEST(TheClass, ServesExactlyFacebookAccounts) {
  EXPECT_TRUE(Plugin::supportsAccountTypeWithIdentifier("com.zentor.facebook"));
  EXPECT_TRUE(Plugin::supportsAccountTypeWithIdentifier(std::string(RVAccountTypeIdentifierFacebook)));
}

TEST(TheClass, ServesNoOtherIdentifier) {
  EXPECT_FALSE(Plugin::supportsAccountTypeWithIdentifier("com.zentor.Facebook"));
  EXPECT_FALSE(Plugin::supportsAccountTypeWithIdentifier("com.zentor.facebook "));
  EXPECT_FALSE(Plugin::supportsAccountTypeWithIdentifier("com.zentor.facebook.more"));
  EXPECT_FALSE(Plugin::supportsAccountTypeWithIdentifier(""));
}

TEST(TheClass, ServesNothingForAnAbsentIdentifier) {
  EXPECT_FALSE(Plugin::supportsAccountTypeWithIdentifier(std::nullopt));
}

TEST(TheEntryPoint, NamesTheClassAndTheVersionThatItWasBuiltFor) {
  EXPECT_EQ(RVDAccountAccessPluginEntryPoint.abiVersion, kRVDAccountAccessPluginABIVersion);
  EXPECT_STREQ(RVDAccountAccessPluginEntryPoint.className, "TKFacebookAccountAccessPlugin");
  EXPECT_STREQ(kRVDAccountAccessPluginEntrySymbol, "RVDAccountAccessPluginEntryPoint");
}

TEST(TheEntryPoint, AsksTheClassWhatItSupports) {
  const auto supports = RVDAccountAccessPluginEntryPoint.supportsAccountTypeWithIdentifier;
  EXPECT_TRUE(supports(std::string(RVAccountTypeIdentifierFacebook)));
  EXPECT_FALSE(supports("com.zentor.mail"));
  EXPECT_FALSE(supports(std::nullopt));
}

TEST(TheEntryPoint, MakesAnObjectThatAnswersRequests) {
  fakes::FakeHost host;
  const auto plugin = RVDAccountAccessPluginEntryPoint.init(host.services());
  ASSERT_NE(plugin, nullptr);
  Answers answers;
  const auto client = host.makeClient("org.example.A", {std::string(kRVDAllAccountsAccessEntitlement)});
  plugin->handleAccessRequestToAccountsOfType(
      host.accountType, client, {}, host.store, true, answers.completion());
  EXPECT_TRUE(answers.wait().granted);
}

TEST(TheEntryPoint, MakesNoObjectWhereAServiceIsMissing) {
  fakes::FakeHost host;
  const std::vector<void (*)(RVDHostServices&)> removals = {
      [](RVDHostServices& services) { services.keychainManager = nullptr; },
      [](RVDHostServices& services) { services.facebookRequests = nullptr; },
      [](RVDHostServices& services) { services.userNotifications = nullptr; },
      [](RVDHostServices& services) { services.preferences = nullptr; },
      [](RVDHostServices& services) { services.serialQueues = nullptr; },
      [](RVDHostServices& services) { services.notifications = nullptr; },
      [](RVDHostServices& services) { services.jsonReader = nullptr; },
      [](RVDHostServices& services) { services.stringTable = nullptr; },
      [](RVDHostServices& services) { services.log = nullptr; },
      [](RVDHostServices& services) { services.accessLog = nullptr; },
  };
  for (std::size_t i = 0; i < removals.size(); ++i) {
    RVDHostServices services = host.services();
    removals[i](services);
    EXPECT_EQ(RVDAccountAccessPluginEntryPoint.init(services), nullptr) << "service " << i;
  }
}

class ANewObject : public PluginTest {};

TEST_F(ANewObject, KnowsTheFourCategoryNames) {
  EXPECT_THAT(access.permissionCategories(),
              UnorderedElementsAre("basic-read", "extended-read", "write", "manage"));
}

TEST_F(ANewObject, HasNoneOfItsListsYet) {
  EXPECT_FALSE(access.basicReadPermissionsAreFilled());
  EXPECT_FALSE(access.extendedReadPermissionsAreFilled());
  EXPECT_FALSE(access.writePermissionsAreFilled());
  EXPECT_FALSE(access.managePermissionsAreFilled());
}

TEST_F(ANewObject, HasAskedNothingOfTheHost) {
  EXPECT_TRUE(host.journal->calls().empty());
  EXPECT_TRUE(host.serialQueues.labels().empty());
  EXPECT_TRUE(host.notifications.registrations().empty());
}

class TheAccount : public PluginTest {};

TEST_F(TheAccount, IsTheFirstOfItsTypeAndCarriesTheTypeThatWasAskedFor) {
  host.store->removeAccounts();
  host.store->addAccount("mail", "com.zentor.mail");
  host.store->addAccount("first");
  host.store->addAccount("second");
  const auto account = access.accountOfType(host.accountType, *host.store);
  ASSERT_NE(account, nullptr);
  EXPECT_EQ(account->identifier(), "first");
  EXPECT_EQ(account->accountType(), host.accountType);
  ASSERT_EQ(host.store->handedOut().size(), 2U);
  EXPECT_EQ(host.store->handedOut()[1]->accountType(), nullptr);
}

TEST_F(TheAccount, IsAbsentWithoutALogLineWhereThereIsNoneOfItsType) {
  host.store->removeAccounts();
  host.store->addAccount("mail", "com.zentor.mail");
  EXPECT_EQ(access.accountOfType(host.accountType, *host.store), nullptr);
  EXPECT_TRUE(host.log.lines().empty());
}

class ThePreferenceToIgnoreRequests : public PluginTest {
 protected:
  void storeTrue() {
    host.preferences.store(TKFacebookIgnoreAccessRequests, TKFacebookPreferencesAppID, true);
  }
};

TEST_F(ThePreferenceToIgnoreRequests, IsFalseWhereNothingIsStored) {
  EXPECT_FALSE(access.shouldIgnoreAccessRequest());
}

TEST_F(ThePreferenceToIgnoreRequests, IsTrueOnEveryCallWhereTrueIsStored) {
  storeTrue();
  EXPECT_TRUE(access.shouldIgnoreAccessRequest());
  EXPECT_TRUE(access.shouldIgnoreAccessRequest());
  EXPECT_TRUE(access.shouldIgnoreAccessRequest());
  EXPECT_EQ(host.preferences.reads().size(), 3U);
}

TEST_F(ThePreferenceToIgnoreRequests, IsReadAsTheHostReadsBooleans) {
  access.shouldIgnoreAccessRequest();  // registers
  const auto readingOf = [&](const RVValue& value) {
    host.preferences.store(TKFacebookIgnoreAccessRequests, TKFacebookPreferencesAppID, value);
    host.notifications.post(TKFacebookEnvironmentDidChangeNotification);
    return access.shouldIgnoreAccessRequest();
  };
  EXPECT_TRUE(readingOf(true));
  EXPECT_TRUE(readingOf(1));
  EXPECT_TRUE(readingOf(-7));
  EXPECT_TRUE(readingOf(0.5));
  EXPECT_TRUE(readingOf("YES"));
  EXPECT_FALSE(readingOf(false));
  EXPECT_FALSE(readingOf(0));
  EXPECT_FALSE(readingOf(0.0));
  EXPECT_FALSE(readingOf("no"));
  EXPECT_FALSE(readingOf(""));
  EXPECT_FALSE(readingOf(RVValue()));
  EXPECT_FALSE(readingOf(RVArray(1, true)));
  EXPECT_FALSE(readingOf(RVDictionary{{"true", true}}));
}

TEST_F(ThePreferenceToIgnoreRequests, IsReadOnThePreferencesQueueForTheCurrentUserOnAnyHost) {
  access.shouldIgnoreAccessRequest();
  ASSERT_EQ(host.preferences.reads().size(), 1U);
  const auto read = host.preferences.reads().front();
  EXPECT_EQ(read.key, "TKFacebookIgnoreAccessRequests");
  EXPECT_EQ(read.applicationID, "com.zentor.tessel.facebook");
  EXPECT_EQ(read.userName, kZQPreferencesCurrentUser);
  EXPECT_EQ(read.hostName, kZQPreferencesAnyHost);
  EXPECT_EQ(read.queueLabel, "com.zentor.tessel.facebook.preferencesQueue");
}

TEST_F(ThePreferenceToIgnoreRequests, HasOneQueueAndOneRegistrationHoweverOftenItIsRead) {
  for (int i = 0; i < 3; ++i) access.shouldIgnoreAccessRequest();
  EXPECT_THAT(host.serialQueues.labels(), ElementsAre("com.zentor.tessel.facebook.preferencesQueue"));
  ASSERT_EQ(host.notifications.registrations().size(), 1U);
  const auto registration = host.notifications.registrations().front();
  EXPECT_EQ(registration.name, "TKFacebookEnvironmentDidChangeNotification");
  EXPECT_EQ(registration.queue->label(), "com.zentor.tessel.facebook.preferencesQueue");
}

TEST_F(ThePreferenceToIgnoreRequests, RegistersBeforeItIsReadForTheFirstTime) {
  access.shouldIgnoreAccessRequest();
  EXPECT_THAT(host.journal->calls(),
              ElementsAre("serialQueues.createSerialQueue",
                          "notifications.registerForNotification",
                          "serialQueue.dispatchSync",
                          "preferences.ZQPreferencesCopyValue"));
}

TEST_F(ThePreferenceToIgnoreRequests, SharesQueueAndRegistrationWithASecondObject) {
  access.shouldIgnoreAccessRequest();
  const Plugin second(host.services());
  storeTrue();
  const Access accessToSecond{second};
  host.notifications.post(TKFacebookEnvironmentDidChangeNotification);
  EXPECT_TRUE(accessToSecond.shouldIgnoreAccessRequest());
  EXPECT_EQ(host.serialQueues.labels().size(), 1U);
  EXPECT_EQ(host.notifications.registrations().size(), 1U);
}

TEST_F(ThePreferenceToIgnoreRequests, OutlivesTheObjectThatRegistered) {
  {
    const Plugin first(host.services());
    Access{first}.shouldIgnoreAccessRequest();
  }
  host.notifications.post(TKFacebookEnvironmentDidChangeNotification);
  EXPECT_EQ(host.preferences.synchronisations().size(), 1U);
  EXPECT_FALSE(access.shouldIgnoreAccessRequest());
  EXPECT_EQ(host.notifications.registrations().size(), 1U);
}

TEST_F(ThePreferenceToIgnoreRequests, ShowsAChangeOnlyAfterTheEnvironmentChanged) {
  EXPECT_FALSE(access.shouldIgnoreAccessRequest());
  storeTrue();
  EXPECT_FALSE(access.shouldIgnoreAccessRequest());
  host.notifications.post("SomeOtherNotification");
  EXPECT_FALSE(access.shouldIgnoreAccessRequest());
  host.notifications.post(TKFacebookEnvironmentDidChangeNotification);
  EXPECT_TRUE(access.shouldIgnoreAccessRequest());
}

TEST_F(ThePreferenceToIgnoreRequests, IsSynchronisedOnThePreferencesQueueAndNothingElseIsDone) {
  access.shouldIgnoreAccessRequest();
  host.journal->clear();
  host.notifications.post(TKFacebookEnvironmentDidChangeNotification);
  ASSERT_EQ(host.preferences.synchronisations().size(), 1U);
  const auto synchronisation = host.preferences.synchronisations().front();
  EXPECT_EQ(synchronisation.applicationID, "com.zentor.tessel.facebook");
  EXPECT_EQ(synchronisation.queueLabel, "com.zentor.tessel.facebook.preferencesQueue");
  EXPECT_THAT(host.journal->calls(),
              ElementsAre("serialQueue.dispatchSync", "preferences.ZQPreferencesAppSynchronize"));
}

TEST_F(ThePreferenceToIgnoreRequests, IsSetUpOnceWhenManyThreadsReadItFirst) {
  storeTrue();
  std::vector<std::thread> threads;
  std::atomic<int> ignored = 0;
  for (int i = 0; i < 8; ++i)
    threads.emplace_back([&] { ignored += access.shouldIgnoreAccessRequest() ? 1 : 0; });
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(ignored, 8);
  EXPECT_EQ(host.serialQueues.labels().size(), 1U);
  EXPECT_EQ(host.notifications.registrations().size(), 1U);
}

TEST_F(ThePreferenceToIgnoreRequests, RegistersTheNextTimeWhereTheHostThrewAtTheFirst) {
  host.notifications.setBeforeCall([](std::string_view) { throw std::runtime_error("no notifications"); });
  EXPECT_THROW(access.shouldIgnoreAccessRequest(), std::runtime_error);
  host.notifications.setBeforeCall(nullptr);
  storeTrue();
  EXPECT_TRUE(access.shouldIgnoreAccessRequest());
  EXPECT_EQ(host.serialQueues.labels().size(), 1U);
  EXPECT_EQ(host.notifications.registrations().size(), 1U);
}

}  // namespace
}  // namespace plugin_tests
