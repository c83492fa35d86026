#include "Facebook/FacebookAccessPlugin/UpperCase.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <iterator>

namespace {

// Every stride-th code point from first to last has its upper case at the distance delta.
struct UpperCaseRange {
  std::uint32_t first : 24;
  std::uint32_t stride : 8;
  std::uint32_t last;
  std::int32_t delta;
};

// A code point whose upper case is several; unused places are 0.
struct SpecialUpperCase {
  char16_t code;
  char16_t upper[3];
};

#include "Facebook/FacebookAccessPlugin/UpperCaseTable.inc"

// One character of a text: its code point, and how many bytes it takes. For a byte that begins no
// character, size is 0.
struct Character {
  char32_t code;
  std::size_t size;
};

Character firstCharacter(std::string_view text) {
  constexpr Character kNone{0, 0};
  const auto lead = static_cast<unsigned char>(text[0]);
  if (lead < 0x80) return {lead, 1};
  const std::size_t size = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
  if (lead < 0xC0 || lead > 0xF4 || text.size() < size) return kNone;
  char32_t code = lead & (0x7F >> size);
  for (std::size_t i = 1; i < size; ++i) {
    const auto byte = static_cast<unsigned char>(text[i]);
    if ((byte & 0xC0) != 0x80) return kNone;
    code = code << 6 | (byte & 0x3F);
  }
  constexpr char32_t kSmallestOfSize[] = {0, 0, 0x80, 0x800, 0x10000};
  if (code < kSmallestOfSize[size]) return kNone;
  // A surrogate or a number beyond the last code point has no upper case: it will be written as it was read.
  return {code, size};
}

void append(std::string& text, char32_t code) {
  const auto byte = [&text](char32_t value) { text += static_cast<char>(value); };
  if (code < 0x80) return byte(code);
  if (code < 0x800) {
    byte(0xC0 | code >> 6);
  } else {
    if (code < 0x10000) {
      byte(0xE0 | code >> 12);
    } else {
      byte(0xF0 | code >> 18);
      byte(0x80 | (code >> 12 & 0x3F));
    }
    byte(0x80 | (code >> 6 & 0x3F));
  }
  byte(0x80 | (code & 0x3F));
}

void appendUpperCase(std::string& text, char32_t code) {
  const auto special = std::lower_bound(
      std::begin(kSpecials), std::end(kSpecials), code, [](const SpecialUpperCase& entry, char32_t wanted) {
        return entry.code < wanted;
      });
  if (special != std::end(kSpecials) && special->code == code) {
    for (const char16_t upper : special->upper) {
      if (upper != 0) append(text, upper);
    }
    return;
  }
  const auto range = std::lower_bound(
      std::begin(kRanges), std::end(kRanges), code, [](const UpperCaseRange& entry, char32_t wanted) {
        return entry.last < wanted;
      });
  const bool isMapped =
      range != std::end(kRanges) && range->first <= code && (code - range->first) % range->stride == 0;
  append(text, isMapped ? static_cast<char32_t>(static_cast<std::int32_t>(code) + range->delta) : code);
}

}  // namespace

std::string upperCased(std::string_view text) {
  std::string result;
  result.reserve(text.size());
  while (!text.empty()) {
    const auto [code, size] = firstCharacter(text);
    if (size == 0) {
      result += text[0];
      text.remove_prefix(1);
    } else {
      appendUpperCase(result, code);
      text.remove_prefix(size);
    }
  }
  return result;
}
