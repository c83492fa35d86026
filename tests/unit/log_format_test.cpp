#include <gtest/gtest.h>

#include <limits>
#include <random>

#include "daemon/log/Format.h"

namespace {

using logging::describe;
using logging::masked;
using logging::stringWithFormat;
using Arguments = std::vector<std::optional<RVValue>>;

TEST(AFormat, TakesItsArgumentsInOrder) {
  EXPECT_EQ(stringWithFormat("%@ and %d, %@", {"a", 7, "b"}), "a and 7, b");
}

TEST(AFormat, NamesAnArgumentByItsPosition) {
  EXPECT_EQ(stringWithFormat("%2$@ before %1$@", {"a", "b"}), "b before a");
  EXPECT_EQ(stringWithFormat("%1$@ %1$@ %2$d", {"a", 2}), "a a 2");
}

TEST(AFormat, CountsOnlyThePlaceholdersWithoutAPosition) {
  EXPECT_EQ(stringWithFormat("%2$@ %@ %@", {"a", "b"}), "b a b");
}

TEST(AFormat, HasAPercentSignForTwo) {
  EXPECT_EQ(stringWithFormat("%d%% of %%@ %%%@%%", {50, "x"}), "50% of %@ %x%");
}

TEST(AFormat, NeverScansAnArgumentForPlaceholders) {
  EXPECT_EQ(stringWithFormat("<%@> <%@>", {"%@ %2$@ %% %s", "b"}), "<%@ %2$@ %% %s> <b>");
}

TEST(AFormat, ShowsAnAbsentArgumentAndAMissingOneAsAbsent) {
  EXPECT_EQ(stringWithFormat("%@ %d %@ %9$@ %99999999999999999999999$@", Arguments{std::nullopt, 1}),
            "(null) 1 (null) (null) (null)");
}

TEST(AFormat, LeavesWhatIsNoPlaceholderAsItStands) {
  EXPECT_EQ(stringWithFormat("%s %x %0$@ %1@ %1$s %$@ % @ 100%", {"a"}), "%s %x %0$@ %1@ %1$s %$@ % @ 100%");
  EXPECT_EQ(stringWithFormat("%", {"a"}), "%");
  EXPECT_EQ(stringWithFormat("%1", {"a"}), "%1");
  EXPECT_EQ(stringWithFormat("%1$", {"a"}), "%1$");
  EXPECT_EQ(stringWithFormat("", {"a"}), "");
}

TEST(AFormat, KeepsBytesThatAreNoText) {
  const std::string bytes("\0\xff\n%", 4);
  EXPECT_EQ(stringWithFormat("%@", {bytes}), bytes);
}

TEST(AFormat, OfAnyCharactersIsFilledWithoutHarm) {
  const auto seed = std::random_device{}();
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937 random(seed);
  constexpr std::string_view kLetters = "%%%%@d$0129 x";
  for (int round = 0; round < 20000; ++round) {
    std::string format;
    while (random() % 12 != 0) format += kLetters[random() % kLetters.size()];
    const std::string filled = stringWithFormat(format, {"", ""});
    EXPECT_LE(filled.size(), 6 * format.size());
    if (format.find('%') == std::string::npos) {
      EXPECT_EQ(filled, format);
    }
  }
}

TEST(AValue, IsDescribedByItsContent) {
  EXPECT_EQ(describe("text \"as it is\""), "text \"as it is\"");
  EXPECT_EQ(describe(RVValue()), "(null)");
  EXPECT_EQ(describe(true), "true");
  EXPECT_EQ(describe(false), "false");
  EXPECT_EQ(describe(std::numeric_limits<std::int64_t>::min()), "-9223372036854775808");
  EXPECT_EQ(describe(0.1), "0.1");
  EXPECT_EQ(describe(1e300), "1e+300");
  EXPECT_EQ(describe(RVArray{}), "()");
  EXPECT_EQ(describe(RVDictionary{}), "{}");
}

TEST(AContainer, QuotesItsStringsSoThatNoneCanPassForMore) {
  EXPECT_EQ(describe(RVArray{1, "a\", \"b", RVValue()}), R"((1, "a\", \"b", (null)))");
  EXPECT_EQ(describe(RVDictionary{{"b", RVArray{"x"}}, {"a", "y\\"}, {"c; d", 2}}),
            R"({"a" = "y\\"; "b" = ("x"); "c; d" = 2})");
}

TEST(AnAccessToken, IsMaskedAtAnyDepth) {
  const RVValue answer = RVDictionary{
      {"access_token", "canary"},
      {"data",
       RVArray{RVDictionary{{"access_token", RVDictionary{{"value", "canary"}}}, {"permissions", "email"}}}}};
  EXPECT_EQ(
      describe(masked(answer)),
      R"({"access_token" = "<masked>"; "data" = ({"access_token" = "<masked>"; "permissions" = "email"})})");
}

TEST(AMaskedValue, IsOtherwiseTheSame) {
  const RVValue value = RVDictionary{{"a", 1}, {"b", RVArray{true, RVValue(), 1.5, "access_token"}}};
  EXPECT_EQ(masked(value), value);
  EXPECT_EQ(masked("access_token"), RVValue("access_token"));
}

}  // namespace
