// Preferences, serial queues and notifications in memory.
#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "host/ZQPreferences.h"
#include "tests/fakes/Fake.h"

namespace fakes {

// A read of a preference, or a synchronisation (key and scopes absent), and the queue that it ran on.
struct FakePreferenceCall {
  std::optional<std::string> key;
  std::string applicationID;
  std::optional<ZQPreferencesUser> userName;
  std::optional<ZQPreferencesHost> hostName;
  std::optional<std::string> queueLabel;
};

class FakePreferences final : public ZQPreferences, public Fake {
 public:
  FakePreferences();

  std::optional<RVValue> ZQPreferencesCopyValue(std::string_view key,
                                                std::string_view applicationID,
                                                ZQPreferencesUser userName,
                                                ZQPreferencesHost hostName) override;
  bool ZQPreferencesAppSynchronize(std::string_view applicationID) override;
  bool booleanValue(const RVValue& value) const override;

  // What somebody else stores; seen only after the application's preferences are synchronised where the
  // value was read before.
  void store(std::string_view key, std::string_view applicationID, std::optional<RVValue> value);

  std::vector<FakePreferenceCall> reads() const;
  std::vector<FakePreferenceCall> synchronisations() const;

 private:
  using Key = std::pair<std::string, std::string>;  // application, key

  mutable std::mutex mutex_;
  std::map<Key, RVValue> stored_;
  std::map<Key, std::optional<RVValue>> cache_;
  std::vector<FakePreferenceCall> reads_;
  std::vector<FakePreferenceCall> synchronisations_;
};

// A real queue with a thread of its own.
class FakeSerialQueue final : public ZQSerialQueue, public Fake {
 public:
  explicit FakeSerialQueue(std::string label);
  ~FakeSerialQueue();

  const std::string& label() const override;
  void dispatchSync(const std::function<void()>& work) override;
  void dispatchAsync(std::function<void()> work) override;

  // The label of the queue that the calling thread is working for; absent on other threads.
  static std::optional<std::string> currentLabel();

 private:
  struct State;
  static void runAll(const std::shared_ptr<State>& state);
  void put(std::function<void()> work);

  const std::string label_;
  const std::shared_ptr<State> state_;
  std::thread thread_;
};

class FakeSerialQueues final : public ZQSerialQueueFactory, public Fake {
 public:
  FakeSerialQueues();
  std::shared_ptr<ZQSerialQueue> createSerialQueue(std::string_view label) override;

  // The labels of all queues that were created, in order.
  std::vector<std::string> labels() const;

 private:
  mutable std::mutex mutex_;
  std::vector<std::string> labels_;
};

class FakeNotificationCenter final : public ZQNotificationCenter, public Fake {
 public:
  struct Registration {
    std::string name;
    std::shared_ptr<ZQSerialQueue> queue;
    std::function<void()> handler;
  };

  FakeNotificationCenter();
  // Tokens count from 1.
  int registerForNotification(std::string_view name,
                              std::shared_ptr<ZQSerialQueue> queue,
                              std::function<void()> handler) override;

  // Has the handlers of that name run, each on its queue; returns when they are done.
  void post(std::string_view name);

  std::vector<Registration> registrations() const;

 private:
  mutable std::mutex mutex_;
  std::vector<Registration> registrations_;
};

}  // namespace fakes
