#include "tests/support/HostileTexts.h"

#include <unicode/uchar.h>
#include <unicode/utf8.h>

#include <cstdint>

namespace support {
namespace {

std::string utf8(UChar32 character) {
  std::string text(U8_MAX_LENGTH, '\0');
  std::int32_t length = 0;
  U8_APPEND_UNSAFE(text.data(), length, character);
  text.resize(static_cast<std::size_t>(length));
  return text;
}

// First and last of each range of characters that show nothing, or change how others show.
constexpr UChar32 kRanges[][2] = {
    {0x00, 0x1F},       {0x7F, 0x9F},       {0xAD, 0xAD},       {0x034F, 0x034F},   {0x061C, 0x061C},
    {0x115F, 0x1160},   {0x17B4, 0x17B5},   {0x180B, 0x180F},   {0x200B, 0x200F},   {0x2028, 0x202E},
    {0x2060, 0x206F},   {0x3164, 0x3164},   {0xFE00, 0xFE0F},   {0xFEFF, 0xFEFF},   {0xFFA0, 0xFFA0},
    {0xFFF9, 0xFFFB},   {0x1BCA0, 0x1BCA3}, {0x1D173, 0x1D17A}, {0xE0001, 0xE0001}, {0xE0020, 0xE0025},
    {0xE007F, 0xE007F}, {0xE0100, 0xE0103},
};

const char* const kBrokenBytes[] = {
    "\x80",                      // the middle of a character
    "\xc0\x80",                  // a NUL in two bytes
    "\xc1\xbf",                  // a DEL in two
    "\xe0\x80\x8a",              // a newline in three
    "\xf0\x80\x80\x9b",          // an escape in four
    "\xed\xa0\x80",              // half a surrogate pair
    "\xed\xa0\xbd\xed\xb8\x80",  // a whole one
    "\xf4\x90\x80\x80",          // beyond the last character
    "\xf8\x88\x80\x80\x80",      // five bytes
    "\xe2\x80",                  // cut short
    "\xf0\x9f\x98",
    "\xfe",
    "\xff",
    "\xfe\xff",
};

const char* const kAttacks[] = {
    "\x1b[2J\x1b[H",               // clears the screen
    "\x1b]0;a title\x07",          // renames the window
    "\x1b]52;c;cm0gLXJmIC8=\x07",  // fills the clipboard
    "\x1b[8mhidden\x1b[28m",       // conceals
    "\x1b[1A\x1b[2Kanother line",  // writes over the line above
    "\x9b"
    "31mred",  // the same by a control of one byte
    "\xc2\x9b"
    "31mred",     // and by a character
    "\x90q\x9c",  // a picture
    "\x0e"
    "line drawing\x0f",
    "a\rb",  // begins the line again
    "a\b\b\bb",
    "a\x7f",
    "a\n  refuse  for the button: Allow",
    "a\r\nAnswered: OK",
    "a\xe2\x80\xa8"
    "b",
    "\xe2\x80\xae"
    "gpj.exe",  // reads from the right
    "\xe2\x81\xa6"
    "a\xe2\x81\xa9"
    "b",
    "user\xe2\x80\x8b"
    "name",
    "a\xef\xbb\xbf",
};

}  // namespace

std::vector<std::string> hostileTexts() {
  std::vector<std::string> cores;
  for (const auto& [first, last] : kRanges)
    for (UChar32 character = first; character <= last; ++character) cores.push_back(utf8(character));
  for (const char* bytes : kBrokenBytes) cores.emplace_back(bytes);
  std::vector<std::string> texts;
  for (const std::string& core : cores) {
    texts.push_back(core);
    texts.push_back(core + "Photo App");
    texts.push_back("Photo" + core + "App");
    texts.push_back("Photo App" + core);
    texts.push_back("Gr\u00fc\u00dfe" + core + core + "\u5199\u771f");
  }
  for (const char* attack : kAttacks) texts.emplace_back(attack);
  return texts;
}

bool hidesNothing(const std::string& text) {
  const auto length = static_cast<std::int32_t>(text.size());
  for (std::int32_t at = 0; at < length;) {
    UChar32 character = 0;
    U8_NEXT(text.data(), at, length, character);
    if (character < 0) return false;
    constexpr std::uint32_t kUnseen =
        U_GC_CC_MASK | U_GC_CF_MASK | U_GC_CS_MASK | U_GC_ZL_MASK | U_GC_ZP_MASK;
    if ((U_GET_GC_MASK(character) & kUnseen) != 0) return false;
    if (u_hasBinaryProperty(character, UCHAR_DEFAULT_IGNORABLE_CODE_POINT)) return false;
    if (u_hasBinaryProperty(character, UCHAR_BIDI_CONTROL)) return false;
  }
  return true;
}

}  // namespace support
