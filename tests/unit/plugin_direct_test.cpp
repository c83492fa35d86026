// What the daemon asks for itself: a grant without a question, one revocation, all revocations.
#include "tests/unit/plugin_fixture.h"

namespace plugin_tests {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;
using testing::SizeIs;

using Entry = fakes::FakeAccessLog::Entry;
using Lines = std::vector<std::pair<int, std::string>>;

class ADirectAuthorization : public PluginTest {
 protected:
  static constexpr const char* kOperation = "authorizeAccessToAccountsOfType:forClient:store:completion:";

  Answers::Answer authorize(const std::shared_ptr<const RVDClient>& whom) {
    Answers answers;
    plugin.authorizeAccessToAccountsOfType(host.accountType, whom, host.store, answers.completion());
    EXPECT_EQ(answers.count(), 1U) << "it answers before it returns";
    return onlyAnswerOf(answers);
  }

  const std::shared_ptr<fakes::FakeClient> client = host.makeClient();
};

TEST_F(ADirectAuthorization, IsNotGivenWithoutAnAccount) {
  host.store->removeAccounts();
  const auto answer = authorize(client);
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_TRUE(host.log.lines().empty());
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
  EXPECT_FALSE(record());
}

TEST_F(ADirectAuthorization, OfAClientWithoutARecordIsStrangeButGranted) {
  const auto answer = authorize(client);
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  ASSERT_TRUE(record());
  EXPECT_TRUE(record()->isGranted());
  EXPECT_EQ(record()->grantedPermissions(), std::nullopt);
  EXPECT_EQ(record()->options(), std::nullopt);
  EXPECT_EQ(record()->client(), client);
  EXPECT_THAT(host.facebookRequests.authorizations(), IsEmpty());
  EXPECT_EQ(linesOf(host.log),
            Lines({{7,
                    "This is strange behavior. We're being asked to directly authorize "
                    "org.example.PhotoApp for Facebook access."}}));
  expectPlaceOfEveryLine(host.log, kOperation);
  EXPECT_THAT(host.accessLog.entries(),
              ElementsAre(Entry{"com.zentor.facebook", "org.example.PhotoApp", true, false, 0}));
}

TEST_F(ADirectAuthorization, OfARecordWithoutAnAppIDDoesNotAskTheServer) {
  RVDictionary options;
  options.emplace(RVFacebookAudienceKey, "friends");
  storeRecord(client, false, RVPermissionSet{"email"}, options);
  EXPECT_TRUE(authorize(client).granted);
  EXPECT_TRUE(record()->isGranted());
  EXPECT_EQ(record()->grantedPermissions(), std::nullopt);
  EXPECT_EQ(record()->options(), options);
  EXPECT_THAT(host.facebookRequests.authorizations(), IsEmpty());
  EXPECT_TRUE(host.log.lines().empty());
}

TEST_F(ADirectAuthorization, OfARecordWithoutOptionsDoesNotAskTheServer) {
  storeRecord(client, false, std::nullopt, std::nullopt);
  EXPECT_TRUE(authorize(client).granted);
  EXPECT_THAT(host.facebookRequests.authorizations(), IsEmpty());
  EXPECT_EQ(record()->options(), std::nullopt);
}

TEST_F(ADirectAuthorization, OfARecordWithAnAppIDRecordsWhatTheServerGrants) {
  storeRecord(client, false, std::nullopt, keptOptions("111", "friends"));
  host.facebookRequests.replyToAuthorizations(
      {fakes::FakeReply::withBody(answerOfServer({"email", "email", "publish"}))});
  const auto answer = authorize(client);
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.thread, std::this_thread::get_id());
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"email", "publish"}));
  EXPECT_EQ(record()->options(), keptOptions("111", "friends"));
  ASSERT_THAT(host.facebookRequests.authorizations(), SizeIs(1));
  const auto exchange = host.facebookRequests.authorizations()[0];
  EXPECT_EQ(exchange.appId, "111");
  EXPECT_EQ(exchange.permissions, std::nullopt);
  EXPECT_EQ(exchange.audience, std::nullopt);
  EXPECT_THAT(host.accessLog.entries(),
              ElementsAre(Entry{"com.zentor.facebook", "org.example.PhotoApp", true, false, 0}));
}

