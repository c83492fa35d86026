// A client's request, up to the point at which it is answered at once or the user is asked.
#include "tests/unit/plugin_fixture.h"

namespace plugin_tests {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Not;
using testing::SizeIs;

using Entry = fakes::FakeAccessLog::Entry;
using Lines = std::vector<std::pair<int, std::string>>;

constexpr const char* kOperation =
    "handleAccessRequestToAccountsOfType:forClient:withOptions:store:allowUserInteraction:completion:";

const std::string kAllAccounts(kRVDAllAccountsAccessEntitlement);
const std::string kDefaultAccess(kRVDFacebookAccountsDefaultAccessEntitlement);

class ARequest : public PluginTest {
 protected:
  // The lines that the request itself logs, without those of the operations that it calls.
  Lines ownLines() {
    Lines lines;
    for (const auto& line : host.log.lines()) {
      if (line.functionName == std::string("-[TKFacebookAccountAccessPlugin ") + kOperation + "]")
        lines.emplace_back(line.level, line.text);
    }
    return lines;
  }

  RVPermissionSet askedOfTheServer() {
    const auto exchanges = host.facebookRequests.authorizations();
    EXPECT_THAT(exchanges, SizeIs(1));
    return exchanges.empty() || !exchanges[0].permissions ? RVPermissionSet() : *exchanges[0].permissions;
  }

  std::size_t alertsShown() { return host.userNotifications.alerts().size(); }

  const std::shared_ptr<fakes::FakeClient> client = host.makeClient();
};

class ARequestOfAnAllAccountsClient : public ARequest {};

TEST_F(ARequestOfAnAllAccountsClient, IsGrantedBeforeAnythingElseIsLookedAt) {
  host.store->removeAccounts();
  const auto privileged = host.makeClient(kClientID, {kAllAccounts, kDefaultAccess});
  const auto answer = request(privileged, {});
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_THAT(host.journal->calls(), ElementsAre("client.description", "log.RVLog", "client.hasEntitlement"));
  EXPECT_EQ(linesOf(host.log),
            Lines({{7, "FacebookAccessPlugin is handling request for access from org.example.PhotoApp."}}));
  expectPlaceOfEveryLine(host.log, kOperation);
}

TEST_F(ARequestOfAnAllAccountsClient, IsGrantedDespiteARefusalOnRecord) {
  const auto privileged = host.makeClient(kClientID, {kAllAccounts});
  storeRecord(privileged, false, std::nullopt, keptOptions("111"));
  EXPECT_TRUE(request(privileged, optionsFor({"email"})).granted);
  EXPECT_FALSE(record()->isGranted());
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
}

class ARequestWithoutAnAccount : public ARequest {
 protected:
  ARequestWithoutAnAccount() { host.store->removeAccounts(); }
};

TEST_F(ARequestWithoutAnAccount, IsRejected) {
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, bareError(6));
  EXPECT_EQ(linesOf(host.log),
            Lines({{7, "FacebookAccessPlugin is handling request for access from org.example.PhotoApp."},
                   {3, "No Facebook accounts. Rejecting access request."}}));
  EXPECT_TRUE(host.log.lines()[1].arguments.empty());
  expectPlaceOfEveryLine(host.log, kOperation);
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
}

TEST_F(ARequestWithoutAnAccount, IsRejectedForThatReasonBeforeItsOptionsAreChecked) {
  EXPECT_EQ(request(client, {}).error, bareError(6));
}

TEST_F(ARequestWithoutAnAccount, OfADefaultAccessClientIsGrantedWithoutAlertAndServer) {
  const auto privileged = host.makeClient(kClientID, {kDefaultAccess});
  const auto answer = request(privileged, optionsFor({"email", "publish"}, "friends"));
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_EQ(alertsShown(), 0U);
  EXPECT_THAT(host.facebookRequests.authorizations(), IsEmpty());
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
  EXPECT_EQ(ownLines(),
            Lines({{7, "FacebookAccessPlugin is handling request for access from org.example.PhotoApp."},
                   {7, "Granting default access to org.example.PhotoApp."}}));
}

