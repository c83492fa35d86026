// Names that nobody vouches for, by the thousand, against an independent knowledge of characters.
#include <gtest/gtest.h>
#include <unicode/ubrk.h>
#include <unicode/uchar.h>
#include <unicode/utf8.h>

#include <array>
#include <random>
#include <string>
#include <vector>

#include "daemon/clients/InstalledApplications.h"

namespace {

using clients::shownName;

constexpr std::size_t kLimit = 64;

std::vector<std::string> hostilePieces() {
  std::vector<std::string> pieces;
  for (int byte = 0; byte < 256; ++byte) pieces.emplace_back(1, static_cast<char>(byte));
  for (const char* piece : {"\u0085",
                            "\u00a0",
                            "\u00ad",
                            "\u034f",
                            "\u0600",
                            "\u061c",
                            "\u115f",
                            "\u1160",
                            "\u17b4",
                            "\u180e",
                            "\u2000",
                            "\u200b",
                            "\u200c",
                            "\u200d",
                            "\u200e",
                            "\u200f",
                            "\u2028",
                            "\u2029",
                            "\u202a",
                            "\u202b",
                            "\u202c",
                            "\u202d",
                            "\u202e",
                            "\u202f",
                            "\u205f",
                            "\u2060",
                            "\u2061",
                            "\u2064",
                            "\u2066",
                            "\u2067",
                            "\u2068",
                            "\u2069",
                            "\u206a",
                            "\u206f",
                            "\u2800",
                            "\u3000",
                            "\u3164",
                            "\ue000",
                            "\ufe00",
                            "\ufe0f",
                            "\ufeff",
                            "\uffa0",
                            "\ufff9",
                            "\ufffb",
                            "\uffff",
                            "\U0001bca0",
                            "\U0001d159",
                            "\U0001d173",
                            "\U000e0001",
                            "\U000e0041",
                            "\U000e0100",
                            "\U000f0000",
                            "\U0010ffff",
                            "\xc0\x80",
                            "\xed\xa0\x80",
                            "\xf4\x90\x80\x80",
                            "\xe2\x82",
                            "\xf8\x88\x80\x80\x80",
                            "\u0301",
                            "\u0489",
                            "\u20dd",
                            "<b>",
                            "&lt;",
                            "%s%n",
                            "%@",
                            "%1$@",
                            "--help",
                            "\\n",
                            "\"",
                            "\x1b[2J",
                            "\x1b]0;t\x07",
                            "\r\n",
                            "א",
                            "مرحبا"})
    pieces.emplace_back(piece);
  pieces.emplace_back("A\0B", 3);
  pieces.emplace_back(1 << 20, 'x');
  std::string pile = "Z";
  for (int i = 0; i < 500; ++i) pile += "\u0308";
  pieces.push_back(pile);
  return pieces;
}

// What a person takes for characters.
std::size_t clustersIn(const std::string& text) {
  UErrorCode status = U_ZERO_ERROR;
  UText* utf8 = utext_openUTF8(nullptr, text.data(), static_cast<std::int64_t>(text.size()), &status);
  UBreakIterator* breaks = ubrk_open(UBRK_CHARACTER, "en", nullptr, 0, &status);
  ubrk_setUText(breaks, utf8, &status);
  std::size_t count = 0;
  while (ubrk_next(breaks) != UBRK_DONE) ++count;
  ubrk_close(breaks);
  utext_close(utf8);
  return U_SUCCESS(status) ? count : SIZE_MAX;
}

// What is wrong with a name that is shown; empty where nothing is.
std::string faultOf(const std::string& name) {
  int marks = 0;
  for (std::int32_t at = 0; at < static_cast<std::int32_t>(name.size());) {
    UChar32 character = 0;
    U8_NEXT(name.data(), at, static_cast<std::int32_t>(name.size()), character);
    if (character < 0) return "is no UTF-8";
    const auto category = U_MASK(u_charType(character));
    if ((category & (U_GC_C_MASK | U_GC_ZL_MASK | U_GC_ZP_MASK)) != 0) return "holds a control character";
    if (u_hasBinaryProperty(character, UCHAR_DEFAULT_IGNORABLE_CODE_POINT) ||
        u_hasBinaryProperty(character, UCHAR_BIDI_CONTROL))
      return "holds a character that cannot be seen";
    if ((category & U_GC_Z_MASK) != 0 && character != ' ') return "holds an unusual blank";
    marks = (category & U_GC_M_MASK) != 0 ? marks + 1 : 0;
    if (marks > 4) return "holds a pile of marks";
  }
  if (name.empty()) return "is empty";
  if (name.front() == ' ' || name.back() == ' ' || name.find("  ") != std::string::npos) return "has blanks";
  if (clustersIn(name) > kLimit) return "is too long";
  return "";
}

void expectFit(const std::string& name) {
  const std::string shown = shownName(name, "org.example.App");
  ASSERT_EQ(faultOf(shown), "") << testing::PrintToString(name.substr(0, 100));
  ASSERT_EQ(shownName(shown, "org.example.App"), shown);
}

TEST(AHostileName, OfEveryKindIsFitToBeShown) {
  const auto pieces = hostilePieces();
  const std::array<std::string, 4> frames{"", "Photos", " A", "写真"};
  std::size_t count = 0;
  for (const std::string& piece : pieces) {
    for (const std::string& before : frames) {
      for (const std::string& after : frames) {
        expectFit(before + piece + after);
        ++count;
      }
    }
  }
  EXPECT_GT(count, 5000u);
}

TEST(AHostileName, OfAnyMixtureIsFitToBeShown) {
  const auto seed = std::random_device{}();
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937 random(seed);
  auto pieces = hostilePieces();
  std::erase_if(pieces, [](const std::string& piece) { return piece.size() > 2000; });
  for (int round = 0; round < 5000; ++round) {
    std::string name;
    while (random() % 8 != 0) name += pieces[random() % pieces.size()];
    expectFit(name);
  }
}

TEST(AHostileName, OfEachSingleCharacterIsFitToBeShown) {
#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)
  constexpr UChar32 kStep = 31;
#else
  constexpr UChar32 kStep = 1;
#endif
  for (UChar32 character = 0; character <= 0x10ffff; character += kStep) {
    std::array<char, 4> encoded{};
    std::int32_t length = 0;
    UBool isError = false;
    U8_APPEND(reinterpret_cast<std::uint8_t*>(encoded.data()), length, 4, character, isError);
    if (isError) continue;
    const std::string name = "a" + std::string(encoded.data(), static_cast<std::size_t>(length)) + "b";
    ASSERT_EQ(faultOf(shownName(name, "x")), "") << std::hex << character;
  }
}

TEST(ANameThatNothingCanBeSeenOf, GivesWayToTheFallback) {
  for (const char* name : {"", " ", "\u200b", "\u3164", "\u202e\u2066", "\n\t", "\u0301", "\u2800"})
    EXPECT_EQ(shownName(name, "org.example.App"), "org.example.App");
}

}  // namespace
