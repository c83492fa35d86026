#include "daemon/requests/WaitingLimits.h"

namespace requests {

WaitingLimits::WaitingLimits(RequestPool& pool, std::size_t perClient, std::size_t inAll)
    : pool_(pool),
      perClient_(perClient),
      inAll_(inAll) {
}

bool WaitingLimits::beginWaiting(const std::string& clientKey) {
  {
    const std::lock_guard lock(mutex_);
    if (waiting_ >= inAll_) return false;
    const auto entry = waitingOfClient_.try_emplace(clientKey, 0).first;
    if (entry->second >= perClient_) {
      if (entry->second == 0) waitingOfClient_.erase(entry);
      return false;
    }
    ++entry->second;
    ++waiting_;
  }
  pool_.beginWaiting();
  return true;
}

void WaitingLimits::endWaiting(const std::string& clientKey) {
  {
    const std::lock_guard lock(mutex_);
    --waiting_;
    const auto entry = waitingOfClient_.find(clientKey);
    if (--entry->second == 0) waitingOfClient_.erase(entry);
  }
  pool_.endWaiting();
}

bool UnlimitedWaiting::beginWaiting(const std::string&) {
  pool_.beginWaiting();
  return true;
}

void UnlimitedWaiting::endWaiting(const std::string&) {
  pool_.endWaiting();
}

}  // namespace requests