TEST_F(ARequestWithoutAnAccount, OfADefaultAccessClientWithInvalidOptionsIsRejectedForTheOptions) {
  const auto privileged = host.makeClient(kClientID, {kDefaultAccess});
  EXPECT_EQ(request(privileged, {}).error, bareError(8));
}

class ARequestWithInvalidOptions : public ARequest {};

TEST_F(ARequestWithInvalidOptions, IsRejected) {
  const auto answer = request(client, optionsFor({"publish_stream"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, bareError(8));
  EXPECT_EQ(linesOf(host.log),
            Lines({{7, "FacebookAccessPlugin is handling request for access from org.example.PhotoApp."},
                   {3, "org.example.PhotoApp provided an invalid options dictionary."}}));
  expectPlaceOfEveryLine(host.log, kOperation);
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
}

TEST_F(ARequestWithInvalidOptions, IsRejectedForThemBeforeTheRecordIsRead) {
  storeRecord(client, false, std::nullopt, keptOptions("111"));
  EXPECT_EQ(request(client, {}).error, bareError(8));
  EXPECT_EQ(host.journal->count("authorizationManager.authorizationForClient"), 0U);
}

TEST_F(ARequestWithInvalidOptions, OfADefaultAccessClientIsRejectedToo) {
  const auto privileged = host.makeClient(kClientID, {kDefaultAccess});
  EXPECT_EQ(request(privileged, optionsFor({"publish"})).error, bareError(8));
  EXPECT_EQ(ownLines(),
            Lines({{7, "FacebookAccessPlugin is handling request for access from org.example.PhotoApp."},
                   {7, "Granting default access to org.example.PhotoApp."},
                   {3, "org.example.PhotoApp provided an invalid options dictionary."}}));
}

class ARequestAfterARefusal : public ARequest {
 protected:
  ARequestAfterARefusal() { storeRecord(client, false, std::nullopt, keptOptions("111")); }
};

TEST_F(ARequestAfterARefusal, IsRefusedAtOnceWithoutAnErrorAndWithoutAnAlert) {
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_EQ(alertsShown(), 0U);
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
  EXPECT_EQ(linesOf(host.log),
            Lines({{7, "FacebookAccessPlugin is handling request for access from org.example.PhotoApp."}}));
}

TEST_F(ARequestAfterARefusal, IsRefusedWhateverAppIDItCarries) {
  EXPECT_FALSE(request(client, optionsFor({"email"}, std::nullopt, "222")).granted);
  EXPECT_EQ(alertsShown(), 0U);
}

TEST_F(ARequestAfterARefusal, IsRefusedForADefaultAccessClientToo) {
  const auto privileged = host.makeClient(kClientID, {kDefaultAccess});
  const auto answer = request(privileged, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
}

TEST_F(ARequestAfterARefusal, IsRefusedEvenWhereTheRecordHoldsPermissionsOfAnEarlierTime) {
  storeRecord(client, false, RVPermissionSet{"email"}, keptOptions("111"));
  EXPECT_FALSE(request(client, optionsFor({"email"})).granted);
}

class ARequestAfterAGrant : public ARequest {
 protected:
  void grant(const RVPermissionSet& permissions, const RVDictionary& options) {
    storeRecord(client, true, permissions, options);
  }
  // Whether it was granted without the user or the server.
  bool isHeld(const RVDictionary& options) {
    const bool granted = request(client, options).granted;
    return granted && alertsShown() == 0 && host.facebookRequests.authorizations().empty();
  }
};

TEST_F(ARequestAfterAGrant, ForFewerPermissionsIsGrantedAtOnce) {
  grant({"email", "user_photos"}, keptOptions("111"));
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_EQ(answer.thread, std::this_thread::get_id());
  EXPECT_EQ(alertsShown(), 0U);
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
  EXPECT_EQ(linesOf(host.log),
            Lines({{7, "FacebookAccessPlugin is handling request for access from org.example.PhotoApp."}}));
  EXPECT_THAT(host.journal->calls(), Not(Contains("authorizationManager.setAuthorization")));
}

TEST_F(ARequestAfterAGrant, ForTheSamePermissionsIsGrantedAtOnce) {
  grant({"email", "user_photos"}, keptOptions("111"));
  EXPECT_TRUE(isHeld(optionsFor({"user_photos", "email"})));
}

TEST_F(ARequestAfterAGrant, ForNoPermissionsIsGrantedAtOnceWhereSomeAreHeld) {
  grant({"email"}, keptOptions("111"));
  EXPECT_TRUE(isHeld(optionsFor({})));
}

TEST_F(ARequestAfterAGrant, ForMorePermissionsAsksForTheNewOnesAlone) {
  grant({"email"}, keptOptions("111"));
  EXPECT_FALSE(isHeld(optionsFor({"email", "user_photos"})));
  EXPECT_EQ(alertsShown(), 1U);
  EXPECT_THAT(askedOfTheServer(), ElementsAre("user_photos"));
}

TEST_F(ARequestAfterAGrant, ForAnotherAppIDHasNoCredit) {
  grant({"email", "user_photos"}, keptOptions("111"));
  EXPECT_FALSE(isHeld(optionsFor({"email", "user_photos"}, std::nullopt, "222")));
  EXPECT_EQ(alertsShown(), 1U);
  EXPECT_THAT(askedOfTheServer(), ElementsAre("email", "user_photos"));
}

TEST_F(ARequestAfterAGrant, HasNoCreditWhereTheRecordHasNoAppID) {
  RVDictionary options;
  options.emplace(RVFacebookAudienceKey, "friends");
  grant({"email"}, options);
  EXPECT_FALSE(isHeld(optionsFor({"email"})));
}

TEST_F(ARequestAfterAGrant, HasNoCreditWhereTheRecordHasNoOptions) {
  storeRecord(client, true, RVPermissionSet{"email"}, std::nullopt);
  EXPECT_FALSE(isHeld(optionsFor({"email"})));
  EXPECT_THAT(askedOfTheServer(), ElementsAre("email"));
}

TEST_F(ARequestAfterAGrant, HasNoCreditWhereTheRecordHasNoPermissions) {
  storeRecord(client, true, std::nullopt, keptOptions("111"));
  EXPECT_FALSE(isHeld(optionsFor({"email"})));
}

TEST_F(ARequestAfterAGrant, ForNoPermissionsIsPutToTheUserWhereNoneAreHeld) {
  grant({}, keptOptions("111"));
  EXPECT_FALSE(isHeld(optionsFor({})));
  EXPECT_EQ(alertsShown(), 1U);
  EXPECT_THAT(askedOfTheServer(), IsEmpty());
}

TEST_F(ARequestAfterAGrant, ToWriteForAnotherAudienceAsksAgain) {
  grant({"email", "publish_stream"}, keptOptions("111", "everyone"));
  EXPECT_FALSE(isHeld(optionsFor({"email", "publish_stream"}, "friends")));
  EXPECT_EQ(alertsShown(), 1U);
  EXPECT_THAT(askedOfTheServer(), ElementsAre("publish_stream"));
}

TEST_F(ARequestAfterAGrant, ToWriteForTheSameAudienceIsGrantedAtOnce) {
  grant({"email", "publish_stream"}, keptOptions("111", "friends"));
  EXPECT_TRUE(isHeld(optionsFor({"publish_stream"}, "friends")));
}

TEST_F(ARequestAfterAGrant, ToWriteAsksAgainWhereTheRecordHasNoAudience) {
  grant({"email", "publish_stream"}, keptOptions("111"));
  EXPECT_FALSE(isHeld(optionsFor({"publish_stream"}, "friends")));
}

TEST_F(ARequestAfterAGrant, ToWriteForAnotherAudienceLosesEveryWritePermissionHeld) {
  grant({"email", "publish", "publish_stream"}, keptOptions("111", "everyone"));
  request(client, optionsFor({"email", "publish_stream"}, "friends"));
  // What the client is recorded to hold is what the server reports; what it was asked for shows the rest.
  EXPECT_THAT(askedOfTheServer(), ElementsAre("publish_stream"));
  host.store->removeAccounts();
  const auto privileged = host.makeClient("org.example.Default", {kDefaultAccess});
  storeRecord(privileged, true, RVPermissionSet{"email", "publish"}, keptOptions("111", "everyone"));
  request(privileged, optionsFor({"publish_stream"}, "friends"));
  EXPECT_EQ(record("org.example.Default")->grantedPermissions(),
            RVPermissionSet({"email", "publish_stream"}));
}

TEST_F(ARequestAfterAGrant, ToReadKeepsItsCreditWhateverTheAudience) {
  grant({"email", "publish_stream"}, keptOptions("111", "everyone"));
  EXPECT_TRUE(isHeld(optionsFor({"email"}, "friends")));
}

TEST_F(ARequestAfterAGrant, ToReadKeepsTheWritePermissionsHeldWhateverTheAudience) {
  host.store->removeAccounts();
  const auto privileged = host.makeClient("org.example.Default", {kDefaultAccess});
  storeRecord(privileged, true, RVPermissionSet{"publish"}, keptOptions("111", "everyone"));
  request(privileged, optionsFor({"email"}, "friends"));
  EXPECT_EQ(record("org.example.Default")->grantedPermissions(), RVPermissionSet({"email", "publish"}));
}

TEST_F(ARequestAfterAGrant, ToWriteIsJudgedByTheAudienceEvenForAnotherAppID) {
  grant({"publish_stream"}, keptOptions("111", "friends"));
  EXPECT_FALSE(isHeld(optionsFor({"publish_stream"}, "friends", "222")));
  EXPECT_THAT(askedOfTheServer(), ElementsAre("publish_stream"));
}

class AFirstRequest : public ARequest {};

TEST_F(AFirstRequest, IsPutToTheUserAndGrantedWhereTheUserAllowsIt) {
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withBody(answerOfServer({"email"}))});
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_EQ(alertsShown(), 1U);
  EXPECT_EQ(host.userNotifications.unreleasedAlerts(), 0U);
  EXPECT_THAT(host.accessLog.entries(),
              ElementsAre(Entry{"com.zentor.facebook", "org.example.PhotoApp", true, true, 0}));
  EXPECT_EQ(record()->options(), keptOptions("111"));
}

TEST_F(AFirstRequest, IsRefusedWhereTheUserRefusesIt) {
  host.userNotifications.answerWith({1});
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, bareError(7));
  EXPECT_THAT(host.accessLog.entries(),
              ElementsAre(Entry{"com.zentor.facebook", "org.example.PhotoApp", false, true, 0}));
}

