// Plain values that cross the seam between host and plug-in.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "host/Constants.h"

class RVValue;
using RVArray = std::vector<RVValue>;
using RVDictionary = std::map<std::string, RVValue, std::less<>>;

// Facebook permission names. Enumerates in byte order, so that whatever is made of a set (a sentence,
// a server parameter, a stored record) is the same on every run.
using RVPermissionSet = std::set<std::string, std::less<>>;

// One immutable, untyped value: an option, a piece of a JSON document, a preference, an entry of an
// error's user-info, an argument of a log line. Copies are cheap (containers are shared) and safe to
// hand to another thread. "Null" is JSON's null; a value that is not there at all is an empty
// std::optional<RVValue>.
class RVValue {
 public:
  RVValue() = default;  // null
  RVValue(bool value)
      : value_(value) {}
  RVValue(std::int64_t value)
      : value_(value) {}
  RVValue(int value)
      : value_(std::int64_t{value}) {}
  RVValue(double value)
      : value_(value) {}
  RVValue(std::string value)
      : value_(std::move(value)) {}
  RVValue(std::string_view value)
      : value_(std::string(value)) {}
  RVValue(const char* value)
      : value_(std::string(value)) {}
  RVValue(RVArray value)
      : value_(std::make_shared<const RVArray>(std::move(value))) {}
  RVValue(RVDictionary value)
      : value_(std::make_shared<const RVDictionary>(std::move(value))) {}

  bool isNull() const { return std::holds_alternative<std::monostate>(value_); }

  // Each returns a pointer into this value, or a null pointer where it is of another type. The
  // pointer lives as long as this value, a container's as long as any copy of the value.
  const bool* boolean() const { return std::get_if<bool>(&value_); }
  const std::int64_t* integer() const { return std::get_if<std::int64_t>(&value_); }
  const double* real() const { return std::get_if<double>(&value_); }
  const std::string* string() const { return std::get_if<std::string>(&value_); }
  const RVArray* array() const { return container<RVArray>(); }
  const RVDictionary* dictionary() const { return container<RVDictionary>(); }

  // Same type and same content; 1, 1.0 and true are three different values.
  friend bool operator==(const RVValue& a, const RVValue& b) {
    if (const RVArray* array = a.array()) return b.array() != nullptr && *array == *b.array();
    if (const RVDictionary* dictionary = a.dictionary())
      return b.dictionary() != nullptr && *dictionary == *b.dictionary();
    return a.value_ == b.value_;
  }

 private:
  template <typename Container>
  const Container* container() const {
    const auto* shared = std::get_if<std::shared_ptr<const Container>>(&value_);
    return shared != nullptr ? shared->get() : nullptr;
  }

  std::variant<std::monostate,
               bool,
               std::int64_t,
               double,
               std::string,
               std::shared_ptr<const RVArray>,
               std::shared_ptr<const RVDictionary>>
      value_;
};

// The value under `key`, or a null pointer where the dictionary has none. Lives as long as the
// dictionary.
inline const RVValue* RVValueForKey(const RVDictionary& dictionary, std::string_view key) {
  const auto entry = dictionary.find(key);
  return entry != dictionary.end() ? &entry->second : nullptr;
}

// Why something failed, as it is reported to whoever asked. An operation that failed without a
// reason reports an empty std::optional<RVError>.
struct RVError {
  std::string domain;
  std::int64_t code = 0;
  RVDictionary userInfo;

  // The text for a person (the entry kRVErrorLocalizedDescriptionKey), absent where there is none.
  std::optional<std::string> localizedDescription() const {
    const RVValue* text = RVValueForKey(userInfo, kRVErrorLocalizedDescriptionKey);
    if (text == nullptr || text->string() == nullptr) return std::nullopt;
    return *text->string();
  }

  friend bool operator==(const RVError&, const RVError&) = default;
};
