#include <gtest/gtest.h>
#include <unicode/locid.h>
#include <unicode/unistr.h>

#include <string>

#include "Facebook/FacebookAccessPlugin/UpperCase.h"

namespace {

TEST(UpperCasing, RaisesTheLettersOfAPermissionName) {
  EXPECT_EQ(upperCased("friends_photos"), "FRIENDS_PHOTOS");
}

TEST(UpperCasing, LeavesDigitsAndPunctuationAsTheyAre) {
  EXPECT_EQ(upperCased("user_2nd-photos.v1 %@"), "USER_2ND-PHOTOS.V1 %@");
}

TEST(UpperCasing, OfTheEmptyTextIsTheEmptyText) {
  EXPECT_EQ(upperCased(""), "");
}

TEST(UpperCasing, LeavesUpperCaseAsItIs) {
  EXPECT_EQ(upperCased("ÄΩЖ"), "ÄΩЖ");
}

TEST(UpperCasing, MakesSeveralLettersOfOneWhereTheMappingSaysSo) {
  EXPECT_EQ(upperCased("straße"), "STRASSE");
  EXPECT_EQ(upperCased("ŉ"), "ʼN");
  EXPECT_EQ(upperCased("ﬃ"), "FFI");
  EXPECT_EQ(upperCased("\u0390"), "\u0399\u0308\u0301");
}

TEST(UpperCasing, DependsOnNoLanguage) {
  EXPECT_EQ(upperCased("ıi"), "II");
}

TEST(UpperCasing, ReachesEveryPlane) {
  EXPECT_EQ(upperCased("é"), "É");
  EXPECT_EQ(upperCased("ꭰ"), "Ꭰ");
  EXPECT_EQ(upperCased("𐐨"), "𐐀");
}

TEST(UpperCasing, LeavesBytesThatAreNoTextAsTheyAre) {
  const std::string broken[] = {
      "\x80",              // continuation without a lead
      "\xC0\xA1",          // overlong, two bytes
      "\xC1\xBF",          // the same
      "\xE0\x81\xA1",      // overlong, three bytes
      "\xF0\x80\x81\xA1",  // overlong, four bytes
      "\xED\xA0\x80",      // first surrogate
      "\xED\xBF\xBF",      // last surrogate
      "\xF4\x90\x80\x80",  // beyond the last code point
      "\xF5\x80\x80\x80",  // no lead
      "\xF8\x88\x80\x80",  // the same
      "\xFF\xBF\xBF\xBF",  // the same
      "\xFF",              // the same
      "\xC3",              // cut off
      "\xE1\xBA",          // the same
      "\xF0\x90\x90",      // the same
  };
  for (const std::string& bytes : broken) {
    EXPECT_EQ(upperCased(bytes), bytes);
    EXPECT_EQ(upperCased("a" + bytes + "b"), "A" + bytes + "B");
  }
}

TEST(UpperCasing, GoesOnRightAfterAByteThatIsNoText) {
  EXPECT_EQ(upperCased("\xC3z"), "\xC3Z");
  EXPECT_EQ(upperCased("\xE1\xBAz"), "\xE1\xBAZ");
  EXPECT_EQ(upperCased("\xF0é"), "\xF0É");
}

TEST(UpperCasing, ReadsNothingBehindTheText) {
  EXPECT_EQ(upperCased(std::string_view("é", 1)), "\xC3");
  EXPECT_EQ(upperCased(std::string_view("ꭰ", 2)), std::string("ꭰ", 2));
  EXPECT_EQ(upperCased(std::string_view("𐐨", 3)), std::string("𐐨", 3));
}

TEST(UpperCasing, KeepsZeroBytes) {
  EXPECT_EQ(upperCased(std::string_view("a\0b", 3)), std::string_view("A\0B", 3));
}

TEST(UpperCasing, AgreesWithICUOnEveryCodePoint) {
  for (UChar32 code = 0; code <= 0x10FFFF; ++code) {
    if (code >= 0xD800 && code <= 0xDFFF) continue;
    std::string text;
    std::string expected;
    icu::UnicodeString(code).toUTF8String(text);
    icu::UnicodeString(code).toUpper(icu::Locale::getRoot()).toUTF8String(expected);
    ASSERT_EQ(upperCased(text), expected) << "U+" << std::hex << code;
  }
}

}  // namespace
