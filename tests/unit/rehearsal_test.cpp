// What an explanation says, road by road.
#include "tests/unit/plugin_fixture.h"
#include "tests/unit/rehearsal_fixture.h"

namespace {

using plugin_tests::bareError;
using plugin_tests::keptOptions;
using plugin_tests::optionsFor;
using rehearsal::Exchange;
using rehearsal::Explanation;
using rehearsal::Verdict;
using testing::AnyOf;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::StartsWith;

const std::string kAllAccess(kRVDAllAccountsAccessEntitlement);
const std::string kDefaultAccess(kRVDFacebookAccountsDefaultAccessEntitlement);

class AnExplanation : public plugin_tests::PluginTest {
 protected:
  // Explains, and sees to it that nothing but reading was done.
  Explanation explain(const RVDictionary& options, std::set<std::string, std::less<>> entitlements = {}) {
    const std::shared_ptr<const RVDClient> client = host.makeClient(kClientID, std::move(entitlements));
    host.journal->clear();
    auto explanation =
        rehearsal::explain(stage_, rehearsal_tests::makePlugin, {host.accountType, client, options});
    EXPECT_THAT(host.userNotifications.alerts(), IsEmpty());
    EXPECT_THAT(host.facebookRequests.authorizations(), IsEmpty());
    EXPECT_THAT(host.facebookRequests.revokedAppIDs(), IsEmpty());
    EXPECT_THAT(host.accessLog.entries(), IsEmpty());
    EXPECT_THAT(host.log.lines(), IsEmpty());
    for (const auto& call : host.journal->calls())
      EXPECT_THAT(
          call,
          Not(AnyOf(
              HasSubstr("setAuthorization"), HasSubstr("removeAll"), HasSubstr("CredentialForAccount"))));
    return explanation;
  }
  void askTheServer() {
    stage_.server = {{std::shared_ptr<TKFacebookRequestFactory>(), &host.facebookRequests},
                     [] { return RVSecret("the-real-token"); }};
  }
  void cannotSend(const RVError& error) {
    stage_.problemWithSending = [error](const auto&) { return error; };
  }
  void ignoreRequests() {
    host.preferences.store(TKFacebookIgnoreAccessRequests, TKFacebookPreferencesAppID, true);
  }
  void storeGrant(RVPermissionSet permissions) {
    storeRecord(host.makeClient(kClientID), true, std::move(permissions), keptOptions("111"));
  }