TEST_F(AFirstRequest, IsPutToTheUserEvenWhereUserInteractionIsNotAllowed) {
  EXPECT_TRUE(request(client, optionsFor({"email"}), false).granted);
  EXPECT_EQ(alertsShown(), 1U);
}

TEST_F(AFirstRequest, OfADefaultAccessClientGoesToTheServerWithoutAnAlertAndWithoutAnAccessEntry) {
  const auto privileged = host.makeClient(kClientID, {kDefaultAccess});
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withBody(answerOfServer({"email"}))});
  EXPECT_TRUE(request(privileged, optionsFor({"email"})).granted);
  EXPECT_EQ(alertsShown(), 0U);
  EXPECT_THAT(askedOfTheServer(), ElementsAre("email"));
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"email"}));
}

TEST_F(AFirstRequest, ThatCannotBePutIntoWordsIsRefusedWithoutAnAlert) {
  host.facebookRequests.replyToDescriptions({fakes::FakeReply::withBody(R"("API_EC_PARAM")")});
  const auto answer = request(client, optionsFor({"email", "something_new"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, bareError(7));
  EXPECT_EQ(alertsShown(), 0U);
  EXPECT_THAT(host.accessLog.entries(), SizeIs(1));
}

TEST_F(AFirstRequest, OfAClientWithoutABundleIDIsLoggedWithoutOne) {
  const auto nameless = host.makeClient(std::nullopt);
  const auto answer = request(nameless, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  ASSERT_TRUE(answer.error);
  EXPECT_EQ(answer.error->code, 16);
  EXPECT_THAT(host.accessLog.entries(),
              ElementsAre(Entry{"com.zentor.facebook", std::nullopt, true, true, 0}));
  EXPECT_EQ(host.store->records().recordCount(), 0U);
}

TEST_F(AFirstRequest, TakesTheAudienceToTheServerAndIntoTheRecord) {
  request(client, optionsFor({"publish_stream"}, "only_me"));
  ASSERT_THAT(host.facebookRequests.authorizations(), SizeIs(1));
  EXPECT_EQ(host.facebookRequests.authorizations()[0].audience, "SELF");
  EXPECT_EQ(host.facebookRequests.authorizations()[0].appId, "111");
  EXPECT_EQ(record()->options(), keptOptions("111", "only_me"));
}

TEST_F(AFirstRequest, AttachesTheAccountTypeToTheAccount) {
  request(client, optionsFor({"email"}));
  EXPECT_EQ(host.store->handedOut().front()->accountType(), host.accountType);
}

TEST_F(AFirstRequest, DoesNotWaitForTheServer) {
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withBody(answerOfServer({"email"})).held()});
  Answers answers;
  plugin.handleAccessRequestToAccountsOfType(
      host.accountType, client, optionsFor({"email"}), host.store, true, answers.completion());
  EXPECT_EQ(answers.count(), 0U);
  EXPECT_FALSE(record());
  ASSERT_TRUE(host.facebookRequests.waitForHeld(1));
  host.facebookRequests.releaseHeld();
  const auto answer = onlyAnswerOf(answers);
  EXPECT_TRUE(answer.granted);
  EXPECT_NE(answer.thread, std::this_thread::get_id());
}

TEST_F(AFirstRequest, WaitsForTheUser) {
  host.userNotifications.holdAlerts();
  Answers answers;
  std::thread asking([&] {
    plugin.handleAccessRequestToAccountsOfType(
        host.accountType, client, optionsFor({"email"}), host.store, true, answers.completion());
  });
  EXPECT_TRUE(host.userNotifications.waitForShown(1));
  EXPECT_EQ(answers.count(), 0U);
  host.userNotifications.answer(1);
  asking.join();
  EXPECT_EQ(onlyAnswerOf(answers).error, bareError(7));
}

TEST_F(AFirstRequest, KeepsWhatItWasGivenAliveUntilTheServerAnswers) {
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withBody(answerOfServer({"email"})).held()});
  Answers answers;
  std::weak_ptr<fakes::FakeClient> watched;
  {
    const auto passing = host.makeClient("org.example.Passing");
    watched = passing;
    plugin.handleAccessRequestToAccountsOfType(
        host.accountType, passing, optionsFor({"email"}), host.store, true, answers.completion());
  }
  ASSERT_TRUE(host.facebookRequests.waitForHeld(1));
  EXPECT_FALSE(watched.expired());
  host.facebookRequests.releaseHeld();
  EXPECT_TRUE(onlyAnswerOf(answers).granted);
  EXPECT_TRUE(record("org.example.Passing"));
}

