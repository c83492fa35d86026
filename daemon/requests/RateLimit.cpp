#include "daemon/requests/RateLimit.h"

#include <algorithm>
#include <utility>

namespace requests {

RateLimit::RateLimit(std::size_t perSecond, std::function<Time()> now)
    : perSecond_(static_cast<double>(perSecond)),
      now_(std::move(now)) {
}

double RateLimit::callsAt(const Allowance& allowance, Time now) const {
  const std::chrono::duration<double> passed = now - allowance.counted;
  return std::min(perSecond_, allowance.calls + passed.count() * perSecond_);
}

bool RateLimit::take(const std::string& clientKey) {
  const Time now = now_();
  const std::lock_guard lock(mutex_);
  auto entry = allowances_.find(clientKey);
  if (entry == allowances_.end()) {
    std::erase_if(allowances_, [&](const auto& other) { return callsAt(other.second, now) >= perSecond_; });
    entry = allowances_.emplace(clientKey, Allowance{perSecond_, now}).first;
  }
  auto& allowance = entry->second;
  allowance = {callsAt(allowance, now), now};
  if (allowance.calls < 1) return false;
  allowance.calls -= 1;
  return true;
}

}  // namespace requests
