// The whole message: which sentence, with which clauses.
#include "tests/unit/plugin_words_fixture.h"

namespace plugin_tests {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

class AConsentMessage : public WordsTest {
 protected:
  AConsentMessage() {
    host.facebookRequests.replyToDescriptions({fakes::FakeReply::withBody(R"("It plays music.")")});
  }
  std::optional<std::string> message(const RVPermissionSet& permissions,
                                     const std::optional<std::string>& audience = std::nullopt) {
    return access.constructUserMessageForPermissions(permissions, audience, "Chess", account);
  }

  const std::string photos =
      "ACCOUNT_ACCESS_EXTENDED_READ[ACCOUNT_ACCESS_EXTENDED_READ_USER[FACEBOOK_READ_PERMISSION_USER_PHOTOS]]";
  const std::string posting = "ACCCOUNT_ACCESS_WRITE[POST_TO_FRIENDS]";
  const std::string pages = "ACCOUNT_ACCESS_MANAGE[FACEBOOK_MANAGE_PERMISSION_MANAGE_PAGES]";
};

TEST_F(AConsentMessage, ForNoPermissionIsTheBasicOne) {
  EXPECT_EQ(message({}), "ACCOUNT_ACCESS_BASIC_MESSAGE[Chess]");
}

TEST_F(AConsentMessage, ForReadingAloneIsTheShortSentence) {
  EXPECT_EQ(message({"user_photos"}), "ACCOUNT_ACCESS_ONE_PERMISSION_SHORT_FORMAT[Chess][" + photos + "]");
}

TEST_F(AConsentMessage, ForBasicReadingIsTheShortSentence) {
  EXPECT_EQ(message({"email"}),
            "ACCOUNT_ACCESS_ONE_PERMISSION_SHORT_FORMAT[Chess][ACCOUNT_ACCESS_EXTENDED_READ["
            "ACCOUNT_ACCESS_EXTENDED_READ_USER_MULTIPLE[" +
                basicProfile + "][" + friendList + "]]]");
}

TEST_F(AConsentMessage, ForPostingAloneIsTheLongSentenceWithOneClause) {
  EXPECT_EQ(message({"publish_stream"}, "friends"),
            "ACCOUNT_ACCESS_ONE_PERMISSION_FORMAT[Chess][" + posting + "]");
}

TEST_F(AConsentMessage, ForManagingAloneIsTheLongSentenceWithOneClause) {
  EXPECT_EQ(message({"manage_pages"}), "ACCOUNT_ACCESS_ONE_PERMISSION_FORMAT[Chess][" + pages + "]");
}

TEST_F(AConsentMessage, ForReadingAndPostingHasTwoClauses) {
  EXPECT_EQ(message({"publish_stream", "user_photos"}, "friends"),
            "ACCOUNT_ACCESS_TWO_PERMISSION_FORMAT[Chess][" + photos + "][" + posting + "]");
}

TEST_F(AConsentMessage, ForReadingAndManagingHasTwoClauses) {
  EXPECT_EQ(message({"manage_pages", "user_photos"}),
            "ACCOUNT_ACCESS_TWO_PERMISSION_FORMAT[Chess][" + photos + "][" + pages + "]");
}

TEST_F(AConsentMessage, ForPostingAndManagingHasTwoClauses) {
  EXPECT_EQ(message({"manage_pages", "publish"}, "friends"),
            "ACCOUNT_ACCESS_TWO_PERMISSION_FORMAT[Chess][" + posting + "][" + pages + "]");
}

TEST_F(AConsentMessage, ForEverythingHasThreeClausesReadingPostingManaging) {
  EXPECT_EQ(message({"manage_pages", "publish_stream", "user_photos"}, "friends"),
            "ACCOUNT_ACCESS_THREE_PERMISSION_FORMAT[Chess][" + photos + "][" + posting + "][" + pages + "]");
}

TEST_F(AConsentMessage, NestsTheWordsInTheClausesAndTheClausesInTheSentence) {
  EXPECT_EQ(message({"email", "publish_stream"}, "friends"),
            "ACCOUNT_ACCESS_TWO_PERMISSION_FORMAT[Chess]"
            "[ACCOUNT_ACCESS_EXTENDED_READ[ACCOUNT_ACCESS_EXTENDED_READ_USER_MULTIPLE"
            "[FACEBOOK_READ_PERMISSION_BASIC_PROFILE][FACEBOOK_READ_PERMISSION_FRIENDS]]]"
            "[ACCCOUNT_ACCESS_WRITE[POST_TO_FRIENDS]]");
}

TEST_F(AConsentMessage, ForReadingAndSomethingUnknownIsTheLongSentenceAndTheDescription) {
  EXPECT_EQ(message({"user_photos", "play_music"}),
            "ACCOUNT_ACCESS_ONE_PERMISSION_FORMAT[Chess][" + photos +
                "] ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT[It plays music.]");
}

TEST_F(AConsentMessage, ForSomethingUnknownAloneIsMadeOfTheDescription) {
  EXPECT_EQ(message({"play_music"}), "ACCOUNT_ACCESS_UNKNOWN_FORMAT[Chess][It plays music.]");
}

TEST_F(AConsentMessage, AsksTheServerOnlyAboutWhatIsInNoList) {
  EXPECT_EQ(message({"email", "publish_stream", "manage_pages", "basic_profile"}, "friends"),
            "ACCOUNT_ACCESS_THREE_PERMISSION_FORMAT[Chess][ACCOUNT_ACCESS_EXTENDED_READ["
            "ACCOUNT_ACCESS_EXTENDED_READ_USER_MULTIPLE[" +
                basicProfile + "][" + friendList + "]]][" + posting + "][" + pages +
                "] ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT[It plays music.]");
  ASSERT_EQ(host.facebookRequests.descriptions().size(), 1U);
  EXPECT_THAT(host.facebookRequests.descriptions()[0].permissions, ElementsAre("basic_profile"));
}

TEST_F(AConsentMessage, KnowsEveryPermissionOfTheFourLists) {
  RVPermissionSet all;
  for (const auto* list : {&access.basicReadPermissions(),
                           &access.extendedReadPermissions(),
                           &access.writePermissions(),
                           &access.managePermissions()})
    all.insert(list->begin(), list->end());
  EXPECT_NE(message(all), std::nullopt);
  EXPECT_THAT(host.facebookRequests.descriptions(), IsEmpty());
}

TEST_F(AConsentMessage, TakesTheJoinedNameOfTwoPermissionsForAnUnknownOne) {
  message({"email", "user_subscriptionsuser_website"});
  ASSERT_EQ(host.facebookRequests.descriptions().size(), 1U);
  EXPECT_THAT(host.facebookRequests.descriptions()[0].permissions,
              ElementsAre("user_subscriptionsuser_website"));
}

TEST_F(AConsentMessage, AsksNothingOfTheServerWhereEverythingIsKnown) {
  message({"email", "publish", "manage_pages"}, "friends");
  EXPECT_THAT(host.facebookRequests.descriptions(), IsEmpty());
}

TEST_F(AConsentMessage, HandsTheAudienceToTheServer) {
  message({"play_music"}, "only_me");
  EXPECT_EQ(host.facebookRequests.descriptions().at(0).audience, "SELF");
}

TEST_F(AConsentMessage, IsAbsentWhereTheServerDoesNotDescribeWhatIsUnknown) {
  host.facebookRequests.replyToDescriptions({fakes::FakeReply::withBody(R"("API_EC_PARAM")")});
  EXPECT_EQ(message({"email", "publish", "play_music"}, "friends"), std::nullopt);
  EXPECT_EQ(message({"play_music"}), std::nullopt);
}

TEST_F(AConsentMessage, LosesTheShortFormWithAManageClauseThatCameToNothing) {
  TableWithGaps table(host.stringTable, {manageName("MANAGE_PAGES")});
  RVDHostServices services = host.services();
  services.stringTable = &table;
  const TKFacebookAccountAccessPlugin other(services);
  const TKFacebookAccountAccessPluginTestAccess otherAccess{other};
  EXPECT_EQ(otherAccess.constructUserMessageForPermissions(
                {"user_photos", "manage_pages"}, std::nullopt, "Chess", account),
            "ACCOUNT_ACCESS_ONE_PERMISSION_FORMAT[Chess][" + photos + "]");
}

TEST_F(AConsentMessage, IsTheBasicOneWhereNoClauseCouldBeMade) {
  TableWithGaps table(host.stringTable, {readName("USER_PHOTOS")});
  RVDHostServices services = host.services();
  services.stringTable = &table;
  const TKFacebookAccountAccessPlugin other(services);
  const TKFacebookAccountAccessPluginTestAccess otherAccess{other};
  EXPECT_EQ(otherAccess.constructUserMessageForPermissions({"user_photos"}, std::nullopt, "Chess", account),
            "ACCOUNT_ACCESS_BASIC_MESSAGE[Chess]");
}

TEST_F(AConsentMessage, DoesNotFillPlaceholdersInTheNameOfTheApplication) {
  EXPECT_EQ(access.constructUserMessageForPermissions({"manage_pages"}, std::nullopt, "%2$@ %@", account),
            "ACCOUNT_ACCESS_ONE_PERMISSION_FORMAT[%2$@ %@][" + pages + "]");
  EXPECT_EQ(access.constructUserMessageForPermissions(
                {"manage_pages", "play_music"}, std::nullopt, "%2$@ %@", account),
            "ACCOUNT_ACCESS_ONE_PERMISSION_FORMAT[%2$@ %@][" + pages +
                "] ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT[It plays music.]");
}

TEST_F(AConsentMessage, MayNameItsArgumentsInAnotherOrder) {
  host.stringTable.put("ACCOUNT_ACCESS_TWO_PERMISSION_FORMAT", "%3$@|%2$@|%1$@");
  EXPECT_EQ(message({"user_photos", "manage_pages"}), pages + "|" + photos + "|Chess");
}

const char* const kOperation = "_constructUserMessageForPermissions:audience:appName:account:";

TEST_F(AConsentMessage, LogsThePermissionsThatItIsFor) {
  message({"publish", "email"});
  EXPECT_THAT(linesOf(host.log),
              ElementsAre(Pair(7, R"(Generating user message for permission: ("email", "publish").)")));
  ASSERT_EQ(host.log.lines().size(), 1U);
  EXPECT_EQ(host.log.lines()[0].format, "Generating user message for permission: %@.");
  expectPlaceOfEveryLine(host.log, kOperation);
}

TEST_F(AConsentMessage, LogsThatSomethingUnknownWasRequested) {
  message({"play_music"});
  EXPECT_THAT(linesOf(host.log),
              ElementsAre(Pair(7, R"(Generating user message for permission: ("play_music").)"),
                          Pair(7, "Unknown permissions were requested!"),
                          Pair(7, R"(Server description for ("play_music") was: It plays music.)")));
}

TEST_F(AConsentMessage, LogsThatThereIsNoneAndMakesNoOther) {
  host.facebookRequests.replyToDescriptions({fakes::FakeReply::withBody(R"("")")});
  EXPECT_EQ(message({"email", "play_music"}), std::nullopt);
  const auto lines = host.log.lines();
  ASSERT_EQ(lines.size(), 4U);
  EXPECT_EQ(lines[3].level, 7);
  EXPECT_EQ(lines[3].text,
            "Something went wrong and we ended up with a nil user message. Falling back to default.");
  EXPECT_EQ(lines[3].functionName, std::string("-[TKFacebookAccountAccessPlugin ") + kOperation + "]");
  EXPECT_EQ(lines[1].functionName, lines[3].functionName);
}

TEST_F(AConsentMessage, IsAskedForInTheOrderOfItsClauses) {
  message({"email", "publish", "manage_pages"}, "friends");
  EXPECT_THAT(lookedUp(),
              ElementsAre(basicProfile,
                          friendList,
                          "ACCOUNT_ACCESS_EXTENDED_READ_USER_MULTIPLE",
                          basicProfile,
                          friendList,
                          "WORD_LIST_SEPARATOR",
                          "ACCOUNT_ACCESS_EXTENDED_READ",
                          "POST_TO_FRIENDS",
                          "ACCCOUNT_ACCESS_WRITE",
                          manageName("MANAGE_PAGES"),
                          "ACCOUNT_ACCESS_MANAGE",
                          "ACCOUNT_ACCESS_THREE_PERMISSION_FORMAT"));
}

TEST_F(AConsentMessage, PassesOnWhatTheTableThrowsAtAnyCall) {
  const RVPermissionSet permissions = {"email", "friends_photos", "publish", "manage_pages", "play_music"};
  ASSERT_NE(message(permissions, "friends"), std::nullopt);
  const auto calls = host.journal->calls();
  ASSERT_GT(calls.size(), 20U);
  for (std::size_t failing = 0; failing < calls.size(); ++failing) {
    if (!calls[failing].starts_with("stringTable.")) continue;
    host.journal->clear();
    host.journal->setBeforeCall([&](std::size_t index, const std::string& call) {
      if (index == failing) throw std::runtime_error(call);
    });
    EXPECT_THROW(message(permissions, "friends"), std::runtime_error) << failing;
  }
}

}  // namespace
}  // namespace plugin_tests
