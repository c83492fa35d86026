// How the stand-in server is told to misbehave.
#pragma once

#include <chrono>
#include <deque>
#include <map>
#include <mutex>
#include <optional>
#include <string>

namespace standin {

// One scripted answer. Unless it says something about the answer itself, it only delays the usual one.
struct ScriptedAnswer {
  enum class Drop { kNever, kBeforeHeaders, kAfterHeaders, kMidBody };

  std::optional<std::string> exchange;  // absent: whichever comes next
  bool replacesAnswer = false;
  int status = 200;
  std::multimap<std::string, std::string> headers;
  std::string body;
  std::chrono::milliseconds delay{0};  // before the first byte
  Drop drop = Drop::kNever;
  bool isEndless = false;              // the body is repeated until the client goes
  std::chrono::milliseconds pause{0};  // after each byte of the body
};

// Answers in order. Thread-safe.
class Script {
 public:
  Script() = default;

  // Throws std::runtime_error with a message for people where the text is no script.
  explicit Script(const std::string& text);

  // Takes the first answer that fits the exchange; none where the usual answer is to be given.
  std::optional<ScriptedAnswer> takeFor(const std::string& exchange);

 private:
  std::mutex mutex_;
  std::deque<ScriptedAnswer> answers_;
};

}  // namespace standin
