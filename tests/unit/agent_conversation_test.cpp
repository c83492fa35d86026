#include <gtest/gtest.h>

#include <vector>

#include "agents/terminal/Conversation.h"

namespace {

using agents::Answer;

// Remembers what it was told to show, in order.
class RecordingScreen final : public terminal::Screen {
 public:
  explicit RecordingScreen(std::vector<std::string>& events)
      : events_(events) {}

  void registered() override { events_.emplace_back("registered"); }
  void daemonLeft() override { events_.emplace_back("daemon left"); }
  void showAlert(const agents::Alert& alert) override { events_.push_back("alert: " + alert.message); }
  void askForAnswer() override { events_.emplace_back("prompt"); }
  void notAnAnswer(const std::string& line) override { events_.push_back("no answer: " + line); }
  void answered(const agents::Alert&, Answer) override { events_.emplace_back("answered"); }
  void takenDown() override { events_.emplace_back("taken down"); }
  void typedForNothing() override { events_.emplace_back("for nothing"); }
  bool works() const override { return true; }

 private:
  std::vector<std::string>& events_;
};

class AConversation : public testing::Test {
 protected:
  bool show(const std::string& id, const std::string& message = "May it?") {
    return conversation.show(id,
                             {"", message, "OK", "No", std::nullopt, std::nullopt},
                             [this, id](Answer answer) { answers.emplace_back(id, answer); });
  }

  using Answers = std::vector<std::pair<std::string, Answer>>;
  using Events = std::vector<std::string>;
  Events events;
  Answers answers;
  RecordingScreen screen{events};
  terminal::Conversation conversation{screen, [this] { events.emplace_back("discard"); }};
};

TEST_F(AConversation, DiscardsWhatWasTypedBetweenShowingAnAlertAndAskingForItsAnswer) {
  EXPECT_TRUE(show("1"));
  EXPECT_EQ(events, (Events{"alert: May it?", "discard", "prompt"}));
  EXPECT_TRUE(answers.empty());
}

TEST_F(AConversation, AnswersWithTheButtonOfTheWord) {
  show("1");
  conversation.take("allow");
  show("2");
  conversation.take("refuse");
  EXPECT_EQ(answers, (Answers{{"1", Answer::kDefaultButton}, {"2", Answer::kAlternateButton}}));
}

TEST_F(AConversation, AsksAgainAfterALineThatIsNoAnswer) {
  show("1");
  events.clear();
  conversation.take("");
  conversation.take("perhaps");
  EXPECT_EQ(events, (Events{"no answer: ", "prompt", "no answer: perhaps", "prompt"}));
  EXPECT_TRUE(answers.empty());
  conversation.take("allow");
  EXPECT_EQ(answers.size(), 1u);
}

TEST_F(AConversation, TakesNoAnswerWithoutAnAlert) {
  conversation.take("allow");
  show("1");
  EXPECT_TRUE(answers.empty());
  EXPECT_EQ(events.front(), "for nothing");
}

TEST_F(AConversation, GivesEachAnswerOnce) {
  show("1");
  conversation.take("allow");
  conversation.take("allow");
  conversation.dismiss("1");
  EXPECT_EQ(answers, (Answers{{"1", Answer::kDefaultButton}}));
}

TEST_F(AConversation, TakesADismissedAlertDownWithoutAButton) {
  show("1");
  conversation.dismiss("1");
  EXPECT_EQ(answers, (Answers{{"1", Answer::kNoButton}}));
  EXPECT_EQ(events.back(), "taken down");
  conversation.take("allow");
  EXPECT_EQ(answers.size(), 1u);
}

TEST_F(AConversation, KeepsAnAlertWhenAnotherIsDismissed) {
  show("1");
  conversation.dismiss("2");
  EXPECT_TRUE(answers.empty());
  conversation.take("refuse");
  EXPECT_EQ(answers, (Answers{{"1", Answer::kAlternateButton}}));
}

TEST_F(AConversation, ShowsOneAlertAtATime) {
  show("1");
  EXPECT_FALSE(show("2"));
  conversation.take("allow");
  EXPECT_EQ(answers, (Answers{{"1", Answer::kDefaultButton}}));
  EXPECT_TRUE(show("2"));
}

TEST_F(AConversation, ShowsNoBlankAlert) {
  EXPECT_FALSE(show("1", " \u200b"));
  EXPECT_TRUE(events.empty());
  EXPECT_TRUE(answers.empty());
}

TEST_F(AConversation, LeavesAnAbandonedAlertUnanswered) {
  show("1");
  conversation.abandon();
  EXPECT_EQ(events.back(), "taken down");
  conversation.take("allow");
  conversation.dismiss("1");
  conversation.abandon();
  EXPECT_TRUE(answers.empty());
}

TEST_F(AConversation, MayShowTheNextAlertWhileItAnswersTheLast) {
  bool wasShown = false;
  conversation.show(
      "1", {"", "May it?", "OK", "No", std::nullopt, std::nullopt}, [&](Answer) { wasShown = show("2"); });
  conversation.take("allow");
  EXPECT_TRUE(wasShown);
  conversation.take("refuse");
  EXPECT_EQ(answers, (Answers{{"2", Answer::kAlternateButton}}));
}

}  // namespace
