// What an operation answers that can fail for a reason worth telling a person.
#pragma once

#include <string>
#include <utility>
#include <variant>

namespace base {

// What a caller can make of a problem.
enum class ProblemKind {
  kFailed,    // it could not be done; trying again later may help
  kInvalid,   // what was asked for makes no sense
  kNotFound,  // what it was asked for is not there
  kRefused,   // it could be done, but must not
  kDamaged,   // what is stored cannot be read
};

// Why something could not be done: a text for a log line or for standard error. Holds no secret.
struct Problem {
  std::string text;
  ProblemKind kind = ProblemKind::kFailed;
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
  const std::string& problem() const { return reason().text; }
  const Problem& reason() const { return std::get<Problem>(content_); }

 private:
  std::variant<Value, Problem> content_;
};

// Success, or the problem that stood in its way.
template <>
class [[nodiscard]] Result<void> {
 public:
  Result() = default;  // success
  Result(Problem problem)
      : content_(std::move(problem)) {}

  explicit operator bool() const { return content_.index() == 0; }

  // Only where it failed.
  const std::string& problem() const { return reason().text; }
  const Problem& reason() const { return std::get<Problem>(content_); }

 private:
  std::variant<std::monostate, Problem> content_;
};

}  // namespace base
