#include "daemon/http/JSONReader.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <limits>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace http {
namespace {

using JSON = nlohmann::json;

RVJSONResult failure(JSONErrorCode code, std::string text) {
  RVError error{std::string(kRVJSONErrorDomain),
                static_cast<std::int64_t>(code),
                {{std::string(kRVErrorLocalizedDescriptionKey), std::move(text)}}};
  return {std::nullopt, std::move(error)};
}

// "line 2, column 7" of the byte at the offset.
std::string placeOf(std::string_view data, std::size_t offset) {
  const std::string_view before = data.substr(0, offset);
  const auto line = 1 + std::count(before.begin(), before.end(), '\n');
  const std::size_t lineStart = before.rfind('\n') + 1;  // npos + 1 is 0
  return "line " + std::to_string(line) + ", column " + std::to_string(before.size() - lineStart + 1);
}

// What the parser says is wrong, without the place, which it counts otherwise, and without the text it
// read, which may hold a token: "syntax error while parsing value - invalid literal".
std::string reasonOf(const JSON::exception& exception) {
  const std::string_view what = exception.what();
  const std::size_t start = what.find("syntax error");
  if (start == std::string_view::npos) return "it cannot be parsed";
  return std::string(what.substr(start, what.find("; last read", start) - start));
}

// Builds the value while the parser walks through the document. A function that returns false ends the
// walk.
class ValueBuilder final : public nlohmann::json_sax<JSON> {
 public:
  std::optional<RVValue> value;
  std::optional<JSONErrorCode> problem;
  std::string reason = "it cannot be parsed";  // with kNotJSON

  bool fail(JSONErrorCode code) {
    problem = code;
    return false;
  }

  bool null() override { return add(RVValue()); }
  bool boolean(bool boolean) override { return add(boolean); }
  bool number_integer(number_integer_t number) override { return add(std::int64_t{number}); }
  bool number_unsigned(number_unsigned_t number) override {
    if (number > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()))
      return fail(JSONErrorCode::kNumberOutOfRange);
    return add(static_cast<std::int64_t>(number));
  }
  bool number_float(number_float_t number, const string_t& text) override {
    // The parser turns an integer that is too large for it into a double.
    if (text.find_first_of(".eE") == std::string::npos) return fail(JSONErrorCode::kNumberOutOfRange);
    return add(number);
  }
  bool string(string_t& text) override { return add(std::move(text)); }
  bool binary(binary_t&) override { return fail(JSONErrorCode::kNotJSON); }  // not in JSON texts

  bool start_object(std::size_t) override { return open(false); }
  bool start_array(std::size_t) override { return open(true); }
  bool key(string_t& name) override {
    Container& object = open_.back();
    object.key = std::move(name);
    return object.members.count(object.key) == 0 || fail(JSONErrorCode::kRepeatedKey);
  }
  bool end_object() override { return close(); }
  bool end_array() override { return close(); }

  bool parse_error(std::size_t, const std::string&, const JSON::exception& exception) override {
    constexpr int kNumberOverflow = 406;
    problem = exception.id == kNumberOverflow ? JSONErrorCode::kNumberOutOfRange : JSONErrorCode::kNotJSON;
    reason = reasonOf(exception);
    return false;
  }

 private:
  struct Container {
    bool isArray = false;
    RVArray elements;
    RVDictionary members;
    std::string key;  // of the member whose value comes next
  };

  bool add(RVValue one) {
    if (open_.empty())
      value = std::move(one);
    else if (open_.back().isArray)
      open_.back().elements.push_back(std::move(one));
    else
      open_.back().members.emplace(std::move(open_.back().key), std::move(one));
    return true;
  }

  bool open(bool isArray) {
    if (open_.size() == kMaximumJSONDepth) return fail(JSONErrorCode::kTooDeep);
    open_.emplace_back().isArray = isArray;
    return true;
  }

  bool close() {
    Container closed = std::move(open_.back());
    open_.pop_back();
    return closed.isArray ? add(std::move(closed.elements)) : add(std::move(closed.members));
  }

  std::vector<Container> open_;
};

// Walks over the document and tells how far the parser has come, so that what our own rules refuse has a
// place as well.
class Position {
 public:
  using iterator_category = std::input_iterator_tag;
  using value_type = char;
  using difference_type = std::ptrdiff_t;
  using pointer = const char*;
  using reference = const char&;

  Position(const char* at, const char*& furthest)
      : at_(at),
        furthest_(&furthest) {}
  reference operator*() const { return *at_; }
  Position& operator++() {
    *furthest_ = ++at_;
    return *this;
  }
  friend bool operator==(const Position& a, const Position& b) { return a.at_ == b.at_; }

 private:
  const char* at_;
  const char** furthest_;
};

std::string textOf(JSONErrorCode code, const std::string& reason) {
  switch (code) {
    case JSONErrorCode::kTooDeep:
      return "it nests deeper than " + std::to_string(kMaximumJSONDepth) + " levels";
    case JSONErrorCode::kRepeatedKey:
      return "a key stands in its object for the second time";
    case JSONErrorCode::kNumberOutOfRange:
      return "a number is out of range";
    default:
      return reason;
  }
}

}  // namespace

RVJSONResult JSONReader::objectWithData(std::string_view data) {
  if (data.size() > kMaximumJSONSize)
    return failure(JSONErrorCode::kTooLarge,
                   "The document has " + std::to_string(data.size()) + " bytes, more than the " +
                       std::to_string(kMaximumJSONSize) + " that are read.");
  const auto refusal = [data](JSONErrorCode code, std::size_t offset, const std::string& text) {
    return failure(code, "The document cannot be read: " + placeOf(data, offset) + ": " + text + ".");
  };
  if (data.substr(0, 3) == "\xEF\xBB\xBF")
    return refusal(JSONErrorCode::kNotJSON, 0, "it begins with a byte order mark");
  // The parser would take it for the end of the document.
  if (const std::size_t zero = data.find('\0'); zero != std::string_view::npos)
    return refusal(JSONErrorCode::kNotJSON, zero, "a zero byte");

  const char* const begin = data.data();
  const char* furthest = begin;
  ValueBuilder builder;
  try {
    JSON::sax_parse(Position(begin, furthest), Position(begin + data.size(), furthest), &builder);
  } catch (const JSON::exception&) {
    builder.fail(JSONErrorCode::kNotJSON);
  }
  if (!builder.problem) return {std::move(builder.value), std::nullopt};
  const auto read = static_cast<std::size_t>(furthest - begin);
  return refusal(*builder.problem, read > 0 ? read - 1 : 0, textOf(*builder.problem, builder.reason));
}

}  // namespace http
