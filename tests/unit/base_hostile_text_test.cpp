#include <gtest/gtest.h>

#include "base/Text.h"
#include "tests/support/HostileTexts.h"

namespace {

TEST(AHostileText, IsOneOfSeveralHundred) {
  EXPECT_GE(support::hostileTexts().size(), 200u);
}

TEST(AHostileText, HidesSomethingAsItIs) {
  for (const std::string& text : support::hostileTexts())
    EXPECT_FALSE(support::hidesNothing(text)) << testing::PrintToString(text);
}

TEST(AHostileText, HidesNothingOnceItIsMadeVisible) {
  for (const std::string& text : support::hostileTexts())
    EXPECT_TRUE(support::hidesNothing(base::visible(text))) << testing::PrintToString(text);
}

TEST(AHostileText, IsMadeVisibleAsSomethingElseThanAHarmlessOne) {
  for (const std::string& text : support::hostileTexts()) {
    const std::string shown = base::visible(text);
    EXPECT_NE(shown, text);
    EXPECT_NE(shown.find('\\'), std::string::npos) << shown;
  }
}

TEST(AHostileText, DoesNotChangeWhenItIsMadeVisibleTwice) {
  for (const std::string& text : support::hostileTexts()) {
    const std::string shown = base::visible(text);
    EXPECT_EQ(base::visible(shown), shown);
  }
}

TEST(AHostileText, MakesADisplayNameThatHidesNothing) {
  for (const std::string& text : support::hostileTexts())
    EXPECT_TRUE(support::hidesNothing(base::displayName(text, 64))) << testing::PrintToString(text);
}

}  // namespace