TEST_F(ADirectAuthorization, RecordsAGrantOfNothingWhateverTheServerRefuses) {
  const std::vector<fakes::FakeReply> failures = {
      fakes::FakeReply::withError({"com.zentor.transfer", 7, {}}),
      fakes::FakeReply::withoutAnything(),
      fakes::FakeReply::withBody("no JSON"),
      fakes::FakeReply::withBody(R"({"error_msg":"no"})"),
      fakes::FakeReply::withBody(R"({"access_token":"t","permissions":"email"})"),
      fakes::FakeReply::dropped(),
  };
  for (std::size_t i = 0; i < failures.size(); ++i) {
    storeRecord(client, true, RVPermissionSet{"user_photos"}, keptOptions("111"));
    host.facebookRequests.replyToAuthorizations({failures[i]});
    const auto answer = authorize(client);
    EXPECT_TRUE(answer.granted) << i;
    EXPECT_EQ(answer.error, std::nullopt) << i;
    EXPECT_TRUE(record()->isGranted()) << i;
    EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet()) << i;
  }
}

TEST_F(ADirectAuthorization, WaitsForTheServer) {
  storeRecord(client, true, std::nullopt, keptOptions("111"));
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withBody(answerOfServer({"email"})).held()});
  Answers answers;
  std::thread asking([&] {
    plugin.authorizeAccessToAccountsOfType(host.accountType, client, host.store, answers.completion());
  });
  EXPECT_TRUE(host.facebookRequests.waitForHeld(1));
  EXPECT_EQ(answers.count(), 0U);
  host.facebookRequests.releaseHeld();
  asking.join();
  EXPECT_TRUE(onlyAnswerOf(answers).granted);
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"email"}));
}

TEST_F(ADirectAuthorization, AnswersWithTheErrorOfStoringTheRecord) {
  const RVError error{"com.example.disk", 28, {{"description", "the disk is full"}}};
  host.store->records().failWritesWith(error);
  const auto answer = authorize(client);
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, error);
  EXPECT_THAT(host.accessLog.entries(),
              ElementsAre(Entry{"com.zentor.facebook", "org.example.PhotoApp", true, false, 0}));
}

TEST_F(ADirectAuthorization, OfAClientWithoutABundleIDIsNotStored) {
  const auto nameless = host.makeClient(std::nullopt);
  const auto answer = authorize(nameless);
  EXPECT_FALSE(answer.granted);
  ASSERT_TRUE(answer.error);
  EXPECT_EQ(answer.error->code, 16);
  EXPECT_THAT(host.accessLog.entries(),
              ElementsAre(Entry{"com.zentor.facebook", std::nullopt, true, false, 0}));
}

class ARevocation : public PluginTest {
 protected:
  static constexpr const char* kOperation = "revokeAccessToAccountsOfType:forClient:store:completion:";

  Answers::Answer revoke(const std::shared_ptr<const RVDClient>& whose) {
    Answers answers;
    plugin.revokeAccessToAccountsOfType(host.accountType, whose, host.store, answers.completion());
    EXPECT_EQ(answers.count(), 1U);
    return onlyAnswerOf(answers);
  }

  const std::shared_ptr<fakes::FakeClient> client = host.makeClient();
};

TEST_F(ARevocation, WithoutAnAccountSucceedsSilently) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111"));
  host.store->removeAccounts();
  const auto answer = revoke(client);
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_TRUE(host.log.lines().empty());
  EXPECT_TRUE(record()->isGranted());
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
}

TEST_F(ARevocation, OfAClientWithoutARecordSucceedsAndSaysSo) {
  const auto answer = revoke(client);
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_EQ(linesOf(host.log),
            Lines({{7,
                    "Client org.example.PhotoApp does not have an exiting ClientAuthorization. "
                    "Ignoring..."}}));
  expectPlaceOfEveryLine(host.log, kOperation);
  EXPECT_FALSE(record());
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
}

