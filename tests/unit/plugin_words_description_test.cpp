// What the server says about permissions that the plug-in does not know.
#include <future>
#include <stdexcept>
#include <thread>

#include "tests/unit/plugin_words_fixture.h"

namespace plugin_tests {
namespace {

using fakes::FakeReply;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

// A host that answers and then keeps the handler for as long as it lives.
class KeptHandler final : public TKFacebookRequestFactory {
 public:
  ~KeptHandler() { thread_.join(); }
  std::shared_ptr<TKFacebookAuthorizationRequest> initWithAppId(const std::string&,
                                                                const std::string&,
                                                                const std::optional<RVPermissionSet>&,
                                                                const std::optional<std::string>&) override {
    return nullptr;
  }
  std::shared_ptr<TKFacebookPermissionDescriptionRequest> initWithPermissions(
      const RVPermissionSet&,
      const std::optional<std::string>&) override {
    return std::make_shared<Request>(*this);
  }
  std::shared_ptr<TKFacebookSession> initSession() override { return nullptr; }

 private:
  class Request final : public TKFacebookPermissionDescriptionRequest {
   public:
    explicit Request(KeptHandler& owner)
        : owner_(owner) {}
    void setAccessToken(std::optional<RVSecret>) override {}
    void performRequestWithHandler(TKFacebookRequestHandler handler) override {
      owner_.handler_ = std::move(handler);
      owner_.thread_ = std::thread(
          [&owner = owner_] { owner.handler_(R"("It plays music.")", TKHTTPResponse{200}, std::nullopt); });
    }

   private:
    KeptHandler& owner_;
  };

