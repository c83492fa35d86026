// The alert: what it shows, how its end is read, and that it is always freed.
#include <future>
#include <limits>
#include <stdexcept>
#include <thread>

#include "tests/unit/plugin_words_fixture.h"

namespace plugin_tests {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

struct PromptAnswer {
  bool allowed = false;
  bool skipServer = false;
  std::optional<RVPermissionSet> permissions;
  std::thread::id thread;
};

class APrompt : public WordsTest {
 protected:
  void prompt(const RVPermissionSet& permissions, const std::optional<std::string>& audience = std::nullopt) {
    access.promptUserToApproveRequestForPermissions(
        permissions,
        audience,
        client,
        account,
        [this](bool allowed, bool skipServer, const std::optional<RVPermissionSet>& answered) {
          answers.push_back({allowed, skipServer, answered, std::this_thread::get_id()});
        });
  }
  // Whether an alert that ends like this is an approval.
  bool isAllowedAfter(ZQResponseFlags flags) {
    host.userNotifications.answerWith({flags});
    answers.clear();
    prompt({"email"});
    EXPECT_EQ(answers.size(), 1U);
    EXPECT_EQ(host.userNotifications.unreleasedAlerts(), 0U);
    return answers.at(0).allowed;
  }

  const std::shared_ptr<fakes::FakeClient> client = host.makeClient();
  std::vector<PromptAnswer> answers;
};

TEST_F(APrompt, ThatIsAllowedAnswersWithThePermissionsThatItWasAbout) {
  prompt({"email", "manage_pages"});
  ASSERT_EQ(answers.size(), 1U);
  EXPECT_TRUE(answers[0].allowed);
  EXPECT_FALSE(answers[0].skipServer);
  EXPECT_EQ(answers[0].permissions, (RVPermissionSet{"email", "manage_pages"}));
}

TEST_F(APrompt, ThatIsRefusedAnswersWithThePermissionsThatItWasAbout) {
  host.userNotifications.answerWith({1});
  prompt({"email", "manage_pages"});
  ASSERT_EQ(answers.size(), 1U);
  EXPECT_FALSE(answers[0].allowed);
  EXPECT_FALSE(answers[0].skipServer);
  EXPECT_EQ(answers[0].permissions, (RVPermissionSet{"email", "manage_pages"}));
}

TEST_F(APrompt, IsAllowedByTheValueZeroAlone) {
  EXPECT_TRUE(isAllowedAfter(0));
  for (const ZQResponseFlags flags : {1UL, 2UL, 3UL, 4UL, 8UL, 1UL << 31, 1UL << 32, 1UL << 63})
    EXPECT_FALSE(isAllowedAfter(flags)) << flags;
  EXPECT_FALSE(isAllowedAfter(std::numeric_limits<ZQResponseFlags>::max()));
}

TEST_F(APrompt, IsARefusalWhereTheDeviceWasLocked) {
  EXPECT_FALSE(isAllowedAfter(2));
}

TEST_F(APrompt, IsARefusalWhereNoAlertCanBeCreated) {
  host.userNotifications.failToCreate();
  prompt({"email"});
  ASSERT_EQ(answers.size(), 1U);
  EXPECT_FALSE(answers[0].allowed);
  EXPECT_EQ(answers[0].permissions, RVPermissionSet{"email"});
  EXPECT_EQ(host.journal->count("userNotifications.ZQUserNotificationReceiveResponse"), 1U);
  EXPECT_EQ(host.journal->count("userNotifications.ZQRelease"), 0U);
}

TEST_F(APrompt, IsARefusalWhereWaitingForTheAnswerFails) {
  host.userNotifications.failToReceive();
  prompt({"email"});
  ASSERT_EQ(answers.size(), 1U);
  EXPECT_FALSE(answers[0].allowed);
  EXPECT_EQ(host.userNotifications.unreleasedAlerts(), 0U);
}

TEST_F(APrompt, AnswersOnTheThreadThatAskedBeforeItReturns) {
  prompt({"email"});
  ASSERT_EQ(answers.size(), 1U);
  EXPECT_EQ(answers[0].thread, std::this_thread::get_id());
}

TEST_F(APrompt, ShowsTheMessageForTheClientsName) {
  prompt({"publish"}, "only_me");
  EXPECT_EQ(
      *RVValueForKey(host.userNotifications.alerts().at(0).description, "message"),
      RVValue("ACCOUNT_ACCESS_ONE_PERMISSION_FORMAT[Photo App][ACCCOUNT_ACCESS_WRITE[POST_PRIVATELY]]"));
}

TEST_F(APrompt, AsksTheClientForItsNameFirst) {
  prompt({"email"});
  EXPECT_EQ(host.journal->calls().at(0), "client.localizedAppName");
}

TEST_F(APrompt, WithoutAMessageShowsNoAlertAndIsRefused) {
  host.facebookRequests.replyToDescriptions({fakes::FakeReply::withBody(R"("API_EC_PARAM")")});
  prompt({"email", "play_music"});
  ASSERT_EQ(answers.size(), 1U);
  EXPECT_FALSE(answers[0].allowed);
  EXPECT_FALSE(answers[0].skipServer);
  EXPECT_EQ(answers[0].permissions, std::nullopt);
  EXPECT_THAT(host.userNotifications.alerts(), IsEmpty());
}

TEST_F(APrompt, WithoutAMessageIsLogged) {
  host.facebookRequests.replyToDescriptions({fakes::FakeReply::dropped()});
  prompt({"play_music"});
  const auto line = host.log.lines().back();
  EXPECT_EQ(line.level, 3);
  EXPECT_EQ(line.text, "Something really bad happened and we ended up with an invalid message");
  EXPECT_EQ(line.functionName,
            "-[TKFacebookAccountAccessPlugin "
            "_promptUserToApproveRequestForPermissions:withAudience:fromClient:account:completion:]");
  EXPECT_EQ(line.facility, kRVLogFacilityDaemon);
}

TEST_F(APrompt, LogsNothingOfARefusal) {
  host.userNotifications.answerWith({1});
  prompt({"email"});
  EXPECT_THAT(linesOf(host.log),
              ElementsAre(Pair(7, R"(Generating user message for permission: ("email").)")));
}

TEST_F(APrompt, DoesNotWaitForAnotherOne) {
  host.userNotifications.holdAlerts();
  const auto ask = [this] {
    access.promptUserToApproveRequestForPermissions(
        {"email"}, std::nullopt, host.makeClient(), std::make_shared<fakes::FakeAccount>(), [](auto&&...) {});
  };
  auto first = std::async(std::launch::async, ask);
  auto second = std::async(std::launch::async, ask);
  EXPECT_TRUE(host.userNotifications.waitForShown(2));
  host.userNotifications.answer(0);
  first.get();
  second.get();
}

TEST_F(APrompt, PassesOnWhatAServiceThrowsAndAnswersNothing) {
  for (const std::string failing : {"client.localizedAppName",
                                    "stringTable.textForKey",
                                    "userNotifications.ZQUserNotificationCreate",
                                    "userNotifications.ZQUserNotificationReceiveResponse"}) {
    host.journal->setBeforeCall([&](std::size_t, const std::string& call) {
      if (call == failing) throw std::runtime_error(call);
    });
    EXPECT_THROW(prompt({"email"}), std::runtime_error) << failing;
  }
  EXPECT_THAT(answers, IsEmpty());
  EXPECT_EQ(host.userNotifications.unreleasedAlerts(), 0U);
}

class AnAlert : public WordsTest {
 protected:
  void show() {
    access.showAlertWithMessage("The message.", [this](bool allowed) { answers.push_back(allowed); });
  }
  RVDictionary shown() const { return host.userNotifications.alerts().at(0).description; }

