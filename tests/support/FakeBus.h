// A bus driver and a bus thread that do what the test tells them.
#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "daemon/clients/Identities.h"

namespace support {

// Answers from what it is told of each connection: at once, or when the test says so.
class FakeBusDriver final : public clients::BusDriver {
 public:
  void ask(const std::string& uniqueName, Answered answered) override {
    ++asked;
    if (!answersAtOnce) return questions_.emplace_back(uniqueName, std::move(answered)), void();
    answered(answerFor(uniqueName));
  }

  // Answers the oldest question; false where there is none.
  bool answerOne() {
    if (questions_.empty()) return false;
    auto [name, answered] = std::move(questions_.front());
    questions_.pop_front();
    answered(answerFor(name));
    return true;
  }
  std::size_t open() const { return questions_.size(); }

  std::map<std::string, Credentials> connections;  // those not named have left
  std::function<void()> beforeAnswer;
  bool answersAtOnce = true;
  int asked = 0;

 private:
  Credentials answerFor(const std::string& name) {
    if (beforeAnswer) beforeAnswer();
    const auto entry = connections.find(name);
    return entry != connections.end() ? entry->second : Credentials();
  }
  std::deque<std::pair<std::string, Answered>> questions_;
};

// Work that was posted to the bus thread, which is the test's own.
class FakeLoop {
 public:
  std::function<void(std::function<void()>)> post() {
    return [this](std::function<void()> work) {
      const std::lock_guard lock(mutex_);
      posted_.push_back(std::move(work));
      arrived_.notify_all();
    };
  }

  // Runs the next piece of work, when it is there.
  void runOne() {
    std::unique_lock lock(mutex_);
    arrived_.wait(lock, [this] { return !posted_.empty(); });
    auto work = std::move(posted_.front());
    posted_.pop_front();
    lock.unlock();
    work();
  }
  bool isEmpty() {
    const std::lock_guard lock(mutex_);
    return posted_.empty();
  }

 private:
  std::mutex mutex_;
  std::condition_variable arrived_;
  std::deque<std::function<void()>> posted_;
};

}  // namespace support
