// What becomes of the user's answer.
#include <algorithm>

#include "tests/unit/plugin_fixture.h"

namespace plugin_tests {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

using Lines = std::vector<std::pair<int, std::string>>;

constexpr const char* kOperation =
    "_handleUserResponse:toRequestForClient:withAppID:persistentOptions:onAccount:ofType:"
    "existingPermissions:newPermissions:audience:isFirstTimeRequest:shouldSkipServer:store:completion:";

const std::string kDefaultAccess(kRVDFacebookAccountsDefaultAccessEntitlement);

class TheAnswerOfTheUser : public PluginTest {
 protected:
  void refuse() { host.userNotifications.answerWith({1}); }
  void setIgnorePreference() {
    host.preferences.store(TKFacebookIgnoreAccessRequests, TKFacebookPreferencesAppID, true);
  }
  void replyWith(const fakes::FakeReply& reply) { host.facebookRequests.replyToAuthorizations({reply}); }

  // The lines that the handling of the answer logs itself.
  Lines ownLines() {
    Lines lines;
    for (const auto& line : host.log.lines()) {
      if (line.functionName != std::string("-[TKFacebookAccountAccessPlugin ") + kOperation + "]") continue;
      EXPECT_EQ(line.facility, kRVLogFacilityDaemon);
      EXPECT_EQ(line.sourceFile, "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin");
      lines.emplace_back(line.level, line.text);
    }
    return lines;
  }

  const std::shared_ptr<fakes::FakeClient> client = host.makeClient();
};

class TheIgnorePreference : public TheAnswerOfTheUser {};

TEST_F(TheIgnorePreference, EndsARequestThatTheUserAllowedWithoutErrorAndRecord) {
  setIgnorePreference();
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_THAT(host.userNotifications.alerts(), SizeIs(1));
  EXPECT_THAT(host.facebookRequests.authorizations(), IsEmpty());
  EXPECT_FALSE(record());
  EXPECT_EQ(ownLines(),
            Lines({{5, "Will not contact server about this access request due to user-set pref."}}));
}

TEST_F(TheIgnorePreference, EndsARequestThatTheUserRefusedWithoutErrorAndRecord) {
  setIgnorePreference();
  refuse();
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_FALSE(record());
}

TEST_F(TheIgnorePreference, EndsARequestOfADefaultAccessClientToo) {
  setIgnorePreference();
  const auto privileged = host.makeClient(kClientID, {kDefaultAccess});
  const auto answer = request(privileged, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_FALSE(record());
}

TEST_F(TheIgnorePreference, LeavesAnEarlierGrantAsItIs) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111"));
  setIgnorePreference();
  EXPECT_FALSE(request(client, optionsFor({"user_photos"})).granted);
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"email"}));
  EXPECT_TRUE(record()->isGranted());
}

class ARefusal : public TheAnswerOfTheUser {
 protected:
  ARefusal() { refuse(); }
};

TEST_F(ARefusal, OfAClientWithoutAGrantIsRecordedAsAStandingRefusal) {
  const auto answer = request(client, optionsFor({"publish_stream"}, "friends"));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, bareError(7));
  ASSERT_TRUE(record());
  EXPECT_FALSE(record()->isGranted());
  EXPECT_EQ(record()->grantedPermissions(), std::nullopt);
  EXPECT_EQ(record()->options(), keptOptions("111", "friends"));
  EXPECT_EQ(record()->client(), client);
  EXPECT_THAT(ownLines(), IsEmpty());
  EXPECT_THAT(host.facebookRequests.authorizations(), IsEmpty());
}

TEST_F(ARefusal, OfAClientWithAGrantLeavesTheGrantAsItIs) {
  storeRecord(client, true, RVPermissionSet{"user_photos"}, keptOptions("111"));
  const auto answer = request(client, optionsFor({"publish_stream"}, "friends"));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, bareError(7));
  EXPECT_EQ(host.journal->count("authorizationManager.setAuthorization"), 0U);
  EXPECT_TRUE(record()->isGranted());
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"user_photos"}));
  EXPECT_EQ(record()->options(), keptOptions("111"));
  EXPECT_THAT(ownLines(), IsEmpty());
}

TEST_F(ARefusal, IsFollowedByRefusalsAtOnce) {
  request(client, optionsFor({"email"}));
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_THAT(host.userNotifications.alerts(), SizeIs(1));
}

TEST_F(ARefusal, ThatCannotBeStoredIsReportedAllTheSame) {
  host.store->records().failWritesWith(bareError(99));
  EXPECT_EQ(request(client, optionsFor({"email"})).error, bareError(7));
  EXPECT_FALSE(record());
}

class AnApproval : public TheAnswerOfTheUser {};