  std::vector<bool> answers;
};

TEST_F(AnAlert, HasATitleTwoButtonsAndThreeTraits) {
  host.stringTable.put("ACCOUNT_ACCESS_REQUEST_TITLE", "Title");
  host.stringTable.put("ACCOUNT_ACCESS_ALLOW_BUTTON_TITLE", "Yes");
  host.stringTable.put("ACCOUNT_ACCESS_DO_NOT_ALLOW_BUTTON_TITLE", "No");
  show();
  EXPECT_EQ(shown(),
            (RVDictionary{{"header", "Title"},
                          {"message", "The message."},
                          {"alternate_button_title", "No"},
                          {"default_button_title", "Yes"},
                          {"top_most", true},
                          {"dismiss_on_lock", true},
                          {"dont_dismiss_on_unlock", true}}));
}

TEST_F(AnAlert, ShowsKeysWhereTheTableLacksItsTexts) {
  show();
  EXPECT_EQ(*RVValueForKey(shown(), "header"), RVValue("ACCOUNT_ACCESS_REQUEST_TITLE"));
  EXPECT_EQ(*RVValueForKey(shown(), "default_button_title"), RVValue("ACCOUNT_ACCESS_ALLOW_BUTTON_TITLE"));
  EXPECT_EQ(*RVValueForKey(shown(), "alternate_button_title"),
            RVValue("ACCOUNT_ACCESS_DO_NOT_ALLOW_BUTTON_TITLE"));
  EXPECT_THAT(answers, ElementsAre(true));
}

TEST_F(AnAlert, ShowsKeysWhereThereIsNoTable) {
  host.stringTable.setUnavailable();
  show();
  EXPECT_EQ(shown().size(), 7U);
  EXPECT_EQ(*RVValueForKey(shown(), "header"), RVValue("ACCOUNT_ACCESS_REQUEST_TITLE"));
}

TEST_F(AnAlert, LooksItsTextsUpAnewEachTime) {
  show();
  host.stringTable.put("ACCOUNT_ACCESS_REQUEST_TITLE", "Title");
  show();
  EXPECT_EQ(*RVValueForKey(host.userNotifications.alerts().at(1).description, "header"), RVValue("Title"));
  EXPECT_THAT(lookedUp(),
              ElementsAre("ACCOUNT_ACCESS_REQUEST_TITLE",
                          "ACCOUNT_ACCESS_ALLOW_BUTTON_TITLE",
                          "ACCOUNT_ACCESS_DO_NOT_ALLOW_BUTTON_TITLE",
                          "ACCOUNT_ACCESS_REQUEST_TITLE",
                          "ACCOUNT_ACCESS_ALLOW_BUTTON_TITLE",
                          "ACCOUNT_ACCESS_DO_NOT_ALLOW_BUTTON_TITLE"));
}

TEST_F(AnAlert, IsAllowedByTheDefaultButtonAlone) {
  host.userNotifications.answerWith({0, 1, 2});
  show();
  show();
  show();
  EXPECT_THAT(answers, ElementsAre(true, false, false));
}

TEST_F(AnAlert, TakesTitlesThatHoldPercentSignsAsTheyAre) {
  host.stringTable.put("ACCOUNT_ACCESS_REQUEST_TITLE", "100 %@ %%");
  show();
  EXPECT_EQ(*RVValueForKey(shown(), "header"), RVValue("100 %@ %%"));
}

class ANotification : public WordsTest {
 protected:
  using Block = std::function<void(ZQUserNotificationRef, ZQResponseFlags)>;
  void show(const Block& block) { access.showUserNotificationWithTitle("T", "M", "D", "A", block); }
  void throwFrom(const std::string& method) {
    host.userNotifications.setBeforeCall([method](std::string_view called) {
      if (called == method) throw std::runtime_error(method);
    });
  }
};

TEST_F(ANotification, NeverExpiresAndHasNoOptions) {
  show([](auto&&...) {});
  const auto alert = host.userNotifications.alerts().at(0);
  EXPECT_TRUE(alert.defaultAllocator);
  EXPECT_EQ(alert.timeout, 0.0);
  EXPECT_EQ(alert.flags, 0U);
  EXPECT_FALSE(alert.errorWanted);
  EXPECT_EQ(alert.receiveTimeout, 0.0);
}

TEST_F(ANotification, ShowsEachTextInItsPlace) {
  show([](auto&&...) {});
  const auto description = host.userNotifications.alerts().at(0).description;
  EXPECT_EQ(*RVValueForKey(description, "header"), RVValue("T"));
  EXPECT_EQ(*RVValueForKey(description, "message"), RVValue("M"));
  EXPECT_EQ(*RVValueForKey(description, "default_button_title"), RVValue("D"));
  EXPECT_EQ(*RVValueForKey(description, "alternate_button_title"), RVValue("A"));
}

TEST_F(ANotification, HandsOnTheResponseWhole) {
  host.userNotifications.answerWith({0xF00000000000000CUL});
  ZQResponseFlags response = 0;
  show([&](ZQUserNotificationRef, ZQResponseFlags flags) { response = flags; });
  EXPECT_EQ(response, 0xF00000000000000CUL);
}

TEST_F(ANotification, IsAliveWhileItsAnswerIsHandedOn) {
  bool alive = false;
  show([&](ZQUserNotificationRef notification, ZQResponseFlags) {
    alive = notification != nullptr && !host.userNotifications.alerts().at(0).released;
  });
  EXPECT_TRUE(alive);
  EXPECT_TRUE(host.userNotifications.alerts().at(0).released);
  EXPECT_THAT(host.journal->calls(),
              ElementsAre("userNotifications.ZQUserNotificationCreate",
                          "userNotifications.ZQUserNotificationReceiveResponse",
                          "userNotifications.ZQRelease"));
}

TEST_F(ANotification, ThatCouldNotBeCreatedIsNullAndNoApproval) {
  host.userNotifications.failToCreate();
  int calls = 0;
  show([&](ZQUserNotificationRef notification, ZQResponseFlags flags) {
    ++calls;
    EXPECT_EQ(notification, nullptr);
    EXPECT_NE(flags, 0U);
  });
  EXPECT_EQ(calls, 1);
}

TEST_F(ANotification, IsFreedWhereWaitingThrows) {
  throwFrom("ZQUserNotificationReceiveResponse");
  int calls = 0;
  EXPECT_THROW(show([&](auto&&...) { ++calls; }), std::runtime_error);
  EXPECT_EQ(calls, 0);
  EXPECT_EQ(host.userNotifications.unreleasedAlerts(), 0U);
}

TEST_F(ANotification, IsFreedWhereTheCompletionThrows) {
  EXPECT_THROW(show([](auto&&...) { throw std::logic_error("completion"); }), std::logic_error);
  EXPECT_EQ(host.userNotifications.unreleasedAlerts(), 0U);
}

TEST_F(ANotification, PassesOnThatItCouldNotBeFreedAfterItsAnswer) {
  throwFrom("ZQRelease");
  int calls = 0;
  EXPECT_THROW(show([&](auto&&...) { ++calls; }), std::runtime_error);
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(host.journal->count("userNotifications.ZQRelease"), 1U);
}

TEST_F(ANotification, PassesOnTheFirstOfTwoFailures) {
  throwFrom("ZQRelease");
  EXPECT_THROW(show([](auto&&...) { throw std::logic_error("completion"); }), std::logic_error);
  EXPECT_EQ(host.journal->count("userNotifications.ZQRelease"), 1U);
}

}  // namespace
}  // namespace plugin_tests
