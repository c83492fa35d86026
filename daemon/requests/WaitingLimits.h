// How many requests may wait at a time.
#pragma once

#include <cstddef>
#include <mutex>
#include <string>
#include <unordered_map>

#include "daemon/requests/RequestContext.h"
#include "daemon/requests/RequestPool.h"

namespace requests {

// Counts waiting requests against the limits, and tells the pool of them.
class WaitingLimits final : public WaitingLimiter {
 public:
  // pool: outlives this object. perClient, inAll: how many requests may wait at a time.
  WaitingLimits(RequestPool& pool, std::size_t perClient, std::size_t inAll);

  bool beginWaiting(const std::string& clientKey) override;
  void endWaiting(const std::string& clientKey) override;

 private:
  RequestPool& pool_;
  const std::size_t perClient_;
  const std::size_t inAll_;

  std::mutex mutex_;
  std::size_t waiting_ = 0;
  std::unordered_map<std::string, std::size_t> waitingOfClient_;
};

// For what the device's user has the daemon do: not limited, but the pool is told.
class UnlimitedWaiting final : public WaitingLimiter {
 public:
  explicit UnlimitedWaiting(RequestPool& pool)
      : pool_(pool) {}
  bool beginWaiting(const std::string& clientKey) override;
  void endWaiting(const std::string& clientKey) override;

 private:
  RequestPool& pool_;
};

}  // namespace requests
