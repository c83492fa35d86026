#include <gtest/gtest.h>

#include "base/Text.h"

namespace {

using base::displayName;
using base::shortened;
using base::visible;

TEST(AVisibleText, HasNothingHiddenInIt) {
  EXPECT_EQ(visible("a\tb\nc\rd\x7f\x01"), "a\\tb\\nc\\rd\\x7f\\x01");
  EXPECT_EQ(visible("\u0085\u200b\u2066\u2029\ufeff\u00ad"),
            "\\u{85}\\u{200b}\\u{2066}\\u{2029}\\u{feff}\\u{ad}");
  EXPECT_EQ(visible("\U000e0041"), "\\u{e0041}");
}

TEST(AVisibleText, ShowsEachByteThatBelongsToNoCharacter) {
  EXPECT_EQ(visible("\xc0\x80"), "\\xc0\\x80");           // a NUL in two bytes
  EXPECT_EQ(visible("\xed\xa0\x80"), "\\xed\\xa0\\x80");  // half a surrogate pair
  EXPECT_EQ(visible("a\xe2\x82"), "a\\xe2\\x82");
}

TEST(AVisibleText, IsOtherwiseTheSame) {
  EXPECT_EQ(visible("C:\\n Ä 你 é"), "C:\\n Ä 你 é");
}

TEST(ADisplayName, IsOneLineWithoutBlanksAtItsEnds) {
  EXPECT_EQ(displayName("  Photo\n\n App\u2028\u00a0X\t", 64), "Photo App X");
}

TEST(ADisplayName, LosesWhatCannotBeSeen) {
  EXPECT_EQ(displayName("\u202ePho\u200dto\u2066 A\u00adpp\ufeff\x1b[0m", 64), "Photo App[0m");
  EXPECT_EQ(displayName(std::string("A\0B", 3), 64), "AB");
}

TEST(ADisplayName, IsNotMadeEndlessByLettersThatJoin) {
  std::string joined;
  for (int i = 0; i < 1000; ++i) joined += "\u1100";  // Hangul letters that wait for a vowel
  const std::string shown = displayName(joined, 4);
  EXPECT_EQ(shown.size(), std::string("\u1100").size() * 19 + std::string("…").size());
  EXPECT_EQ(displayName(shown, 4), shown);
}

TEST(AnIsolatedText, HasNothingButThatTakenFromIt) {
  using base::isolated;
  using base::withoutIsolates;
  EXPECT_EQ(isolated("a"), "\u2068a\u2069");
  EXPECT_EQ(withoutIsolates("x" + isolated("a") + "y" + isolated("") + isolated("b")), "xayb");
  EXPECT_EQ(withoutIsolates("\u2068a"), "\u2068a");
  EXPECT_EQ(withoutIsolates("a\u2069"), "a\u2069");
  EXPECT_EQ(withoutIsolates("\u2068\u2068a\u2069\u2069"), "\u2068a\u2069");
  EXPECT_EQ(withoutIsolates("\u2069a\u2068"), "\u2069a\u2068");
  EXPECT_EQ(withoutIsolates(""), "");
}

TEST(ADisplayName, ThatIsBlankIsEmpty) {
  EXPECT_EQ(displayName("", 64), "");
  EXPECT_EQ(displayName(" \t\u3000\u2003\u3164\u115f\u2800\u200b\u202e", 64), "");
  EXPECT_EQ(displayName("\u0301\u0302", 64), "");
}

TEST(ADisplayName, ShowsWhatIsNoTextAsReplacements) {
  EXPECT_EQ(displayName("A\xff"
                        "B",
                        64),
            "A\uFFFDB");
  EXPECT_EQ(displayName("A\ue000", 64), "A\uFFFD");
}

TEST(ADisplayName, CarriesOnlySoManyMarksOnOneLetter) {
  std::string pile = "a";
  for (int i = 0; i < 50; ++i) pile += "\u0301";
  EXPECT_EQ(displayName(pile + "b\u0301", 64), "a\u0301\u0301\u0301\u0301b\u0301");
  EXPECT_EQ(displayName("a \u0301"
                        "b",
                        64),
            "a b");
}

TEST(ADisplayName, IsCutVisibly) {
  EXPECT_EQ(displayName("abcdef", 6), "abcdef");
  EXPECT_EQ(displayName("abcdefg", 6), "abcde…");
  EXPECT_EQ(displayName("abcd fg", 6), "abcd…");
  EXPECT_EQ(displayName("üüüüüüü", 6), "üüüüü…");
  EXPECT_EQ(displayName("u\u0308u\u0308u\u0308u\u0308", 4), "u\u0308u\u0308u\u0308u\u0308");
  EXPECT_EQ(displayName("u\u0308u\u0308u\u0308u\u0308u\u0308", 4), "u\u0308u\u0308u\u0308…");
  EXPECT_EQ(displayName("🇩🇪🇫🇷🇮🇹🇪🇸", 3), "🇩🇪🇫🇷…");
  EXPECT_EQ(displayName("abcdef     ", 6), "abcdef");
}

TEST(ADisplayName, KeepsTheWritingOfTheWorld) {
  for (const char* name :
       {"Grüße", "写真", "تطبيق الصور", "Ứng dụng", "ফটো", "📷 Photos", "A & B <i>", "%s %@", "--help"})
    EXPECT_EQ(displayName(name, 64), name);
}

TEST(AShortenedText, IsCutBetweenCharacters) {
  EXPECT_EQ(shortened("abc", 3), "abc");
  EXPECT_EQ(shortened("abcd", 3), "abc… (cut, 4 bytes)");
  EXPECT_EQ(shortened("aü€", 2), "a… (cut, 6 bytes)");
}

TEST(UTF8, IsToldFromOtherBytes) {
  EXPECT_TRUE(base::isUTF8(""));
  EXPECT_TRUE(base::isUTF8("ü€😀"));
  EXPECT_FALSE(base::isUTF8("\xfc"));
  EXPECT_FALSE(base::isUTF8("\xed\xa0\x80"));
  EXPECT_FALSE(base::isUTF8("\xf4\x90\x80\x80"));
}

}  // namespace