  rehearsal::Stage stage_{host.services(),
                          host.store,
                          [](const auto&) { return std::nullopt; },
                          std::nullopt};
};

TEST_F(AnExplanation, OfAClientWithAccessToAllAccountsIsThatItIsGranted) {
  const auto explanation = explain({}, {kAllAccess});
  EXPECT_EQ(explanation.verdict, Verdict::kGranted);
  EXPECT_THAT(explanation.reason, HasSubstr("policy gives"));
  EXPECT_FALSE(explanation.error || explanation.alert || explanation.authorization ||
               explanation.newPermissions);
}

TEST_F(AnExplanation, WithoutAnAccountIsARefusalWithItsError) {
  host.store->removeAccounts();
  const auto explanation = explain(optionsFor({"email"}));
  EXPECT_EQ(explanation.verdict, Verdict::kRefused);
  EXPECT_EQ(explanation.error, bareError(kRVErrorNoAccount));
  EXPECT_EQ(explanation.reason, "No account of this type is set up.");
  EXPECT_FALSE(explanation.isIgnored);
}

TEST_F(AnExplanation, OfUnusableOptionsIsARefusalWithItsError) {
  for (const RVDictionary& options :
       {RVDictionary(), optionsFor({"publish_stream"}), optionsFor({}, {}, "")}) {
    const auto explanation = explain(options);
    EXPECT_EQ(explanation.verdict, Verdict::kRefused);
    EXPECT_EQ(explanation.error, bareError(kRVErrorInvalidOptions));
    EXPECT_THAT(explanation.reason, StartsWith("The options are unusable"));
  }
}

TEST_F(AnExplanation, OfAStandingRefusalSpeaksOfIt) {
  storeRecord(host.makeClient(kClientID), false, std::nullopt, keptOptions("111"));
  for (const auto& entitlements : {std::set<std::string, std::less<>>(), {kDefaultAccess}}) {
    const auto explanation = explain(optionsFor({"email"}), entitlements);
    EXPECT_EQ(explanation.verdict, Verdict::kRefused);
    EXPECT_EQ(explanation.error, std::nullopt);
    EXPECT_FALSE(explanation.isIgnored);
    EXPECT_THAT(explanation.reason, HasSubstr("refusal of the application stands"));
  }
}

TEST_F(AnExplanation, OfAGrantThatCoversTheRequestIsThatItIsGranted) {
  storeGrant({"email", "user_photos"});
  const auto explanation = explain(optionsFor({"email"}));
  EXPECT_EQ(explanation.verdict, Verdict::kGranted);
  EXPECT_THAT(explanation.reason, HasSubstr("holds a grant"));
}

TEST_F(AnExplanation, OfANewRequestHasTheAlertAndWhatWouldBeSent) {
  const auto explanation = explain(optionsFor({"email", "publish_stream"}, "friends"));
  EXPECT_EQ(explanation.verdict, Verdict::kWouldAsk);
  EXPECT_EQ(explanation.error, std::nullopt);
  ASSERT_TRUE(explanation.alert);
  EXPECT_EQ(explanation.alert->header, "Allow access to your Facebook account?");
  EXPECT_THAT(explanation.alert->message, HasSubstr("“Photo App” will be able to use"));
  EXPECT_THAT(explanation.alert->message, HasSubstr("post in your name for your friends to see"));
  EXPECT_EQ(explanation.alert->defaultButtonTitle, "Allow");
  EXPECT_EQ(explanation.alert->alternateButtonTitle, "Don’t Allow");
  EXPECT_TRUE(explanation.alert->isDescribed);
  EXPECT_EQ(explanation.newPermissions, RVPermissionSet({"email", "publish_stream"}));
  EXPECT_EQ(
      explanation.authorization,
      (Exchange{"authorize", "111", kClientID, RVPermissionSet{"email", "publish_stream"}, "ALL_FRIENDS"}));
  EXPECT_EQ(explanation.description, std::nullopt);
  EXPECT_THAT(explanation.reason, HasSubstr("once they have consented, the server"));
}

TEST_F(AnExplanation, AsksForNothingThatIsHeldAlready) {
  storeGrant({"email"});
  const auto explanation = explain(optionsFor({"email", "user_photos"}));
  EXPECT_EQ(explanation.newPermissions, RVPermissionSet{"user_photos"});
  EXPECT_EQ(explanation.authorization->permissions, RVPermissionSet{"user_photos"});
}

TEST_F(AnExplanation, HasThePluginsOwnLinesAsItsTrail) {
  const auto explanation = explain(optionsFor({"email"}));
  EXPECT_THAT(explanation.log,
              ElementsAre(StartsWith("debug: FacebookAccessPlugin is handling request for access from " +
                                     std::string(kClientID) + ". [Facebook/"),
                          StartsWith("debug: Generating user message for permission: (\"email\"). [")));
}

TEST_F(AnExplanation, OfAnIgnoredRequestStillSaysWhatTheUserIsAsked) {
  ignoreRequests();
  const auto explanation = explain(optionsFor({"email"}));
  EXPECT_EQ(explanation.verdict, Verdict::kWouldAsk);
  EXPECT_TRUE(explanation.isIgnored);
  EXPECT_TRUE(explanation.alert);
  EXPECT_EQ(explanation.newPermissions, RVPermissionSet{"email"});
  EXPECT_EQ(explanation.authorization, std::nullopt);
  EXPECT_THAT(explanation.log, Contains(StartsWith("notice: Will not contact server about this")));
  EXPECT_THAT(explanation.reason, HasSubstr("whatever they answer"));
}

TEST_F(AnExplanation, OfDefaultAccessSaysThatTheServerAloneIsAsked) {
  const auto explanation = explain(optionsFor({"email", "shoe_size"}), {kDefaultAccess});
  EXPECT_EQ(explanation.verdict, Verdict::kWouldAsk);
  EXPECT_FALSE(explanation.alert);
  EXPECT_EQ(explanation.newPermissions, (RVPermissionSet{"email", "shoe_size"}));
  EXPECT_EQ(explanation.authorization,
            (Exchange{"authorize", "111", kClientID, RVPermissionSet{"email", "shoe_size"}, std::nullopt}));
  EXPECT_THAT(explanation.reason, HasSubstr("the server alone"));
}

TEST_F(AnExplanation, OfDefaultAccessWithoutAnAccountIsThatItIsGranted) {
  host.store->removeAccounts();
  const auto explanation = explain(optionsFor({"email"}), {kDefaultAccess});
  EXPECT_EQ(explanation.verdict, Verdict::kGranted);
  EXPECT_THAT(explanation.reason, HasSubstr("without an account"));
  EXPECT_EQ(record(), std::nullopt);
}

TEST_F(AnExplanation, OfDefaultAccessIsARefusalWhereRequestsAreIgnored) {
  ignoreRequests();
  const auto explanation = explain(optionsFor({"email"}), {kDefaultAccess});
  EXPECT_EQ(explanation.verdict, Verdict::kRefused);
  EXPECT_TRUE(explanation.isIgnored);
  EXPECT_EQ(explanation.error, std::nullopt);
  EXPECT_THAT(explanation.reason, HasSubstr("preference"));
}

TEST_F(AnExplanation, HasAStandInForWhatTheServerWouldSayOfUnknownPermissions) {
  const auto explanation = explain(optionsFor({"email", "shoe_size", "ha\"t"}, "friends"));
  EXPECT_EQ(explanation.verdict, Verdict::kWouldAsk);
  EXPECT_FALSE(explanation.alert->isDescribed);
  EXPECT_THAT(explanation.alert->message, HasSubstr("[the server's description of ha\"t, shoe_size]"));
  EXPECT_EQ(
      explanation.description,
      (Exchange{
          "describe", std::nullopt, std::nullopt, RVPermissionSet{"ha\"t", "shoe_size"}, "ALL_FRIENDS"}));
  EXPECT_THAT(host.facebookRequests.descriptions(), IsEmpty());
}

TEST_F(AnExplanation, HasTheServersDescriptionWhereTheServerIsAsked) {
  askTheServer();
  const auto explanation = explain(optionsFor({"shoe_size"}));
  EXPECT_TRUE(explanation.alert->isDescribed);
  EXPECT_THAT(explanation.alert->message, HasSubstr("do something new"));
  const auto asked = host.facebookRequests.descriptions();
  ASSERT_EQ(asked.size(), 1U);
  EXPECT_EQ(asked[0].permissions, RVPermissionSet{"shoe_size"});
  EXPECT_TRUE(asked[0].accessToken == RVSecret("the-real-token"));
}

TEST_F(AnExplanation, DoesNotSignWhatThePluginWouldNotSign) {
  askTheServer();
  host.store->removeAccounts();
  host.store->addAccount("account-without-token");
  explain(optionsFor({"shoe_size"}));
  const auto asked = host.facebookRequests.descriptions();
  ASSERT_EQ(asked.size(), 1U);
  EXPECT_EQ(asked[0].accessToken, std::nullopt);
}

TEST_F(AnExplanation, OfPermissionsThatTheServerDoesNotDescribeIsARefusal) {
  askTheServer();
  host.facebookRequests.replyToDescriptions({fakes::FakeReply::withBody(R"("API_EC_PARAM")")});
  auto explanation = explain(optionsFor({"shoe_size"}));
  EXPECT_EQ(explanation.verdict, Verdict::kRefused);
  EXPECT_EQ(explanation.error, bareError(kRVErrorPermissionDenied));
  EXPECT_THAT(explanation.reason, HasSubstr("the application counts as refused"));

  storeGrant({"email"});
  explanation = explain(optionsFor({"shoe_size"}));
  EXPECT_EQ(explanation.verdict, Verdict::kRefused);
  EXPECT_THAT(explanation.reason, Not(HasSubstr("counts as refused")));
}

TEST_F(AnExplanation, SaysThatTheUsersConsentIsOfNoUseWhereNothingCanBeSent) {
  const RVError error{std::string(kRVTransferErrorDomain), 1, {}};
  cannotSend(error);
  auto explanation = explain(optionsFor({"email"}));
  EXPECT_EQ(explanation.verdict, Verdict::kWouldAsk);
  EXPECT_EQ(explanation.error, error);
  EXPECT_EQ(explanation.newPermissions, RVPermissionSet{"email"});
  EXPECT_EQ(explanation.authorization, std::nullopt);
  EXPECT_THAT(explanation.reason, HasSubstr("nothing is granted"));

  explanation = explain(optionsFor({"email"}), {kDefaultAccess});
  EXPECT_EQ(explanation.verdict, Verdict::kRefused);
  EXPECT_EQ(explanation.error, error);
  EXPECT_THAT(explanation.reason, HasSubstr("the server cannot be asked"));

  explanation = explain(optionsFor({"shoe_size"}));
  EXPECT_EQ(explanation.verdict, Verdict::kRefused);
  EXPECT_EQ(explanation.error, bareError(kRVErrorPermissionDenied));
  EXPECT_EQ(explanation.description, std::nullopt);
}

TEST_F(AnExplanation, ShowsNoTokenToThePlugin) {
  const auto account = host.store->accountsWithAccountTypeIdentifier(RVAccountTypeIdentifierFacebook).at(0);
  RVSecret seen;
  struct Curious final : RVDAccountAccessPlugin {
    std::function<void()> look;
    void handleAccessRequestToAccountsOfType(std::shared_ptr<const RVAccountType>,
                                             std::shared_ptr<const RVDClient>,
                                             const RVDictionary&,
                                             std::shared_ptr<RVDAccountStore>,
                                             bool,
                                             RVDAccessCompletion completion) override {
      look();
      completion(false, std::nullopt);
    }
    void authorizeAccessToAccountsOfType(std::shared_ptr<const RVAccountType>,
                                         std::shared_ptr<const RVDClient>,
                                         std::shared_ptr<RVDAccountStore>,
                                         RVDAccessCompletion) override {}
    void revokeAccessToAccountsOfType(std::shared_ptr<const RVAccountType>,
                                      std::shared_ptr<const RVDClient>,
                                      std::shared_ptr<RVDAccountStore>,
                                      RVDAccessCompletion) override {}
    void revokeAllAccessToAccountsOfType(std::shared_ptr<const RVAccountType>,
                                         std::shared_ptr<RVDAccountStore>,
                                         RVDAccessCompletion) override {}
  };
  const auto maker = [&](const RVDHostServices& services) {
    auto curious = std::make_shared<Curious>();
    curious->look = [&seen, account, keychain = services.keychainManager] {
      seen = keychain->credentialForAccount(*account, std::nullopt)->oauthToken();
      EXPECT_EQ(keychain->credentialForAccount(*account, "org.example.Nobody"), nullptr);
      EXPECT_EQ(keychain->removeCredentialForAccount(*account, "org.example.PhotoApp"), std::nullopt);
    };
    return curious;
  };
  rehearsal::rehearse(stage_, maker, {host.accountType, host.makeClient(), {}});
  EXPECT_FALSE(seen.empty());
  EXPECT_FALSE(seen == RVSecret("master-token"));
  EXPECT_NE(host.keychain.stored("account-1", std::nullopt), nullptr);
}

TEST_F(AnExplanation, PassesOnWhatAHostServiceThrows) {
  struct Broken final : ZQPreferences {
    std::optional<RVValue> ZQPreferencesCopyValue(std::string_view,
                                                  std::string_view,
                                                  ZQPreferencesUser,
                                                  ZQPreferencesHost) override {
      throw std::runtime_error("no disk");
    }
    bool ZQPreferencesAppSynchronize(std::string_view) override { return true; }
    bool booleanValue(const RVValue&) const override { return false; }
  } broken;
  stage_.services.preferences = &broken;
  EXPECT_THROW(explain(optionsFor({"email"})), std::runtime_error);
}

}  // namespace
