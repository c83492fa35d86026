#include "daemon/preferences/SerialQueues.h"

#include <condition_variable>
#include <deque>
#include <exception>
#include <future>
#include <mutex>
#include <string>
#include <thread>
#include <utility>

#include "daemon/log/Log.h"

namespace preferences {
namespace {

// What the queue and its thread share; the thread may outlive the queue.
struct Shared {
  std::mutex mutex;
  std::condition_variable changed;
  std::deque<std::function<void()>> work;
  bool isEnding = false;
};

void runOne(const std::function<void()>& work, RVLogService& log) {
  try {
    work();
  } catch (const std::exception& exception) {
    logging::error(log, "Work on a queue failed: %@", {RVValue(exception.what())});
  } catch (...) {
    logging::error(log, "Work on a queue failed.");
  }
}

void runAll(const std::shared_ptr<Shared>& shared, RVLogService& log) {
  std::unique_lock lock(shared->mutex);
  for (;;) {
    shared->changed.wait(lock, [&] { return shared->isEnding || !shared->work.empty(); });
    if (shared->work.empty()) return;
    {
      const std::function<void()> work = std::move(shared->work.front());
      shared->work.pop_front();
      lock.unlock();
      runOne(work, log);
    }
    // What the work held is gone by now, which may have been the queue itself.
    lock.lock();
  }
}

class SerialQueue : public ZQSerialQueue {
 public:
  SerialQueue(std::string label, RVLogService& log)
      : label_(std::move(label)),
        shared_(std::make_shared<Shared>()),
        thread_([shared = shared_, &log] { runAll(shared, log); }) {}

  ~SerialQueue() override {
    {
      const std::lock_guard lock(shared_->mutex);
      shared_->isEnding = true;
    }
    shared_->changed.notify_all();
    if (thread_.get_id() == std::this_thread::get_id()) {
      thread_.detach();
    } else {
      thread_.join();
    }
  }

  const std::string& label() const override { return label_; }

  void dispatchSync(const std::function<void()>& work) override {
    std::packaged_task<void()> task(work);
    std::future<void> done = task.get_future();
    put([&] { task(); });
    done.get();
  }

  void dispatchAsync(std::function<void()> work) override { put(std::move(work)); }

 private:
  void put(std::function<void()> work) {
    {
      const std::lock_guard lock(shared_->mutex);
      shared_->work.push_back(std::move(work));
    }
    shared_->changed.notify_all();
  }

  const std::string label_;
  const std::shared_ptr<Shared> shared_;
  std::thread thread_;
};

}  // namespace

SerialQueues::SerialQueues(RVLogService& log)
    : log_(log) {
}

std::shared_ptr<ZQSerialQueue> SerialQueues::createSerialQueue(std::string_view label) {
  return std::make_shared<SerialQueue>(std::string(label), log_);
}

}  // namespace preferences
