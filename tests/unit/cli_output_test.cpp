#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <sstream>

#include "cli/Output.h"
#include "tests/support/HostileTexts.h"

namespace {

using cli::ExitStatus;
using cli::Json;

TEST(ATable, HasColumnsAsWideAsTheirWidestCells) {
  EXPECT_EQ(cli::tableOf({"A", "NAME"}, {{"long one", "x"}, {"", "y"}}),
            "A         NAME\n"
            "long one  x\n"
            "          y\n");
}

TEST(ATable, CountsThePlacesThatACharacterTakes) {
  EXPECT_EQ(cli::tableOf({"N", "X"}, {{"写真", "1"}, {"e\u0301", "2"}, {"abcd", "3"}}),
            "N     X\n"
            "写真  1\n"
            "e\u0301     2\n"
            "abcd  3\n");
}

TEST(ATable, OfHostileTextsHasOneLineForEachRow) {
  for (const std::string& text : support::hostileTexts()) {
    const std::string table = cli::tableOf({"A", "B"}, {{text, text}});
    ASSERT_EQ(std::count(table.begin(), table.end(), '\n'), 2) << testing::PrintToString(text);
    std::istringstream lines(table);
    for (std::string line; std::getline(lines, line);)
      EXPECT_TRUE(support::hidesNothing(line)) << testing::PrintToString(text);
  }
}

TEST(AValue, IsShownOnOneLine) {
  EXPECT_EQ(cli::valueText(Json("a\nb")), "a\\nb");
  EXPECT_EQ(cli::valueText(Json(true)), "true");
  EXPECT_EQ(cli::valueText(Json(0.5)), "0.5");
  EXPECT_EQ(cli::valueText(Json::array({1, "\u202e"})), "[1,\"\\u202e\"]");
  EXPECT_EQ(cli::valueText(Json()), "null");
}

TEST(AMoment, BeyondTheCalendarIsShownAsANumber) {
  EXPECT_EQ(cli::timeText(std::numeric_limits<long long>::max()), "9223372036854775807");
}

class AnOutput : public testing::Test {
 protected:
  std::ostringstream out;
  std::ostringstream err;
  cli::Output output{out, err};
};

TEST_F(AnOutput, PrintsDocumentsInPureASCII) {
  output.print(Json::object({{"b", "\u202eé"}, {"a", "\x7f\x1b"}}));
  EXPECT_EQ(out.str(), "{\n  \"b\": \"\\u202e\\u00e9\",\n  \"a\": \"\\u007f\\u001b\"\n}\n");
}

TEST_F(AnOutput, PrintsWhatIsNoUTF8AsReplacements) {
  output.printLine(Json("a\xff"));
  EXPECT_EQ(out.str(), "\"a\\ufffd\"\n");
}

TEST_F(AnOutput, TellsFailuresApart) {
  EXPECT_EQ(output.failed({base::FailureKind::kFailed, "a"}), ExitStatus::kImpossible);
  EXPECT_EQ(output.failed({base::FailureKind::kRefused, "b"}), ExitStatus::kRefused);
  EXPECT_EQ(output.failed({base::FailureKind::kInvalid, "c\nd"}), ExitStatus::kWrongUse);
  EXPECT_EQ(err.str(), "rvctl: a.\nrvctl: b.\nrvctl: c\\nd.\n");
  EXPECT_EQ(out.str(), "");
}

TEST_F(AnOutput, PrintsAFailureAsADocumentWhereOneIsWanted) {
  output.useJSON();
  static_cast<void>(output.failed({base::FailureKind::kFailed, "a"}));
  EXPECT_EQ(Json::parse(out.str()), Json::object({{"failure", "a"}}));
  EXPECT_EQ(err.str(), "rvctl: a.\n");
}

}  // namespace
