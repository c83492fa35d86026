// What the user reads, in English: whole sentences, word for word.
#include "tests/support/Sentences.h"
#include "tests/unit/plugin_words_fixture.h"

namespace plugin_tests {
namespace {

using support::ConsentRequest;
using testing::HasSubstr;
using testing::Not;

class TheEnglishAlert : public testing::Test {
 protected:
  std::string message(const RVPermissionSet& permissions,
                      const std::optional<std::string>& audience = std::nullopt) {
    const auto alert = maker.alertFor({permissions, audience});
    return alert ? alert->message : "(no alert)";
  }

  support::SentenceMaker maker;
};

// What holds for every sentence, whatever it says. Raw keys and permissions' names have underscores.
void expectFinished(const std::string& message, const ConsentRequest& request) {
  std::string context;
  for (const std::string& permission : request.permissions) context += permission + " ";
  SCOPED_TRACE(context + request.audience.value_or("") + ": " + message);
  EXPECT_TRUE(message.ends_with(".") || message.ends_with(".”"));
  EXPECT_TRUE(message.starts_with("If you allow this, “Photo App” will be able to "));
  for (const char* leftover :
       {"_", "  ", "%", "(null)", "$@", " ,", " .", "..", ",,", "your your", "and and"})
    EXPECT_THAT(message, Not(HasSubstr(leftover)));
}

TEST_F(TheEnglishAlert, AsksAQuestionThatItsButtonsAnswer) {
  const auto alert = maker.alertFor({{"email"}, std::nullopt});
  ASSERT_TRUE(alert);
  EXPECT_EQ(alert->title, "Allow access to your Facebook account?");
  EXPECT_EQ(alert->allowButton, "Allow");
  EXPECT_EQ(alert->doNotAllowButton, "Don’t Allow");
}

TEST_F(TheEnglishAlert, ForNothingInParticular) {
  EXPECT_EQ(
      message({}),
      "If you allow this, “Photo App” will be able to use your Facebook account to identify you and to see "
      "your public profile.");
}

TEST_F(TheEnglishAlert, ForTheBasicProfile) {
  EXPECT_EQ(
      message({"email"}),
      "If you allow this, “Photo App” will be able to use your Facebook account to see your basic profile "
      "details (such as your name, birthday, location and email address) and friend list.");
}

TEST_F(TheEnglishAlert, ForTheBasicProfileAndMore) {
  EXPECT_EQ(
      message({"email", "user_photos", "user_events"}),
      "If you allow this, “Photo App” will be able to use your Facebook account to see your basic profile "
      "details (such as your name, birthday, location and email address), friend list, events and photos.");
}

TEST_F(TheEnglishAlert, ForOneThing) {
  EXPECT_EQ(message({"user_photos"}),
            "If you allow this, “Photo App” will be able to use your Facebook account to see your photos.");
}

TEST_F(TheEnglishAlert, ForSeveralThings) {
  EXPECT_EQ(
      message({"user_photos", "read_mailbox", "user_religion_politics"}),
      "If you allow this, “Photo App” will be able to use your Facebook account to see your photos, private "
      "messages and religious or political views.");
}

TEST_F(TheEnglishAlert, ForThingsOfFriends) {
  EXPECT_EQ(message({"friends_birthday", "friends_photos"}),
            "If you allow this, “Photo App” will be able to use your Facebook account to see your friends’ "
            "birthdays and photos.");
}

TEST_F(TheEnglishAlert, ForThingsOfTheUserAndOfFriends) {
  EXPECT_EQ(message({"user_photos", "user_videos", "friends_photos", "friends_videos"}),
            "If you allow this, “Photo App” will be able to use your Facebook account to see your photos and "
            "videos, as well as your friends’ photos and videos.");
}

TEST_F(TheEnglishAlert, ForPosting) {
  const std::string begin = "If you allow this, “Photo App” will be able to use your Facebook account to ";
  EXPECT_EQ(message({"publish_stream"}, "everyone"), begin + "post in your name for everyone to see.");
  EXPECT_EQ(message({"publish_stream"}, "friends"), begin + "post in your name for your friends to see.");
  EXPECT_EQ(message({"publish_stream"}, "only_me"), begin + "post in your name for only you to see.");
}

TEST_F(TheEnglishAlert, ForManaging) {
  const std::string begin = "If you allow this, “Photo App” will be able to use your Facebook account to ";
  EXPECT_EQ(message({"manage_pages"}), begin + "manage your Facebook pages.");
  EXPECT_EQ(message({"create_event", "rsvp_event"}),
            begin + "answer your event invitations and create events in your name.");
  EXPECT_EQ(message({"xmpp_login", "create_event", "manage_notifications"}),
            begin + "chat in your name, create events in your name and manage your Facebook notifications.");
}

TEST_F(TheEnglishAlert, ForReadingAndPosting) {
  EXPECT_EQ(
      message({"user_photos", "publish_stream"}, "friends"),
      "If you allow this, “Photo App” will be able to use your Facebook account to see your photos. It will "
      "also be able to post in your name for your friends to see.");
}

TEST_F(TheEnglishAlert, ForReadingPostingAndManaging) {
  EXPECT_EQ(
      message({"user_photos", "friends_photos", "publish_stream", "create_event", "manage_pages"},
              "everyone"),
      "If you allow this, “Photo App” will be able to use your Facebook account to see your photos, as well "
      "as "
      "your friends’ photos. It will also be able to post in your name for everyone to see, and to create "
      "events in your name and manage your Facebook pages.");
}

TEST_F(TheEnglishAlert, ForWhatOnlyFacebookKnows) {
  maker.setDescription("It plays music.");
  EXPECT_EQ(message({"play_music"}),
            "If you allow this, “Photo App” will be able to use your Facebook account in a way that Facebook "
            "describes as follows: “It plays music.”");
}

TEST_F(TheEnglishAlert, ForWhatIsKnownAndWhatOnlyFacebookKnows) {
  maker.setDescription("It plays music.");
  EXPECT_EQ(
      message({"user_likes", "play_music"}),
      "If you allow this, “Photo App” will be able to use your Facebook account to see your likes. Facebook "
      "describes what else the app will be able to do as follows: “It plays music.”");
}

TEST_F(TheEnglishAlert, IsShownInEnglishWhereTheUsersLanguageIsMissing) {
  support::SentenceMaker elsewhere("tlh");
  EXPECT_EQ(elsewhere.alertFor({{"user_photos"}, std::nullopt})->message, message({"user_photos"}));
}

TEST_F(TheEnglishAlert, IsAFinishedSentenceForEveryPermission) {
  const auto requests = support::everyPermissionAlone();
  EXPECT_EQ(requests.size(), 6U + 49U + 7U + 4U * 4U);
  for (const ConsentRequest& request : requests)
    expectFinished(message(request.permissions, request.audience), request);
}

TEST_F(TheEnglishAlert, IsAFinishedSentenceForEveryCombination) {
  const auto requests = support::everyCombination();
  EXPECT_GT(requests.size(), 600U);
  for (const ConsentRequest& request : requests)
    expectFinished(message(request.permissions, request.audience), request);
}

TEST_F(TheEnglishAlert, IsAFinishedSentenceForEverythingAtOnce) {
  RVPermissionSet all;
  for (const ConsentRequest& request : support::everyPermissionAlone())
    all.insert(request.permissions.begin(), request.permissions.end());
  EXPECT_EQ(all.size(), 66U);
  expectFinished(message(all, "friends"), {all, "friends"});
}

TEST_F(TheEnglishAlert, SaysSomethingElseForEveryPermissionThatIsNotBasicAndDoesNotPost) {
  std::set<std::string> messages;
  for (const ConsentRequest& request : support::everyPermissionAlone())
    messages.insert(message(request.permissions, request.audience));
  // One for the basic permissions, one for each audience.
  EXPECT_EQ(messages.size(), 1U + 49U + 7U + 3U);
}

}  // namespace
}  // namespace plugin_tests
