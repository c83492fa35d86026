// Asking the server to authorize an application, judging its answers, and keeping its token.
#include "tests/unit/plugin_fixture.h"

namespace plugin_tests {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

using Lines = std::vector<std::pair<int, std::string>>;

struct ServerOutcome {
  bool success = false;
  std::optional<RVArray> granted;
  std::optional<RVError> error;
  std::thread::id thread;
  bool credentialWasStored = false;
  int answers = 0;
};

class AServerAuthorization : public PluginTest {
 protected:
  static constexpr const char* kOperation =
      "_getServerAuthorizationForClient:withAppID:permissions:audience:account:completion:";

  ServerOutcome authorize(const std::shared_ptr<const RVDClient>& whom,
                          const std::optional<RVPermissionSet>& permissions = RVPermissionSet{"email"},
                          const std::optional<std::string>& audience = std::nullopt) {
    ServerOutcome outcome;
    access.getServerAuthorizationForClient(
        whom,
        "111",
        permissions,
        audience,
        account,
        [&](bool success, const std::optional<RVArray>& granted, const std::optional<RVError>& error) {
          outcome = {success,
                     granted,
                     error,
                     std::this_thread::get_id(),
                     host.keychain.stored("account-1", kClientID) != nullptr,
                     outcome.answers + 1};
        });
    host.facebookRequests.waitUntilDelivered();
    EXPECT_EQ(outcome.answers, 1);
    return outcome;
  }

  ServerOutcome authorizeAnsweredBy(const fakes::FakeReply& reply) {
    host.facebookRequests.replyToAuthorizations({reply});
    return authorize(client);
  }