  TKFacebookRequestHandler handler_;
  std::thread thread_;
};

class ADescription : public WordsTest {
 protected:
  std::optional<std::string> fetch(const std::optional<std::string>& audience = std::nullopt) {
    return access.fetchDescriptionForUnknownPermissions({"play_music", "read_mind"}, audience, account);
  }
  std::optional<std::string> fetchWith(FakeReply reply) {
    host.facebookRequests.replyToDescriptions({std::move(reply)});
    return fetch();
  }
  std::optional<std::string> fetchBody(const std::string& body) {
    return fetchWith(FakeReply::withBody(body));
  }
};

TEST_F(ADescription, IsTheStringThatTheServerAnswers) {
  EXPECT_EQ(fetchBody(R"("It plays music.")"), "It plays music.");
}

TEST_F(ADescription, IsAskedForWithThePermissionsAndTheServersWordForTheAudience) {
  const std::vector<std::pair<std::optional<std::string>, std::optional<std::string>>> words = {
      {"everyone", "EVERYONE"},
      {"friends", "ALL_FRIENDS"},
      {"only_me", "SELF"},
      {"acquaintances", std::nullopt},
      {"", std::nullopt},
      {std::nullopt, std::nullopt},
  };
  for (const auto& [audience, word] : words) {
    fetch(audience);
    const auto exchange = host.facebookRequests.descriptions().back();
    EXPECT_THAT(exchange.permissions, ElementsAre("play_music", "read_mind"));
    EXPECT_EQ(exchange.audience, word);
    EXPECT_TRUE(exchange.performed);
  }
}

TEST_F(ADescription, IsAskedForWithTheAccountsOwnToken) {
  host.keychain.putCredential("account-1", "org.example.PhotoApp", "client-token");
  fetch();
  const auto exchange = host.facebookRequests.descriptions().at(0);
  ASSERT_TRUE(exchange.accessToken);
  EXPECT_EQ(exchange.accessToken->reveal(), "master-token");
}

TEST_F(ADescription, IsAskedForWithoutATokenWhereTheAccountHasNone) {
  host.keychain.setMasterToken("account-1", std::nullopt);
  EXPECT_NE(fetch(), std::nullopt);
  const auto exchange = host.facebookRequests.descriptions().at(0);
  EXPECT_TRUE(exchange.tokenWasSet);
  EXPECT_EQ(exchange.accessToken, std::nullopt);
  EXPECT_TRUE(exchange.performed);
}

TEST_F(ADescription, IsAskedForInThisOrder) {
  fetch();
  EXPECT_THAT(host.journal->calls(),
              ElementsAre("facebookRequests.initWithPermissions",
                          "keychain.credentialForAccount",
                          "facebookRequests.description.setAccessToken",
                          "facebookRequests.description.performRequestWithHandler",
                          "jsonReader.objectWithData",
                          "log.RVLog"));
}

TEST_F(ADescription, IsLoggedWithThePermissionsThatItIsOf) {
  fetchBody(R"("It plays music.")");
  EXPECT_THAT(
      linesOf(host.log),
      ElementsAre(Pair(7, R"(Server description for ("play_music", "read_mind") was: It plays music.)")));
  EXPECT_EQ(host.log.lines()[0].format, "Server description for %@ was: %@");
  expectPlaceOfEveryLine(host.log, "_fetchDescriptionForUnknownPermissions:audience:account:");
}

TEST_F(ADescription, IsAbsentAfterATransportError) {
  EXPECT_EQ(fetchWith(FakeReply::withError(describedError(28, "timed out"))), std::nullopt);
  EXPECT_THAT(linesOf(host.log),
              ElementsAre(Pair(3, "Error contacting Facebook server for permission description: timed out")));
  EXPECT_EQ(host.log.lines()[0].format, "Error contacting Facebook server for permission description: %@");
  expectPlaceOfEveryLine(host.log, "_fetchDescriptionForUnknownPermissions:audience:account:");
}

TEST_F(ADescription, IsAbsentAfterAnErrorWithoutAText) {
  EXPECT_EQ(fetchWith(FakeReply::withError(bareError(28))), std::nullopt);
  EXPECT_THAT(linesOf(host.log),
              ElementsAre(Pair(3, "Error contacting Facebook server for permission description: (null)")));
}

TEST_F(ADescription, IsAbsentAfterAnErrorThatCameWithABody) {
  FakeReply reply = FakeReply::withBody(R"("It plays music.")");
  reply.error = describedError(56, "cut off");
  EXPECT_EQ(fetchWith(reply), std::nullopt);
  EXPECT_THAT(linesOf(host.log),
              ElementsAre(Pair(3, "Error contacting Facebook server for permission description: cut off")));
}

TEST_F(ADescription, IsAbsentWhereNothingCame) {
  EXPECT_EQ(fetchWith(FakeReply::withoutAnything()), std::nullopt);
  EXPECT_THAT(linesOf(host.log),
              ElementsAre(Pair(3, "Error contacting Facebook server for permission description: (null)")));
}

TEST_F(ADescription, IsAbsentWhereTheBodyIsNoDocument) {
  host.jsonReader.readEverythingAs(
      RVJSONResult{std::nullopt, RVError{std::string(kRVJSONErrorDomain), 1, {{"description", "no value"}}}});
  EXPECT_EQ(fetchBody("It plays music."), std::nullopt);
  EXPECT_THAT(linesOf(host.log), ElementsAre(Pair(3, "Could not parse server response: no value.")));
  EXPECT_EQ(host.log.lines()[0].format, "Could not parse server response: %@.");
  expectPlaceOfEveryLine(host.log, "_fetchDescriptionForUnknownPermissions:audience:account:");
}

TEST_F(ADescription, IsAbsentWhereTheReaderReportsAnErrorBesideAString) {
  host.jsonReader.readEverythingAs(RVJSONResult{
      RVValue("It plays"), RVError{std::string(kRVJSONErrorDomain), 1, {{"description", "cut off"}}}});
  EXPECT_EQ(fetchBody("x"), std::nullopt);
  EXPECT_THAT(linesOf(host.log), ElementsAre(Pair(3, "Could not parse server response: cut off.")));
}

TEST_F(ADescription, IsAbsentWhereTheReaderGivesNothingAtAll) {
  host.jsonReader.readEverythingAs(RVJSONResult{});
  EXPECT_EQ(fetchBody("x"), std::nullopt);
  EXPECT_THAT(linesOf(host.log), ElementsAre(Pair(3, "Could not parse server response: (null).")));
}

TEST_F(ADescription, IsAbsentWhereTheDocumentIsNoString) {
  for (const char* body :
       {"{}", R"({"description":"It plays music."})", R"(["It plays music."])", "1", "true", "null"}) {
    host.log.clear();
    EXPECT_EQ(fetchBody(body), std::nullopt) << body;
    EXPECT_THAT(linesOf(host.log), ElementsAre(Pair(3, "Could not parse server response: (null).")));
  }
}

TEST_F(ADescription, IsAbsentAndLoggedWhereTheBodyIsBroken) {
  EXPECT_EQ(fetchBody(R"("It plays)"), std::nullopt);
  ASSERT_EQ(host.log.lines().size(), 1U);
  EXPECT_EQ(host.log.lines()[0].level, 3);
}

TEST_F(ADescription, IsAbsentWhereTheServerDoesNotKnowThePermissions) {
  EXPECT_EQ(fetchBody(R"("API_EC_PARAM")"), std::nullopt);
  EXPECT_THAT(
      linesOf(host.log),
      ElementsAre(Pair(7, R"(Server description for ("play_music", "read_mind") was: API_EC_PARAM)")));
}

TEST_F(ADescription, IsWhatOnlyResemblesTheServersErrorCode) {
  EXPECT_EQ(fetchBody(R"("api_ec_param")"), "api_ec_param");
  EXPECT_EQ(fetchBody(R"("API_EC_PARAM ")"), "API_EC_PARAM ");
}

TEST_F(ADescription, MayBeEmpty) {
  EXPECT_EQ(fetchBody(R"("")"), "");
  EXPECT_THAT(linesOf(host.log),
              ElementsAre(Pair(7, R"(Server description for ("play_music", "read_mind") was: )")));
}

TEST_F(ADescription, DoesNotDependOnTheStatusCode) {
  EXPECT_EQ(fetchWith(FakeReply::withBody(R"("It plays music.")", 500)), "It plays music.");
  FakeReply withoutResponse = FakeReply::withBody(R"("It plays music.")");
  withoutResponse.response = std::nullopt;
  EXPECT_EQ(fetchWith(withoutResponse), "It plays music.");
}

TEST_F(ADescription, IsAskedForAnewEachTime) {
  host.facebookRequests.replyToDescriptions(
      {FakeReply::withBody(R"("one")"), FakeReply::withBody(R"("two")")});
  EXPECT_EQ(fetch(), "one");
  EXPECT_EQ(fetch(), "two");
  EXPECT_EQ(host.facebookRequests.descriptions().size(), 2U);
}

TEST_F(ADescription, IsWaitedForUntilTheAnswerComes) {
  host.facebookRequests.replyToDescriptions({FakeReply::withBody(R"("late")").held()});
  auto answer = std::async(std::launch::async, [this] { return fetch(); });
  ASSERT_TRUE(host.facebookRequests.waitForHeld(1));
  EXPECT_EQ(answer.wait_for(std::chrono::seconds(0)), std::future_status::timeout);
  host.facebookRequests.releaseHeld();
  EXPECT_EQ(answer.get(), "late");
}

TEST_F(ADescription, IsThereWhenTheHandlerHasRunThoughTheHostKeepsIt) {
  KeptHandler requests;
  RVDHostServices services = host.services();
  services.facebookRequests = &requests;
  const TKFacebookAccountAccessPlugin other(services);
  EXPECT_EQ(TKFacebookAccountAccessPluginTestAccess{other}.fetchDescriptionForUnknownPermissions(
                {"play_music"}, std::nullopt, account),
            "It plays music.");
}

TEST_F(ADescription, OfEachOfTwoCallersIsItsOwn) {
  host.facebookRequests.replyToDescriptions(
      {FakeReply::withBody(R"("one")").held(), FakeReply::withBody(R"("two")").held()});
  auto first = std::async(std::launch::async, [this] { return fetch(); });
  ASSERT_TRUE(host.facebookRequests.waitForHeld(1));
  auto second = std::async(std::launch::async, [this] { return fetch(); });
  ASSERT_TRUE(host.facebookRequests.waitForHeld(2));
  host.facebookRequests.releaseHeld();
  EXPECT_EQ(first.get(), "one");
  EXPECT_EQ(second.get(), "two");
}

TEST_F(ADescription, IsAbsentWhereTheHostDropsTheHandler) {
  EXPECT_EQ(fetchWith(FakeReply::dropped()), std::nullopt);
  EXPECT_THAT(host.log.lines(), IsEmpty());
}

TEST_F(ADescription, IsAbsentWhereTheHandlerIsDroppedWhileItIsWaitedFor) {
  host.facebookRequests.replyToDescriptions({FakeReply::withBody(R"("late")").held()});
  auto answer = std::async(std::launch::async, [this] { return fetch(); });
  ASSERT_TRUE(host.facebookRequests.waitForHeld(1));
  host.facebookRequests.dropHeld();
  EXPECT_EQ(answer.get(), std::nullopt);
}

TEST_F(ADescription, IsAbsentWhereTheReaderThrows) {
  host.jsonReader.setBeforeCall([](std::string_view) { throw std::runtime_error("out of memory"); });
  EXPECT_EQ(fetch(), std::nullopt);
  host.facebookRequests.waitUntilDelivered();
  EXPECT_EQ(host.facebookRequests.handlerExceptions(), 1U);
}

TEST_F(ADescription, PassesOnThatTheExchangeCouldNotBeStarted) {
  EXPECT_THROW(fetchWith(FakeReply::thrown()), std::runtime_error);
}

TEST_F(ADescription, PassesOnWhatTheHostThrowsBeforeTheExchange) {
  for (const std::string failing : {"facebookRequests.initWithPermissions",
                                    "keychain.credentialForAccount",
                                    "facebookRequests.description.setAccessToken"}) {
    host.journal->setBeforeCall([&](std::size_t, const std::string& call) {
      if (call == failing) throw std::runtime_error(call);
    });
    EXPECT_THROW(fetch(), std::runtime_error) << failing;
  }
  for (const auto& exchange : host.facebookRequests.descriptions()) EXPECT_FALSE(exchange.performed);
}

class AMessageWithADescription : public WordsTest {
 protected:
  std::optional<std::string> append(const std::optional<std::string>& message, const std::string& body) {
    host.facebookRequests.replyToDescriptions({FakeReply::withBody(body)});
    return access.appendDescriptionOfUnknownPermissions({"play_music"}, message, "Chess", "friends", account);
  }
};

TEST_F(AMessageWithADescription, IsTheMessageOneBlankAndASentenceOfTheDescription) {
  EXPECT_EQ(append("It reads.", R"("It plays.")"),
            "It reads. ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT[It plays.]");
  EXPECT_EQ(append("", R"("It plays.")"), " ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT[It plays.]");
}

TEST_F(AMessageWithADescription, IsASentenceOfApplicationAndDescriptionWhereThereWasNone) {
  EXPECT_EQ(append(std::nullopt, R"("It plays.")"), "ACCOUNT_ACCESS_UNKNOWN_FORMAT[Chess][It plays.]");
}

TEST_F(AMessageWithADescription, IsAbsentWithoutADescriptionWhateverWasKnown) {
  EXPECT_EQ(append("It reads.", R"("API_EC_PARAM")"), std::nullopt);
  EXPECT_EQ(append(std::nullopt, R"("API_EC_PARAM")"), std::nullopt);
  EXPECT_EQ(append("It reads.", "{}"), std::nullopt);
}

TEST_F(AMessageWithADescription, IsAbsentWithAnEmptyDescription) {
  EXPECT_EQ(append("It reads.", R"("")"), std::nullopt);
  EXPECT_EQ(append(std::nullopt, R"("")"), std::nullopt);
}

TEST_F(AMessageWithADescription, FillsNoPlaceholdersOfTheMessageOrTheDescription) {
  EXPECT_EQ(append("100 %@ %1$@", R"("%@ %d")"),
            "100 %@ %1$@ ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT[%@ %d]");
}

TEST_F(AMessageWithADescription, AsksForTheDescriptionWithWhatItWasGiven) {
  append("It reads.", R"("It plays.")");
  const auto exchange = host.facebookRequests.descriptions().at(0);
  EXPECT_THAT(exchange.permissions, ElementsAre("play_music"));
  EXPECT_EQ(exchange.audience, "ALL_FRIENDS");
}

}  // namespace
}  // namespace plugin_tests
