// The threads on which plug-in calls run.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <list>
#include <mutex>
#include <thread>

namespace requests {

// Runs work on threads of its own. It has a few threads for work that runs, and one more for each piece of
// work that waits for the user or the server; so work that needs neither never waits behind one that
// does. Threads that had nothing to do for a while end.
//
// Thread-safe.
class RequestPool {
 public:
  // runningThreads: for work that does not wait. mostThreads: in all; at least runningThreads.
  // keepIdle: how long an idle thread stays.
  RequestPool(std::size_t runningThreads, std::size_t mostThreads, std::chrono::milliseconds keepIdle);
  RequestPool(const RequestPool&) = delete;
  RequestPool& operator=(const RequestPool&) = delete;

  // As stop().
  ~RequestPool();

  // Has the work run soon. Returns false, and destroys the work unused, where the pool has stopped or the
  // system gives it no thread at all. The work does not throw.
  bool submit(std::function<void()> work);

  // Says that one more piece of work waits, or that one has stopped waiting.
  void beginWaiting();
  void endWaiting();

  // Takes no more work, runs what was submitted, and returns when all threads have ended. What waits must
  // be made to end by somebody else. Not called from work.
  void stop();

  std::size_t threadCount() const;

 private:
  using Thread = std::list<std::thread>::iterator;

  bool makeThreadIfNeeded();
  void run(Thread self);
  void joinEnded(std::list<std::thread> ended);

  const std::size_t runningThreads_;
  const std::size_t mostThreads_;
  const std::chrono::milliseconds keepIdle_;

  mutable std::mutex mutex_;  // protects everything below
  std::condition_variable workArrived_;
  std::condition_variable threadEnded_;
  std::deque<std::function<void()>> queue_;
  std::list<std::thread> threads_;
  std::list<std::thread> ended_;  // to be joined
  std::size_t idle_ = 0;
  std::size_t waiting_ = 0;
  bool isStopping_ = false;
};

}  // namespace requests