  const std::shared_ptr<fakes::FakeClient> client = host.makeClient();
  const std::shared_ptr<RVAccount> account = std::make_shared<fakes::FakeAccount>("account-1");
};

TEST_F(AServerAuthorization, OfAClientWithoutABundleIDFailsBeforeKeychainAndNetwork) {
  const auto nameless = host.makeClient(std::nullopt);
  const ServerOutcome outcome = authorize(nameless);
  EXPECT_FALSE(outcome.success);
  EXPECT_EQ(outcome.granted, std::nullopt);
  EXPECT_EQ(outcome.error,
            describedError(16,
                           "Cannot obtain server authorization for client Photo App because it has no "
                           "bundle ID."));
  EXPECT_EQ(outcome.thread, std::this_thread::get_id());
  EXPECT_TRUE(host.log.lines().empty());
  EXPECT_THAT(host.journal->calls(),
              ElementsAre("client.bundleID", "client.description", "stringTable.stringWithFormat"));
}

TEST_F(AServerAuthorization, SendsWhatItWasGivenSignedWithTheMasterToken) {
  authorize(client, RVPermissionSet{"email", "publish"}, "friends");
  ASSERT_THAT(host.facebookRequests.authorizations(), SizeIs(1));
  const auto exchange = host.facebookRequests.authorizations()[0];
  EXPECT_EQ(exchange.appId, "111");
  EXPECT_EQ(exchange.bundleId, "org.example.PhotoApp");
  EXPECT_EQ(exchange.permissions, RVPermissionSet({"email", "publish"}));
  EXPECT_EQ(exchange.audience, "ALL_FRIENDS");
  EXPECT_EQ(exchange.accessToken, RVSecret("master-token"));
  EXPECT_TRUE(exchange.performed);
}

TEST_F(AServerAuthorization, LeavesAbsentPermissionsAndAudienceAbsent) {
  authorize(client, std::nullopt, std::nullopt);
  const auto exchange = host.facebookRequests.authorizations().at(0);
  EXPECT_EQ(exchange.permissions, std::nullopt);
  EXPECT_EQ(exchange.audience, std::nullopt);
}

TEST_F(AServerAuthorization, KeepsEmptyPermissionsEmpty) {
  authorize(client, RVPermissionSet());
  EXPECT_EQ(host.facebookRequests.authorizations().at(0).permissions, RVPermissionSet());
}

TEST_F(AServerAuthorization, SendsAnUnknownAudienceAsNone) {
  EXPECT_TRUE(authorize(client, RVPermissionSet{"publish"}, "the neighbours").success);
  EXPECT_EQ(host.facebookRequests.authorizations().at(0).audience, std::nullopt);
}

TEST_F(AServerAuthorization, WithoutAMasterCredentialIsSentUnsignedAndSaysSo) {
  host.keychain.setMasterToken("account-1", std::nullopt);
  EXPECT_TRUE(authorize(client).success);
  const auto exchange = host.facebookRequests.authorizations().at(0);
  EXPECT_TRUE(exchange.tokenWasSet);
  EXPECT_EQ(exchange.accessToken, std::nullopt);
  EXPECT_EQ(linesOf(host.log).front(),
            std::pair(3,
                      std::string("Could not get the master token for account account account-1 to sign "
                                  "the access request.")));
  expectPlaceOfEveryLine(host.log, kOperation);
}

TEST_F(AServerAuthorization, WithAnEmptyMasterTokenIsSentWithItAndSaysSo) {
  host.keychain.setMasterToken("account-1", "");
  EXPECT_TRUE(authorize(client).success);
  EXPECT_EQ(host.facebookRequests.authorizations().at(0).accessToken, RVSecret(""));
  EXPECT_EQ(linesOf(host.log).front().first, 3);
}

TEST_F(AServerAuthorization, TakesItsStepsInOrder) {
  authorize(client);
  std::vector<std::string> calls = host.journal->calls();
  calls.resize(5);
  EXPECT_THAT(calls,
              ElementsAre("client.bundleID",
                          "facebookRequests.initWithAppId",
                          "keychain.credentialForAccount",
                          "facebookRequests.authorization.setAccessToken",
                          "facebookRequests.authorization.performRequestWithHandler"));
}

TEST_F(AServerAuthorization, FailsWithTheTransportsError) {
  const RVError error{"com.zentor.transfer", 60, {{"description", "The certificate is not valid."}}};
  const ServerOutcome outcome = authorizeAnsweredBy(fakes::FakeReply::withError(error));
  EXPECT_FALSE(outcome.success);
  EXPECT_EQ(outcome.granted, std::nullopt);
  EXPECT_EQ(outcome.error, error);
  EXPECT_EQ(linesOf(host.log),
            Lines({{3,
                    "Error contacting Facebook server for access authorization: The certificate is not "
                    "valid."}}));
  expectPlaceOfEveryLine(host.log, kOperation);
}

TEST_F(AServerAuthorization, FailsWithTheTransportsErrorEvenWhereABodyCame) {
  fakes::FakeReply reply = fakes::FakeReply::withBody(answerOfServer({"email"}));
  reply.error = RVError{"com.zentor.transfer", 18, {}};
  const ServerOutcome outcome = authorizeAnsweredBy(reply);
  EXPECT_FALSE(outcome.success);
  EXPECT_EQ(outcome.error, reply.error);
  EXPECT_THAT(host.log.texts(),
              ElementsAre("Error contacting Facebook server for access authorization: (null)"));
}

TEST_F(AServerAuthorization, FailsWithoutAnErrorWhereTheTransportBringsNothing) {
  const ServerOutcome outcome = authorizeAnsweredBy(fakes::FakeReply::withoutAnything());
  EXPECT_FALSE(outcome.success);
  EXPECT_EQ(outcome.granted, std::nullopt);
  EXPECT_EQ(outcome.error, std::nullopt);
  EXPECT_EQ(linesOf(host.log),
            Lines({{3, "Error contacting Facebook server for access authorization: (null)"}}));
}

TEST_F(AServerAuthorization, FailsWithTheReadersErrorWhereTheBodyIsNoJSON) {
  const ServerOutcome outcome = authorizeAnsweredBy(fakes::FakeReply::withBody("<html>"));
  EXPECT_FALSE(outcome.success);
  EXPECT_EQ(outcome.granted, std::nullopt);
  ASSERT_TRUE(outcome.error);
  EXPECT_EQ(outcome.error->domain, kRVJSONErrorDomain);
  EXPECT_EQ(linesOf(host.log),
            Lines({{3,
                    "TKFacebookAccountAccessPlugin could not parse server response: " +
                        outcome.error->localizedDescription().value() + "."}}));
  expectPlaceOfEveryLine(host.log, kOperation);
}

TEST_F(AServerAuthorization, FailsWithTheReadersErrorEvenWhereAValueCame) {
  const RVError error{std::string(kRVJSONErrorDomain), 5, {}};
  host.jsonReader.readEverythingAs(RVJSONResult{RVDictionary{{"access_token", "t"}}, error});
  const ServerOutcome outcome = authorizeAnsweredBy(fakes::FakeReply::withBody("{}"));
  EXPECT_FALSE(outcome.success);
  EXPECT_EQ(outcome.error, error);
  EXPECT_FALSE(outcome.credentialWasStored);
}

TEST_F(AServerAuthorization, FailsWithoutAnErrorWhereTheReaderYieldsNothing) {
  host.jsonReader.readEverythingAs(RVJSONResult{});
  const ServerOutcome outcome = authorizeAnsweredBy(fakes::FakeReply::withBody("{}"));
  EXPECT_FALSE(outcome.success);
  EXPECT_EQ(outcome.error, std::nullopt);
  EXPECT_EQ(linesOf(host.log),
            Lines({{3, "TKFacebookAccountAccessPlugin could not parse server response: (null)."}}));
}

TEST_F(AServerAuthorization, SucceedsWithTheListThatTheServerSends) {
  const ServerOutcome outcome = authorizeAnsweredBy(
      fakes::FakeReply::withBody(R"({"access_token":"t","permissions":["email",7,"email"]})"));
  EXPECT_TRUE(outcome.success);
  EXPECT_EQ(outcome.granted, RVArray({"email", 7, "email"}));
  EXPECT_EQ(outcome.error, std::nullopt);
  EXPECT_TRUE(outcome.credentialWasStored);
  EXPECT_NE(outcome.thread, std::this_thread::get_id());
}

TEST_F(AServerAuthorization, SucceedsWithoutAListWhereTheServerSendsNone) {
  for (const char* body : {R"({"access_token":"t"})",
                           R"({"access_token":"t","permissions":"email"})",
                           R"({"access_token":"t","permissions":{"email":true}})",
                           R"({"access_token":"t","permissions":null})"}) {
    const ServerOutcome outcome = authorizeAnsweredBy(fakes::FakeReply::withBody(body));
    EXPECT_TRUE(outcome.success) << body;
    EXPECT_EQ(outcome.granted, std::nullopt) << body;
    EXPECT_EQ(outcome.error, std::nullopt) << body;
  }
}

TEST_F(AServerAuthorization, SucceedsWithAnEmptyTokenAndStoresIt) {
  const ServerOutcome outcome =
      authorizeAnsweredBy(fakes::FakeReply::withBody(answerOfServer({"email"}, "")));
  EXPECT_TRUE(outcome.success);
  ASSERT_NE(host.keychain.stored("account-1", kClientID), nullptr);
  EXPECT_TRUE(host.keychain.stored("account-1", kClientID)->oauthToken().empty());
}

TEST_F(AServerAuthorization, SucceedsAlsoWhereTheCredentialCannotBeStored) {
  host.keychain.failWritesWith(bareError(99));
  EXPECT_TRUE(authorizeAnsweredBy(fakes::FakeReply::withBody(answerOfServer({"email"}))).success);
}

TEST_F(AServerAuthorization, LogsEveryAnswerThatCouldBeReadWithItsTokenMasked) {
  authorizeAnsweredBy(fakes::FakeReply::withBody(answerOfServer({"email"}, "very-secret")));
  ASSERT_THAT(host.log.lines(), SizeIs(1));
  const auto line = host.log.lines()[0];
  EXPECT_EQ(line.level, 7);
  EXPECT_EQ(line.format, "Access request response: %@");
  ASSERT_THAT(line.arguments, SizeIs(1));
  ASSERT_NE(line.arguments[0]->dictionary(), nullptr);
  EXPECT_THAT(line.text, testing::StartsWith("Access request response: "));
  EXPECT_THAT(line.text, testing::HasSubstr("email"));
  EXPECT_THAT(line.text, testing::Not(testing::HasSubstr("very-secret")));
  expectPlaceOfEveryLine(host.log, kOperation);
}

TEST_F(AServerAuthorization, IsRefusedWithTheServersMessageWhateverTheStatus) {
  for (const int status : {200, 400, 500}) {
    const ServerOutcome outcome =
        authorizeAnsweredBy(fakes::FakeReply::withBody(R"({"error_msg":"unknown app"})", status));
    EXPECT_FALSE(outcome.success);
    EXPECT_EQ(outcome.granted, std::nullopt);
    EXPECT_EQ(outcome.error,
              describedError(7, "The Facebook server could not fulfill this access request: unknown app"));
    EXPECT_FALSE(outcome.credentialWasStored);
  }
  for (const auto& line : host.log.lines()) EXPECT_EQ(line.level, 7);
}

TEST_F(AServerAuthorization, SucceedsWhateverTheStatusWhereATokenCame) {
  EXPECT_TRUE(authorizeAnsweredBy(fakes::FakeReply::withBody(answerOfServer({"email"}), 500)).success);
}

TEST_F(AServerAuthorization, IsRefusedWithAMessageOfAnyKindAsText) {
  EXPECT_EQ(authorizeAnsweredBy(fakes::FakeReply::withBody(R"({"error_msg":42})")).error,
            describedError(7, "The Facebook server could not fulfill this access request: 42"));
}

TEST_F(AServerAuthorization, IsRefusedWithAPlaceholderWhereTheServerGivesNoReason) {
  const RVError expected =
      describedError(7, "The Facebook server could not fulfill this access request: (null)");
  for (const char* body : {"{}",
                           R"({"access_token":7})",
                           R"({"access_token":null,"permissions":["email"]})",
                           R"({"error_msg":null})"}) {
    const ServerOutcome outcome = authorizeAnsweredBy(fakes::FakeReply::withBody(body));
    EXPECT_FALSE(outcome.success) << body;
    EXPECT_EQ(outcome.error, expected) << body;
  }
}

TEST_F(AServerAuthorization, IsRefusedWhereTheAnswerIsNoObject) {
  const RVError expected =
      describedError(7, "The Facebook server could not fulfill this access request: (null)");
  for (const char* body : {"null", "7", "true", R"("access_token")", R"(["access_token"])"}) {
    const ServerOutcome outcome = authorizeAnsweredBy(fakes::FakeReply::withBody(body));
    EXPECT_FALSE(outcome.success) << body;
    EXPECT_EQ(outcome.error, expected) << body;
  }
}

TEST_F(AServerAuthorization, WhoseHandlerIsDroppedFailsWithoutAnError) {
  const ServerOutcome outcome = authorizeAnsweredBy(fakes::FakeReply::dropped());
  EXPECT_FALSE(outcome.success);
  EXPECT_EQ(outcome.granted, std::nullopt);
  EXPECT_EQ(outcome.error, std::nullopt);
}

TEST_F(AServerAuthorization, ReturnsBeforeTheAnswer) {
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withBody(answerOfServer({"email"})).held()});
  bool answered = false;
  access.getServerAuthorizationForClient(
      client, "111", std::nullopt, std::nullopt, account, [&](auto&&...) { answered = true; });
  EXPECT_TRUE(host.facebookRequests.waitForHeld(1));
  EXPECT_FALSE(answered);
  host.facebookRequests.releaseHeld();
  host.facebookRequests.waitUntilDelivered();
  EXPECT_TRUE(answered);
}