TEST(TwoRequestsOfOneClient, RunAtTheSameTimeAndTheLastRecordWrittenStands) {
  TKFacebookAccountAccessPluginTestAccess::forgetPreferencesQueue();
  {
    fakes::FakeHost host;
    TKFacebookAccountAccessPlugin plugin(host.services());
    const auto client = host.makeClient();
    host.userNotifications.holdAlerts();
    Answers answers;
    const auto ask = [&](const char* permission) {
      plugin.handleAccessRequestToAccountsOfType(
          host.accountType, client, optionsFor({permission}), host.store, true, answers.completion());
    };
    host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withBody(answerOfServer({"email"})),
                                                 fakes::FakeReply::withBody(answerOfServer({"publish"}))});
    std::thread first(ask, "email");
    std::thread second(ask, "user_photos");
    EXPECT_TRUE(host.userNotifications.waitForShown(2));
    host.userNotifications.answer(0);
    first.join();
    second.join();
    host.facebookRequests.waitUntilDelivered();
    EXPECT_EQ(answers.count(), 2U);
    EXPECT_EQ(host.store->records()
                  .record("org.example.PhotoApp", RVAccountTypeIdentifierFacebook)
                  ->grantedPermissions(),
              RVPermissionSet({"publish"}));
  }
  TKFacebookAccountAccessPluginTestAccess::forgetPreferencesQueue();
}

}  // namespace
}  // namespace plugin_tests
