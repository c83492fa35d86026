#include <gtest/gtest.h>

#include "agents/common/Answer.h"
#include "tests/support/HostileTexts.h"

namespace {

using agents::Answer;
using agents::answerFor;

TEST(AnAnswer, IsTheWholeWordInAnyCaseWithBlanksAroundIt) {
  for (const char* typed : {"allow", "Allow", "ALLOW", " allow", "allow \t", "allow\r"})
    EXPECT_EQ(answerFor(typed), Answer::kDefaultButton) << typed;
  for (const char* typed : {"refuse", "Refuse", "REFUSE", "\trefuse  "})
    EXPECT_EQ(answerFor(typed), Answer::kAlternateButton) << typed;
}

TEST(AnAnswer, IsNothingElse) {
  for (const char* typed : {"",
                            " ",
                            "\r",
                            "a",
                            "r",
                            "y",
                            "n",
                            "yes",
                            "no",
                            "0",
                            "1",
                            "OK",
                            "ok",
                            "allo",
                            "allows",
                            "allow.",
                            "allow it",
                            "allowrefuse",
                            "allow refuse",
                            "refuse allow",
                            "\"allow\"",
                            "\u0430llow",
                            "allow\u200b",
                            "al\u00adlow",
                            "allow\v",
                            "-allow",
                            "disallow",
                            "not allow",
                            "Don't Allow"})
    EXPECT_EQ(answerFor(typed), std::nullopt) << typed;
  EXPECT_EQ(answerFor(std::string_view("allow\0", 6)), std::nullopt);
}

TEST(AnAnswer, IsNoHostileText) {
  for (const std::string& text : support::hostileTexts()) {
    EXPECT_EQ(answerFor(text), std::nullopt);
    // A blank beside the word is no other word; everything else is.
    const bool isBlank = text == "\t" || text == "\r";
    EXPECT_EQ(answerFor("allow" + text) == std::nullopt, !isBlank) << testing::PrintToString(text);
  }
}

TEST(AnAnswer, HasTheResponseFlagsOfItsButton) {
  EXPECT_EQ(static_cast<int>(Answer::kDefaultButton), 0);
  EXPECT_EQ(static_cast<int>(Answer::kAlternateButton), 1);
  EXPECT_EQ(static_cast<int>(Answer::kNoButton), 2);
}

}  // namespace