class TheServersAudience : public PluginTest {};

TEST_F(TheServersAudience, IsOneOfThreeWords) {
  EXPECT_EQ(access.serverAudienceStringForAudience("everyone"), "EVERYONE");
  EXPECT_EQ(access.serverAudienceStringForAudience("friends"), "ALL_FRIENDS");
  EXPECT_EQ(access.serverAudienceStringForAudience("only_me"), "SELF");
}

TEST_F(TheServersAudience, IsAbsentForAnythingElse) {
  EXPECT_EQ(access.serverAudienceStringForAudience("Everyone"), std::nullopt);
  EXPECT_EQ(access.serverAudienceStringForAudience(""), std::nullopt);
  EXPECT_EQ(access.serverAudienceStringForAudience(std::nullopt), std::nullopt);
}

class AClientsCredential : public PluginTest {
 protected:
  const std::shared_ptr<fakes::FakeClient> client = host.makeClient();
  fakes::FakeAccount account{"account-1"};
};

TEST_F(AClientsCredential, IsStoredUnderTheClientAndStaysOnTheAccount) {
  access.saveCredentialForClient(*client, account, RVSecret("token"));
  const auto stored = host.keychain.stored("account-1", kClientID);
  ASSERT_NE(stored, nullptr);
  EXPECT_EQ(stored->oauthToken(), RVSecret("token"));
  EXPECT_EQ(stored, account.credential());
}

