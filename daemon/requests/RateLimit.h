// How often a client may call.
#pragma once

#include <chrono>
#include <functional>
#include <mutex>
#include <string>
#include <unordered_map>

namespace requests {

// Lets each client through so many times a second; what it has not used of the last second it may use at
// once. Thread-safe.
class RateLimit {
 public:
  using Time = std::chrono::steady_clock::time_point;

  RateLimit(std::size_t perSecond, std::function<Time()> now);

  // Whether the client may call now; where it may, the call is counted.
  bool take(const std::string& clientKey);

 private:
  // What is left to a client, and when it was counted.
  struct Allowance {
    double calls;
    Time counted;
  };
  double callsAt(const Allowance& allowance, Time now) const;

  const double perSecond_;
  const std::function<Time()> now_;
  std::mutex mutex_;
  std::unordered_map<std::string, Allowance> allowances_;  // of those who have not all; guarded by mutex_
};

}  // namespace requests
