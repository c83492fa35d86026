#include "daemon/state/ValueText.h"

#include <unistr.h>

#include <cstdint>
#include <limits>
#include <nlohmann/json.hpp>
#include <optional>
#include <utility>

namespace state {
namespace {

using JSON = nlohmann::json;

// JSON knows UTF-8 alone. A byte that is none is written as this mark, a code point that no text has any use
// for, and two hexadecimal digits; so are the bytes of the mark itself where a text has it.
constexpr std::string_view kByteMark = "\xef\xb7\x90";  // U+FDD0
constexpr std::string_view kDigits = "0123456789abcdef";
constexpr int kMaximalDepth = 64;

void appendByte(std::string& text, char byte) {
  const auto number = static_cast<unsigned char>(byte);
  text += kByteMark;
  text += kDigits[number >> 4];
  text += kDigits[number & 15];
}

// How many bytes at the beginning are UTF-8.
std::size_t validLength(std::string_view bytes) {
  const auto* begin = reinterpret_cast<const std::uint8_t*>(bytes.data());
  const std::uint8_t* invalid = u8_check(begin, bytes.size());
  return invalid == nullptr ? bytes.size() : static_cast<std::size_t>(invalid - begin);
}

std::string escaped(std::string_view bytes) {
  std::string text;
  while (!bytes.empty()) {
    std::size_t valid = validLength(bytes);
    const std::size_t mark = bytes.substr(0, valid).find(kByteMark);
    if (mark == 0) {
      for (const char byte : kByteMark) appendByte(text, byte);
      bytes.remove_prefix(kByteMark.size());
      continue;
    }
    if (mark != std::string_view::npos) valid = mark;
    text += bytes.substr(0, valid);
    bytes.remove_prefix(valid);
    if (valid == 0) {
      appendByte(text, bytes.front());
      bytes.remove_prefix(1);
    }
  }
  return text;
}

std::optional<std::string> unescaped(std::string_view text) {
  std::string bytes;
  for (;;) {
    const std::size_t mark = text.find(kByteMark);
    bytes += text.substr(0, mark);
    if (mark == std::string_view::npos) return bytes;
    text.remove_prefix(mark + kByteMark.size());
    if (text.size() < 2) return std::nullopt;
    const std::size_t high = kDigits.find(text[0]);
    const std::size_t low = kDigits.find(text[1]);
    if (high == std::string_view::npos || low == std::string_view::npos) return std::nullopt;
    bytes += static_cast<char>(high << 4 | low);
    text.remove_prefix(2);
  }
}

JSON toJSON(const RVValue& value) {
  if (const bool* boolean = value.boolean()) return *boolean;
  if (const std::int64_t* integer = value.integer()) return *integer;
  if (const double* real = value.real()) return *real;
  if (const std::string* string = value.string()) return escaped(*string);
  if (const RVArray* array = value.array()) {
    JSON elements = JSON::array();
    for (const RVValue& element : *array) elements.push_back(toJSON(element));
    return elements;
  }
  if (const RVDictionary* dictionary = value.dictionary()) {
    JSON members = JSON::object();
    for (const auto& [key, member] : *dictionary) members[escaped(key)] = toJSON(member);
    return members;
  }
  return nullptr;
}

// Absent where the document holds something that no value became.
std::optional<RVValue> toValue(const JSON& json) {
  switch (json.type()) {
    case JSON::value_t::null:
      return RVValue();
    case JSON::value_t::boolean:
      return RVValue(json.get<bool>());
    case JSON::value_t::number_integer:
      return RVValue(json.get<std::int64_t>());
    case JSON::value_t::number_unsigned:
      if (json.get<std::uint64_t>() > std::numeric_limits<std::int64_t>::max()) return std::nullopt;
      return RVValue(json.get<std::int64_t>());
    case JSON::value_t::number_float:
      return RVValue(json.get<double>());
    case JSON::value_t::string: {
      auto string = unescaped(json.get_ref<const std::string&>());
      if (!string) return std::nullopt;
      return RVValue(*std::move(string));
    }
    case JSON::value_t::array: {
      RVArray elements;
      for (const JSON& element : json) {
        auto value = toValue(element);
        if (!value) return std::nullopt;
        elements.push_back(*std::move(value));
      }
      return RVValue(std::move(elements));
    }
    case JSON::value_t::object: {
      RVDictionary members;
      for (const auto& [name, member] : json.items()) {
        auto key = unescaped(name);
        auto value = toValue(member);
        if (!key || !value) return std::nullopt;
        members.insert_or_assign(*std::move(key), *std::move(value));
      }
      return RVValue(std::move(members));
    }
    default:
      return std::nullopt;
  }
}

}  // namespace

std::string textFromValue(const RVValue& value) {
  return toJSON(value).dump();
}

base::Result<RVValue> valueFromText(std::string_view text) {
  const base::Failure damaged{base::FailureKind::kDamaged, "the stored text is no value"};
  bool isTooDeep = false;
  try {
    const JSON json = JSON::parse(text, [&](int depth, JSON::parse_event_t, const JSON&) {
      isTooDeep = isTooDeep || depth > kMaximalDepth;
      return !isTooDeep;
    });
    if (isTooDeep) return damaged;
    if (auto value = toValue(json)) return *std::move(value);
  } catch (const JSON::exception&) {  // quotes the text, which is nobody's business
  }
  return damaged;
}

}  // namespace state