TEST_F(ARevocation, OfAClientWithoutABundleIDSaysSoWithoutIt) {
  EXPECT_TRUE(revoke(host.makeClient(std::nullopt)).granted);
  EXPECT_THAT(host.log.texts(),
              ElementsAre("Client (null) does not have an exiting ClientAuthorization. Ignoring..."));
}

TEST_F(ARevocation, InvalidatesTheTokenRemovesTheCredentialAndLeavesARefusal) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111", "friends"));
  host.keychain.putCredential("account-1", kClientID, "client-token");
  const auto answer = revoke(client);
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_THAT(host.facebookRequests.revokedAppIDs(), ElementsAre("111"));
  EXPECT_EQ(host.keychain.stored("account-1", kClientID), nullptr);
  EXPECT_NE(host.keychain.stored("account-1", std::nullopt), nullptr);
  EXPECT_THAT(host.keychain.removals(), ElementsAre(Pair("account-1", kClientID)));
  ASSERT_TRUE(record());
  EXPECT_FALSE(record()->isGranted());
  EXPECT_EQ(record()->grantedPermissions(), std::nullopt);
  EXPECT_EQ(record()->options(), keptOptions("111", "friends"));
  EXPECT_THAT(host.accessLog.entries(),
              ElementsAre(Entry{"com.zentor.facebook", "org.example.PhotoApp", false, false, 0}));
  EXPECT_EQ(linesOf(host.log),
            Lines({{7, "Found Facebook app ID: 111 for client: org.example.PhotoApp"},
                   {7, "Contacting tesseld to invalidate token for client: org.example.PhotoApp"},
                   {7, "Removing credential from keychain for client: org.example.PhotoApp"}}));
  expectPlaceOfEveryLine(host.log, kOperation);
}

TEST_F(ARevocation, TakesItsStepsInOrder) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111"));
  revoke(client);
  std::vector<std::string> steps;
  for (const std::string& call : host.journal->calls()) {
    if (!call.starts_with("client.") && !call.starts_with("account.")) steps.push_back(call);
  }
  EXPECT_THAT(steps,
              ElementsAre("store.accountsWithAccountTypeIdentifier",
                          "store.authorizationManager",
                          "authorizationManager.authorizationForClient",
                          "log.RVLog",
                          "log.RVLog",
                          "facebookRequests.initSession",
                          "facebookRequests.session.revokeAccessTokenForAppWithID",
                          "log.RVLog",
                          "keychain.removeCredentialForAccount",
                          "authorizationManager.setAuthorization",
                          "accessLog.RVDLogAccessRequest"));
}

TEST_F(ARevocation, OfARecordWithoutAnAppIDLeavesARefusalAndTouchesNothingElse) {
  storeRecord(client, true, RVPermissionSet{"email"}, std::nullopt);
  host.keychain.putCredential("account-1", kClientID, "client-token");
  EXPECT_TRUE(revoke(client).granted);
  EXPECT_FALSE(record()->isGranted());
  EXPECT_EQ(record()->grantedPermissions(), std::nullopt);
  EXPECT_EQ(host.facebookRequests.sessionsMade(), 0U);
  EXPECT_THAT(host.keychain.removals(), IsEmpty());
  EXPECT_EQ(linesOf(host.log),
            Lines({{7, "Found Facebook app ID: (null) for client: org.example.PhotoApp"}}));
  EXPECT_THAT(host.accessLog.entries(), SizeIs(1));
}

TEST_F(ARevocation, SucceedsWhateverFailsBehindIt) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111"));
  host.store->records().failWritesWith(bareError(99));
  host.keychain.failWritesWith(bareError(98));
  const auto answer = revoke(client);
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
}

TEST_F(ARevocation, HasTheNextRequestRefusedAtOnce) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111"));
  revoke(client);
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_THAT(host.userNotifications.alerts(), IsEmpty());
}

class ARevocationOfAll : public PluginTest {
 protected:
  static constexpr const char* kOperation = "revokeAllAccessToAccountsOfType:store:withCompletion:";

