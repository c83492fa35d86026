// The time of day, as it is written into what lasts.
#pragma once

#include <chrono>
#include <functional>

namespace state {

// Tells the time in whole seconds. Called from any thread.
using Clock = std::function<std::chrono::sys_seconds()>;

// The computer's own clock.
inline std::chrono::sys_seconds systemTime() {
  return std::chrono::floor<std::chrono::seconds>(std::chrono::system_clock::now());
}

}  // namespace state
