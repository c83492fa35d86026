// What an operation answers that can fail for a reason worth telling a person.
#pragma once

#include <string>
#include <utility>
#include <variant>

namespace base {

// Why something could not be done: a text for a log line or for standard error. Holds no secret.
struct Problem {
  std::string text;
};

// A value, or the problem that stood in its way.
template <typename Value>
class [[nodiscard]] Result {
 public:
  Result(Value value)
      : content_(std::move(value)) {}
  Result(Problem problem)
      : content_(std::move(problem)) {}

  bool hasValue() const { return std::holds_alternative<Value>(content_); }
  explicit operator bool() const { return hasValue(); }

  // Only where there is one; anything else is a bug and throws std::bad_variant_access.
  const Value& value() const& { return std::get<Value>(content_); }
  Value& value() & { return std::get<Value>(content_); }
  Value&& value() && { return std::get<Value>(std::move(content_)); }

  // Only where there is no value.
  const std::string& problem() const { return std::get<Problem>(content_).text; }

 private:
  std::variant<Value, Problem> content_;
};

}  // namespace base