  Answers::Answer revokeAll() {
    Answers answers;
    plugin.revokeAllAccessToAccountsOfType(host.accountType, host.store, answers.completion());
    EXPECT_EQ(answers.count(), 1U);
    return onlyAnswerOf(answers);
  }
};

TEST_F(ARevocationOfAll, WithoutAnAccountSucceedsAndWonders) {
  host.store->removeAccounts();
  storeRecord(host.makeClient(), true, RVPermissionSet{"email"}, keptOptions("111"));
  const auto answer = revokeAll();
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_EQ(linesOf(host.log), Lines({{3, "No Facebook account. What?"}}));
  expectPlaceOfEveryLine(host.log, kOperation);
  EXPECT_EQ(host.store->records().recordCount(), 1U);
}

TEST_F(ARevocationOfAll, RevokesEveryTokenRemovesEveryCredentialAndEveryRecord) {
  for (const char* id : {"org.example.A", "org.example.B", "org.example.C"})
    host.keychain.putCredential("account-1", id, "token");
  storeRecord(host.makeClient("org.example.A"), true, RVPermissionSet{"email"}, keptOptions("111"));
  storeRecord(host.makeClient("org.example.B"), false, std::nullopt, std::nullopt);
  storeRecord(host.makeClient("org.example.C"), false, std::nullopt, keptOptions("333"));
  const auto answer = revokeAll();
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_THAT(host.facebookRequests.revokedAppIDs(), ElementsAre("111", "333"));
  EXPECT_EQ(host.facebookRequests.sessionsMade(), 1U);
  EXPECT_THAT(host.keychain.removals(),
              ElementsAre(Pair("account-1", "org.example.A"), Pair("account-1", "org.example.C")));
  EXPECT_EQ(host.store->records().recordCount(), 0U);
  EXPECT_EQ(host.journal->count("authorizationManager.setAuthorization"), 0U);
  EXPECT_EQ(host.journal->count("authorizationManager.removeAllClientAuthorizationsForAccountType"), 1U);
  EXPECT_THAT(host.accessLog.entries(), IsEmpty());
  EXPECT_EQ(linesOf(host.log),
            Lines({{7, "Found 3 authorized clients. Revoking all..."},
                   {7, "Found Facebook app ID: 111 for client: org.example.A"},
                   {7, "Contacting tesseld to invalidate token for client: org.example.A"},
                   {7, "Removing credential from keychain for client: org.example.A"},
                   {7, "Found Facebook app ID: (null) for client: org.example.B"},
                   {7, "Found Facebook app ID: 333 for client: org.example.C"},
                   {7, "Contacting tesseld to invalidate token for client: org.example.C"},
                   {7, "Removing credential from keychain for client: org.example.C"}}));
  expectPlaceOfEveryLine(host.log, kOperation);
}

TEST_F(ARevocationOfAll, WithoutRecordsRevokesNothing) {
  EXPECT_TRUE(revokeAll().granted);
  EXPECT_THAT(host.log.texts(), ElementsAre("Found 0 authorized clients. Revoking all..."));
  EXPECT_THAT(host.facebookRequests.revokedAppIDs(), IsEmpty());
  EXPECT_EQ(host.facebookRequests.sessionsMade(), 1U);
}

TEST_F(ARevocationOfAll, LeavesRecordsOfOtherAccountTypesAlone) {
  const auto client = host.makeClient();
  RVDClientAuthorization authorization(client);
  host.store->records().setAuthorization(authorization, *client, RVAccountType("com.zentor.mail"));
  revokeAll();
  EXPECT_EQ(host.store->records().recordCount(), 1U);
}

TEST_F(ARevocationOfAll, MakesEveryClientANewOne) {
  const auto client = host.makeClient();
  storeRecord(client, false, std::nullopt, keptOptions("111"));
  revokeAll();
  EXPECT_TRUE(request(client, optionsFor({"email"})).granted);
  EXPECT_THAT(host.userNotifications.alerts(), SizeIs(1));
}

}  // namespace
}  // namespace plugin_tests