TEST_F(AClientsCredential, HasAnEmptyRefreshTokenAndNeverExpires) {
  access.saveCredentialForClient(*client, account, RVSecret("token"));
  const auto stored = host.keychain.stored("account-1", kClientID);
  ASSERT_NE(stored, nullptr);
  EXPECT_TRUE(stored->refreshToken().empty());
  EXPECT_EQ(stored->expiryDate(), kRVDistantFuture);
}

TEST_F(AClientsCredential, IsNotTheAccountsOwn) {
  access.saveCredentialForClient(*client, account, RVSecret("token"));
  EXPECT_EQ(host.keychain.stored("account-1", std::nullopt)->oauthToken(), RVSecret("master-token"));
}

TEST_F(AClientsCredential, ReplacesAnEarlierOne) {
  access.saveCredentialForClient(*client, account, RVSecret("first"));
  access.saveCredentialForClient(*client, account, RVSecret("second"));
  EXPECT_EQ(host.keychain.stored("account-1", kClientID)->oauthToken(), RVSecret("second"));
  EXPECT_EQ(host.keychain.storedCount(), 2U);
}

TEST_F(AClientsCredential, MayHoldAnEmptyToken) {
  access.saveCredentialForClient(*client, account, RVSecret(""));
  ASSERT_NE(host.keychain.stored("account-1", kClientID), nullptr);
  EXPECT_TRUE(host.keychain.stored("account-1", kClientID)->oauthToken().empty());
}

