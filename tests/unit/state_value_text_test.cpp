#include <gtest/gtest.h>

#include <limits>
#include <random>
#include <set>

#include "base/Text.h"
#include "daemon/state/RandomIdentifier.h"
#include "daemon/state/ValueText.h"
#include "tests/support/StoredState.h"

namespace {

RVValue comeBack(const RVValue& value) {
  return support::valueOf(state::valueFromText(state::textFromValue(value)));
}

// Values of every shape, with strings of any bytes.
class RandomValues {
 public:
  explicit RandomValues(unsigned seed)
      : generator_(seed) {}

  RVValue next(int depth = 0) {
    switch (below(depth < 5 ? 8 : 6)) {
      case 0:
        return {};
      case 1:
        return below(2) == 0;
      case 2:
        return static_cast<std::int64_t>(generator_());
      case 3:
        return std::normal_distribution<double>(0, 1e9)(generator_);
      case 4:
      case 5:
        return bytes();
      case 6: {
        RVArray elements;
        for (unsigned i = below(4); i > 0; --i) elements.push_back(next(depth + 1));
        return elements;
      }
      default: {
        RVDictionary members;
        for (unsigned i = below(4); i > 0; --i) members.insert_or_assign(bytes(), next(depth + 1));
        return members;
      }
    }
  }

 private:
  unsigned below(unsigned limit) { return static_cast<unsigned>(generator_() % limit); }
  std::string bytes() {
    static const std::vector<std::string> kPieces = {"a",
                                                     "\"",
                                                     "\\",
                                                     "\n",
                                                     std::string(1, '\0'),
                                                     "é",
                                                     "\xef\xb7\x90",
                                                     "\xef\xb7",
                                                     "\x90",
                                                     "\xff",
                                                     "\xc0\xaf",
                                                     "\xed\xa0\x80",
                                                     "\xf4\x90\x80\x80",
                                                     "😀",
                                                     "\xe2\x80\xa8",
                                                     "0",
                                                     "f"};
    std::string text;
    for (unsigned i = below(8); i > 0; --i) text += kPieces[below(static_cast<unsigned>(kPieces.size()))];
    return text;
  }

  std::mt19937_64 generator_;
};

TEST(ValueText, GivesEveryValueBack) {
  for (unsigned seed = 1; seed <= 5000; ++seed) {
    const RVValue value = RandomValues(seed).next();
    const std::string text = state::textFromValue(value);
    EXPECT_TRUE(base::isUTF8(text)) << "seed " << seed;
    EXPECT_TRUE(comeBack(value) == value) << "seed " << seed << ": " << text;
  }
}

TEST(ValueText, GivesEveryByteBack) {
  for (int first = 0; first < 256; ++first) {
    for (int second = 0; second < 256; ++second) {
      const std::string bytes = {static_cast<char>(first), static_cast<char>(second)};
      ASSERT_TRUE(comeBack(RVValue(bytes)) == RVValue(bytes)) << first << " " << second;
    }
  }
}

TEST(ValueText, KeepsIntegersAndRealsApart) {
  EXPECT_EQ(state::textFromValue(1), "1");
  EXPECT_EQ(state::textFromValue(1.0), "1.0");
  for (const RVValue& value : RVArray{std::numeric_limits<std::int64_t>::min(),
                                      std::numeric_limits<std::int64_t>::max(),
                                      std::numeric_limits<double>::max(),
                                      std::numeric_limits<double>::denorm_min(),
                                      -0.0,
                                      0.1})
    EXPECT_TRUE(comeBack(value) == value);
}

TEST(ValueText, WritesNullForARealThatIsNotFinite) {
  EXPECT_EQ(state::textFromValue(std::numeric_limits<double>::infinity()), "null");
  EXPECT_EQ(state::textFromValue(RVArray{std::numeric_limits<double>::quiet_NaN(), "kept"}),
            R"([null,"kept"])");
}

TEST(ValueText, IsPlainJSONForPlainTexts) {
  EXPECT_EQ(state::textFromValue(RVDictionary{{"b", "é"}, {"a", RVArray{true, RVValue()}}}),
            R"({"a":[true,null],"b":"é"})");
}

TEST(ValueText, WritesABytesThatIsNoUTF8AsAMarkAndTwoDigits) {
  EXPECT_EQ(state::textFromValue("a\xff"
                                 "b"),
            "\"a\xef\xb7\x90"
            "ffb\"");
  EXPECT_EQ(state::textFromValue("\xef\xb7\x90"),
            "\"\xef\xb7\x90"
            "ef\xef\xb7\x90"
            "b7\xef\xb7\x90"
            "90\"");
}

TEST(ValueText, ThatIsDamagedIsNoValueAndIsNotQuoted) {
  for (const std::string text : {"",
                                 "secret",
                                 "{",
                                 "[1,]",
                                 "1 2",
                                 "{\"a\":}",
                                 "\"\xff\"",
                                 "18446744073709551615",
                                 "1e999",
                                 "\"\xef\xb7\x90\"",
                                 "\"\xef\xb7\x90"
                                 "f\"",
                                 "\"\xef\xb7\x90"
                                 "zz\"",
                                 "\"\xef\xb7\x90"
                                 "FF\"",
                                 "{\"\xef\xb7\x90\":1}"}) {
    const auto value = state::valueFromText(text);
    ASSERT_FALSE(value) << text;
    EXPECT_EQ(value.failure().kind, base::FailureKind::kDamaged);
    EXPECT_EQ(value.failure().message.find("secret"), std::string::npos);
  }
}

TEST(ValueText, ThatIsNestedWithoutEndIsNoValue) {
  EXPECT_TRUE(state::valueFromText(std::string(60, '[') + std::string(60, ']')));
  EXPECT_FALSE(state::valueFromText(std::string(70, '[') + std::string(70, ']')));
  EXPECT_FALSE(state::valueFromText(std::string(1'000'000, '[')));
  EXPECT_FALSE(state::valueFromText(std::string(500'000, '[') + std::string(500'000, ']')));
}

TEST(RandomIdentifiers, AreThirtyTwoDigitsAndNeverTheSame) {
  std::set<std::string> seen;
  for (int i = 0; i < 1000; ++i) {
    const std::string identifier = state::randomIdentifier();
    EXPECT_EQ(identifier.size(), 32U);
    EXPECT_EQ(identifier.find_first_not_of("0123456789abcdef"), std::string::npos);
    EXPECT_TRUE(seen.insert(identifier).second);
  }
}

}  // namespace
