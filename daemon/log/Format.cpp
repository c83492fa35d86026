#include "daemon/log/Format.h"

#include <array>
#include <charconv>
#include <cstddef>

#include "host/Constants.h"

namespace logging {
namespace {

constexpr std::string_view kMaskedMember = "access_token";
constexpr std::string_view kMask = "<masked>";

bool isDigit(char character) {
  return character >= '0' && character <= '9';
}

template <typename Number>
std::string numberText(Number number) {
  std::array<char, 64> digits{};
  const auto written = std::to_chars(digits.data(), digits.data() + digits.size(), number);
  return {digits.data(), written.ptr};
}

std::string quoted(std::string_view text) {
  std::string result = "\"";
  for (const char character : text) {
    if (character == '"' || character == '\\') result += '\\';
    result += character;
  }
  return result += '"';
}

std::string describeMember(const RVValue& value) {
  return value.string() != nullptr ? quoted(*value.string()) : describe(value);
}

// A placeholder at the start of a text: how long it is, and which argument it names (counted from zero),
// where it names one.
struct Placeholder {
  std::size_t length;
  std::optional<std::size_t> position;
};

bool isConversion(std::string_view text, std::size_t at) {
  return at < text.size() && (text[at] == '@' || text[at] == 'd');
}

// `text` begins with a percent sign.
std::optional<Placeholder> placeholderAtStart(std::string_view text) {
  if (isConversion(text, 1)) return Placeholder{2, std::nullopt};
  std::size_t end = 1;
  while (end < text.size() && isDigit(text[end])) ++end;
  if (end == 1 || end == text.size() || text[end] != '$' || !isConversion(text, end + 1)) return std::nullopt;
  std::size_t number = 0;
  const auto read = std::from_chars(text.data() + 1, text.data() + end, number);
  if (read.ec != std::errc()) return Placeholder{end + 2, static_cast<std::size_t>(-1)};
  if (number == 0) return std::nullopt;
  return Placeholder{end + 2, number - 1};
}

}  // namespace

std::string stringWithFormat(std::string_view format, const std::vector<std::optional<RVValue>>& arguments) {
  std::string result;
  std::size_t next = 0;
  while (!format.empty()) {
    const std::size_t percent = format.find('%');
    result += format.substr(0, percent);
    if (percent == std::string_view::npos) break;
    format.remove_prefix(percent);
    if (format.starts_with("%%")) {
      result += '%';
      format.remove_prefix(2);
    } else if (const auto placeholder = placeholderAtStart(format)) {
      const std::size_t position = placeholder->position ? *placeholder->position : next++;
      const bool isThere = position < arguments.size() && arguments[position].has_value();
      result += isThere ? describe(*arguments[position]) : std::string(kRVAbsentValueText);
      format.remove_prefix(placeholder->length);
    } else {
      result += '%';
      format.remove_prefix(1);
    }
  }
  return result;
}

std::string describe(const RVValue& value) {
  if (const std::string* text = value.string()) return *text;
  if (const bool* boolean = value.boolean()) return *boolean ? "true" : "false";
  if (const std::int64_t* integer = value.integer()) return numberText(*integer);
  if (const double* real = value.real()) return numberText(*real);
  std::string members;
  if (const RVArray* array = value.array()) {
    for (const RVValue& member : *array) members += (members.empty() ? "" : ", ") + describeMember(member);
    return "(" + members + ")";
  }
  if (const RVDictionary* dictionary = value.dictionary()) {
    for (const auto& [key, member] : *dictionary)
      members += (members.empty() ? "" : "; ") + quoted(key) + " = " + describeMember(member);
    return "{" + members + "}";
  }
  return std::string(kRVAbsentValueText);
}

RVValue masked(const RVValue& value) {
  if (const RVArray* array = value.array()) {
    RVArray result;
    result.reserve(array->size());
    for (const RVValue& member : *array) result.push_back(masked(member));
    return result;
  }
  if (const RVDictionary* dictionary = value.dictionary()) {
    RVDictionary result;
    for (const auto& [key, member] : *dictionary)
      result.emplace(key, key == kMaskedMember ? RVValue(kMask) : masked(member));
    return result;
  }
  return value;
}

}  // namespace logging