TEST_F(AClientsCredential, IsNotTouchedWhereThereIsNoToken) {
  access.saveCredentialForClient(*client, account, std::nullopt);
  EXPECT_EQ(host.keychain.stored("account-1", kClientID), nullptr);
  EXPECT_EQ(account.credential(), nullptr);
  EXPECT_TRUE(host.journal->calls().empty());
}

TEST_F(AClientsCredential, IsStoredInSilenceWhereTheStoreFails) {
  host.keychain.failWritesWith(bareError(99));
  access.saveCredentialForClient(*client, account, RVSecret("token"));
  EXPECT_EQ(host.keychain.stored("account-1", kClientID), nullptr);
  EXPECT_TRUE(host.log.lines().empty());
}

class AListOfNames : public PluginTest {};

TEST_F(AListOfNames, IsJoinedByCommasAlone) {
  EXPECT_EQ(access.csvStringFromSet({"b", "a"}), "a,b");
  EXPECT_EQ(access.csvStringFromSet({"a,b", "c d"}), "a,b,c d");
}

TEST_F(AListOfNames, OfOneNameIsThatName) {
  EXPECT_EQ(access.csvStringFromSet({"email"}), "email");
}

TEST_F(AListOfNames, OfNoNamesIsEmpty) {
  EXPECT_EQ(access.csvStringFromSet({}), "");
}

}  // namespace
}  // namespace plugin_tests