TEST_F(AnApproval, RecordsExactlyWhatTheServerGrants) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111"));
  replyWith(fakes::FakeReply::withBody(answerOfServer({"user_photos", "user_likes"})));
  const auto answer = request(client, optionsFor({"email", "user_photos"}));
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  ASSERT_TRUE(record());
  EXPECT_TRUE(record()->isGranted());
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"user_likes", "user_photos"}));
  EXPECT_EQ(record()->options(), keptOptions("111"));
  EXPECT_THAT(ownLines(), IsEmpty());
}

TEST_F(AnApproval, AsksTheServerForTheNewPermissionsAlone) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111"));
  request(client, optionsFor({"email", "user_photos"}));
  ASSERT_THAT(host.facebookRequests.authorizations(), SizeIs(1));
  EXPECT_EQ(host.facebookRequests.authorizations()[0].permissions, RVPermissionSet({"user_photos"}));
}

TEST_F(AnApproval, RecordsANameThatTheServerRepeatsOnce) {
  replyWith(fakes::FakeReply::withBody(answerOfServer({"email", "email"})));
  request(client, optionsFor({"email"}));
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"email"}));
}

TEST_F(AnApproval, LeavesOutOfTheRecordWhatIsNoName) {
  replyWith(fakes::FakeReply::withBody(R"({"access_token":"t","permissions":["email",7,null,["publish"]]})"));
  request(client, optionsFor({"email"}));
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"email"}));
}

TEST_F(AnApproval, RecordsAGrantOfNothingWhereTheServerSendsNoList) {
  replyWith(fakes::FakeReply::withBody(R"({"access_token":"t"})"));
  EXPECT_TRUE(request(client, optionsFor({"email"})).granted);
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet());
  EXPECT_TRUE(record()->isGranted());
}

TEST_F(AnApproval, IsReportedAlsoWhereItCannotBeStored) {
  host.store->records().failWritesWith(bareError(99));
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
}

TEST_F(AnApproval, RecordsNothingAndPassesTheErrorOnWhereTheServerFails) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111", "friends"));
  const RVError error{"com.zentor.transfer", 28, {{"description", "too slow"}}};
  replyWith(fakes::FakeReply::withError(error));
  const auto answer = request(client, optionsFor({"user_photos"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, error);
  EXPECT_EQ(host.journal->count("authorizationManager.setAuthorization"), 0U);
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"email"}));
  EXPECT_EQ(record()->options(), keptOptions("111", "friends"));
  EXPECT_THAT(ownLines(), IsEmpty());
}

TEST_F(AnApproval, OfAFirstRequestLeavesNoRecordWhereTheServerRefuses) {
  replyWith(fakes::FakeReply::withBody(R"({"error_msg":"unknown app"})"));
  EXPECT_FALSE(request(client, optionsFor({"email"})).granted);
  EXPECT_FALSE(record());
}

TEST_F(AnApproval, ReplacesAStoredGrantWithItsOptions) {
  storeRecord(client, true, RVPermissionSet{"email"}, keptOptions("111", "friends"));
  replyWith(fakes::FakeReply::withBody(answerOfServer({"publish"})));
  request(client, optionsFor({"publish"}, "only_me", "222"));
  EXPECT_EQ(record()->options(), keptOptions("222", "only_me"));
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"publish"}));
}

TEST_F(AnApproval, StoresTheCredentialBeforeTheRecord) {
  request(client, optionsFor({"email"}));
  const auto calls = host.journal->calls();
  const auto placeOf = [&](const char* call) {
    return std::find(calls.begin(), calls.end(), call) - calls.begin();
  };
  EXPECT_LT(placeOf("keychain.setCredentialForAccount"), placeOf("authorizationManager.setAuthorization"));
  EXPECT_LT(placeOf("authorizationManager.setAuthorization"), static_cast<std::ptrdiff_t>(calls.size()));
}

class ADefaultAccessWithoutAnAccount : public TheAnswerOfTheUser {
 protected:
  ADefaultAccessWithoutAnAccount() { host.store->removeAccounts(); }
  const std::shared_ptr<fakes::FakeClient> privileged = host.makeClient(kClientID, {kDefaultAccess});
};

TEST_F(ADefaultAccessWithoutAnAccount, RecordsWhatWasHeldAndWhatIsNewWithoutTheServer) {
  storeRecord(privileged, true, RVPermissionSet{"email", "user_likes"}, keptOptions("111"));
  const auto answer = request(privileged, optionsFor({"email", "user_photos"}));
  EXPECT_TRUE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_EQ(record()->grantedPermissions(), RVPermissionSet({"email", "user_likes", "user_photos"}));
  EXPECT_TRUE(record()->isGranted());
  EXPECT_THAT(host.facebookRequests.authorizations(), IsEmpty());
  EXPECT_EQ(host.keychain.storedCount(), 1U);
  EXPECT_EQ(ownLines(), Lines({{5, "Skipping server request!"}}));
}

TEST_F(ADefaultAccessWithoutAnAccount, IsAnsweredOnTheCallingThread) {
  EXPECT_EQ(request(privileged, optionsFor({"email"})).thread, std::this_thread::get_id());
}

}  // namespace
}  // namespace plugin_tests
