// What an operation came to: a value, or why there is none.
#pragma once

#include <string>
#include <type_traits>
#include <utility>
#include <variant>

namespace base {

enum class FailureKind {
  kFailed,    // it could not be done; trying again later may help
  kInvalid,   // what was asked for makes no sense
  kNotFound,  // what it was asked for is not there
  kRefused,   // it could be done, but must not
  kDamaged,   // what is stored cannot be read
};

// message: one sentence for a person, without a full stop at its end and without any secret.
struct Failure {
  FailureKind kind = FailureKind::kFailed;
  std::string message;
};

template <typename T>
class [[nodiscard]] Result {
 public:
  Result(T value)
      : content_(std::in_place_index<0>, std::move(value)) {}
  Result(Failure failure)
      : content_(std::in_place_index<1>, std::move(failure)) {}

  explicit operator bool() const { return content_.index() == 0; }

  // Only where there is a value.
  T& operator*() & { return std::get<0>(content_); }
  const T& operator*() const& { return std::get<0>(content_); }
  T&& operator*() && { return std::get<0>(std::move(content_)); }
  T* operator->() { return &std::get<0>(content_); }
  const T* operator->() const { return &std::get<0>(content_); }

  // Only where there is none.
  const Failure& failure() const { return std::get<1>(content_); }

 private:
  static_assert(!std::is_same_v<std::decay_t<T>, Failure>);
  std::variant<T, Failure> content_;
};

template <>
class [[nodiscard]] Result<void> {
 public:
  Result() = default;  // success
  Result(Failure failure)
      : content_(std::move(failure)) {}

  explicit operator bool() const { return content_.index() == 0; }
  const Failure& failure() const { return std::get<1>(content_); }

 private:
  std::variant<std::monostate, Failure> content_;
};

}  // namespace base
