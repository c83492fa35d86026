#include "daemon/requests/RequestPool.h"

#include <malloc.h>

#include <algorithm>
#include <system_error>
#include <utility>

namespace requests {

RequestPool::RequestPool(std::size_t runningThreads,
                         std::size_t mostThreads,
                         std::chrono::milliseconds keepIdle)
    : runningThreads_(runningThreads),
      mostThreads_(mostThreads),
      keepIdle_(keepIdle) {
}

RequestPool::~RequestPool() {
  stop();
}

bool RequestPool::submit(std::function<void()> work) {
  std::list<std::thread> ended;
  {
    const std::lock_guard lock(mutex_);
    if (isStopping_) return false;
    queue_.push_back(std::move(work));
    if (!makeThreadIfNeeded() && threads_.empty()) {
      work = std::move(queue_.back());  // so that it is destroyed without the lock
      queue_.pop_back();
      return false;
    }
    ended.swap(ended_);
  }
  workArrived_.notify_one();
  joinEnded(std::move(ended));
  return true;
}

void RequestPool::beginWaiting() {
  const std::lock_guard lock(mutex_);
  ++waiting_;
  makeThreadIfNeeded();
}

void RequestPool::endWaiting() {
  const std::lock_guard lock(mutex_);
  --waiting_;
}

void RequestPool::stop() {
  std::unique_lock lock(mutex_);
  isStopping_ = true;
  workArrived_.notify_all();
  threadEnded_.wait(lock, [this] { return threads_.empty(); });
  std::list<std::thread> ended;
  ended.swap(ended_);
  lock.unlock();
  joinEnded(std::move(ended));
}

std::size_t RequestPool::threadCount() const {
  const std::lock_guard lock(mutex_);
  return threads_.size();
}

// Whether nothing stands in the way of the work that is queued. Called with the lock held.
bool RequestPool::makeThreadIfNeeded() {
  if (queue_.size() <= idle_) return true;
  if (threads_.size() >= std::min(runningThreads_ + waiting_, mostThreads_)) return true;
  const Thread self = threads_.emplace(threads_.end());
  try {
    *self = std::thread([this, self] { run(self); });
    return true;
  } catch (const std::system_error&) {  // the system has no thread left; those that run go on
    threads_.erase(self);
    return false;
  }
}

void RequestPool::run(Thread self) {
  std::unique_lock lock(mutex_);
  for (;;) {
    ++idle_;
    const bool hasWork =
        workArrived_.wait_for(lock, keepIdle_, [this] { return isStopping_ || !queue_.empty(); });
    --idle_;
    if (!hasWork || queue_.empty()) break;
    auto work = std::move(queue_.front());
    queue_.pop_front();
    lock.unlock();
    work();
    work = nullptr;  // what it holds may take locks of its own when it goes
    lock.lock();
  }
  // Those that ended before are joined here, and so keep nothing of what a burst of requests needed.
  std::list<std::thread> endedBefore;
  endedBefore.swap(ended_);
  ended_.splice(ended_.end(), threads_, self);
  threadEnded_.notify_all();
  lock.unlock();
  joinEnded(std::move(endedBefore));
  ::malloc_trim(0);
}

void RequestPool::joinEnded(std::list<std::thread> ended) {
  for (auto& thread : ended) thread.join();
}

}  // namespace requests
