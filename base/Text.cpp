#include "base/Text.h"

#include <unictype.h>
#include <unigbrk.h>
#include <unistr.h>

#include <array>
#include <cstdint>
#include <cstdio>
#include <vector>

namespace base {
namespace {

constexpr ucs4_t kReplacement = 0xFFFD;
constexpr ucs4_t kEllipsis = 0x2026;
constexpr std::string_view kFirstStrongIsolate = "\u2068";
constexpr std::string_view kPopDirectionalIsolate = "\u2069";
constexpr int kMaximalMarks = 4;  // on one letter; more than any writing system puts there would pile up

const std::uint8_t* bytes(std::string_view text) {
  return reinterpret_cast<const std::uint8_t*>(text.data());
}

// Takes the first character off the text; nothing where the first byte begins none, then that byte is taken.
bool takeCharacter(std::string_view& text, ucs4_t& character) {
  const int length = u8_mbtoucr(&character, bytes(text), text.size());
  text.remove_prefix(length > 0 ? static_cast<std::size_t>(length) : 1);
  return length > 0;
}

void append(std::string& text, ucs4_t character) {
  std::array<std::uint8_t, 6> encoded{};
  const int length = u8_uctomb(encoded.data(), character, encoded.size());
  for (int i = 0; i < length; ++i) text += static_cast<char>(encoded[static_cast<std::size_t>(i)]);
}

bool isOf(ucs4_t character, std::uint32_t categories) {
  return uc_is_general_category_withtable(character, categories);
}

bool isHidden(ucs4_t character) {
  return isOf(character, UC_CATEGORY_MASK_Cc | UC_CATEGORY_MASK_Cf) ||
         uc_is_property_default_ignorable_code_point(character) || uc_is_property_bidi_control(character);
}

bool isBlank(ucs4_t character) {
  // The last two are symbols by category and show nothing: the empty Braille pattern and the null notehead.
  return isOf(character, UC_CATEGORY_MASK_Z) || (character >= '\t' && character <= '\r') ||
         character == 0x85 || character == 0x2800 || character == 0x1D159;
}

// Where the text's clusters begin, which are what a person takes for its characters.
std::vector<std::size_t> clustersOf(const std::u32string& text) {
  const std::vector<ucs4_t> characters(text.begin(), text.end());
  std::vector<char> breaks(text.size());
  u32_grapheme_breaks(characters.data(), characters.size(), breaks.data());
  std::vector<std::size_t> begins;
  for (std::size_t i = 0; i < breaks.size(); ++i)
    if (breaks[i] != 0) begins.push_back(i);
  return begins;
}

// At most so many clusters, and characters; the last one is "…" where something was cut off.
void cutToClusters(std::u32string& text, std::size_t mostClusters, std::size_t mostCharacters) {
  const bool isTooLong = text.size() > mostCharacters;
  if (isTooLong) text.resize(mostCharacters - 1);
  const auto begins = clustersOf(text);
  if (begins.size() <= mostClusters && !isTooLong) return;
  if (begins.size() >= mostClusters) text.resize(begins[mostClusters - 1]);
  while (!text.empty() && text.back() == U' ') text.pop_back();
  text += static_cast<char32_t>(kEllipsis);
}

std::string escaped(ucs4_t character) {
  if (character == '\n') return "\\n";
  if (character == '\r') return "\\r";
  if (character == '\t') return "\\t";
  std::array<char, 16> text{};
  std::snprintf(
      text.data(), text.size(), character < 0x80 ? "\\x%02x" : "\\u{%x}", static_cast<unsigned>(character));
  return text.data();
}

}  // namespace

bool isUTF8(std::string_view text) {
  return u8_check(bytes(text), text.size()) == nullptr;
}

std::string visible(std::string_view text) {
  std::string result;
  result.reserve(text.size());
  while (!text.empty()) {
    const std::string_view before = text;
    ucs4_t character = 0;
    if (!takeCharacter(text, character)) {
      std::array<char, 8> escape{};
      std::snprintf(escape.data(), escape.size(), "\\x%02x", static_cast<unsigned>(*bytes(before)));
      result += escape.data();
    } else if (isHidden(character) || isOf(character, UC_CATEGORY_MASK_Zl | UC_CATEGORY_MASK_Zp)) {
      result += escaped(character);
    } else {
      result += before.substr(0, before.size() - text.size());
    }
  }
  return result;
}

std::string displayName(std::string_view text, std::size_t limit) {
  // A letter with its marks is one cluster; but there are letters that join to clusters of any size.
  const std::size_t mostCharacters = limit * (kMaximalMarks + 1);
  std::u32string name;
  bool blankIsDue = false;
  int marks = kMaximalMarks;  // a mark needs a letter to stand on
  while (!text.empty() && name.size() <= mostCharacters) {
    ucs4_t character = 0;
    if (!takeCharacter(text, character)) character = kReplacement;
    if (isBlank(character)) {
      blankIsDue = !name.empty();
      marks = kMaximalMarks;
      continue;
    }
    if (isHidden(character)) continue;
    if (isOf(character, UC_CATEGORY_MASK_M)) {
      if (marks == kMaximalMarks) continue;
      ++marks;
    } else {
      marks = 0;
    }
    if (isOf(character, UC_CATEGORY_MASK_C)) character = kReplacement;
    if (blankIsDue) name += U' ';
    blankIsDue = false;
    name += static_cast<char32_t>(character);
  }
  cutToClusters(name, limit, mostCharacters);
  std::string result;
  for (const char32_t character : name) append(result, character);
  return result;
}

std::string isolated(std::string_view text) {
  return std::string(kFirstStrongIsolate) + std::string(text) + std::string(kPopDirectionalIsolate);
}

std::string withoutIsolates(std::string text) {
  for (std::size_t begin = text.find(kFirstStrongIsolate); begin != std::string::npos;
       begin = text.find(kFirstStrongIsolate, begin)) {
    const std::size_t inside = begin + kFirstStrongIsolate.size();
    const std::size_t end = text.find(kPopDirectionalIsolate, inside);
    if (end == std::string::npos) break;
    if (text.find(kFirstStrongIsolate, inside) < end) {
      begin = inside;
      continue;
    }
    text.erase(end, kPopDirectionalIsolate.size());
    text.erase(begin, kFirstStrongIsolate.size());
    begin = end - kFirstStrongIsolate.size();
  }
  return text;
}

std::string shortened(std::string_view text, std::size_t limit) {
  if (text.size() <= limit) return std::string(text);
  std::size_t end = limit;
  while (end > 0 && (static_cast<unsigned char>(text[end]) & 0xC0) == 0x80) --end;
  return std::string(text.substr(0, end)) + "… (cut, " + std::to_string(text.size()) + " bytes)";
}

}  // namespace base
