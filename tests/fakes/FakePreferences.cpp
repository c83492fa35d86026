#include "tests/fakes/FakePreferences.h"

#include <algorithm>
#include <exception>
#include <future>

namespace fakes {
namespace {

thread_local const std::string* currentQueueLabel = nullptr;

bool isWordForTrue(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(), [](char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
  });
  return text == "true" || text == "yes" || text == "on" || text == "1";
}

}  // namespace

FakePreferences::FakePreferences()
    : Fake("preferences") {
}

std::optional<RVValue> FakePreferences::ZQPreferencesCopyValue(std::string_view key,
                                                               std::string_view applicationID,
                                                               ZQPreferencesUser userName,
                                                               ZQPreferencesHost hostName) {
  begin("ZQPreferencesCopyValue");
  const std::lock_guard lock(mutex_);
  reads_.push_back(
      {std::string(key), std::string(applicationID), userName, hostName, FakeSerialQueue::currentLabel()});
  const Key place(applicationID, key);
  const auto cached = cache_.find(place);
  if (cached != cache_.end()) return cached->second;
  const auto found = stored_.find(place);
  return cache_[place] = found != stored_.end() ? std::optional(found->second) : std::nullopt;
}

bool FakePreferences::ZQPreferencesAppSynchronize(std::string_view applicationID) {
  begin("ZQPreferencesAppSynchronize");
  const std::lock_guard lock(mutex_);
  synchronisations_.push_back({std::nullopt,
                               std::string(applicationID),
                               std::nullopt,
                               std::nullopt,
                               FakeSerialQueue::currentLabel()});
  std::erase_if(cache_, [&](const auto& entry) { return entry.first.first == applicationID; });
  return true;
}

bool FakePreferences::booleanValue(const RVValue& value) const {
  begin("booleanValue");
  if (value.boolean() != nullptr) return *value.boolean();
  if (value.integer() != nullptr) return *value.integer() != 0;
  if (value.real() != nullptr) return *value.real() != 0;
  return value.string() != nullptr && isWordForTrue(*value.string());
}

void FakePreferences::store(std::string_view key,
                            std::string_view applicationID,
                            std::optional<RVValue> value) {
  const std::lock_guard lock(mutex_);
  const Key place(applicationID, key);
  if (value) {
    stored_[place] = *value;
  } else {
    stored_.erase(place);
  }
}

std::vector<FakePreferenceCall> FakePreferences::reads() const {
  const std::lock_guard lock(mutex_);
  return reads_;
}

std::vector<FakePreferenceCall> FakePreferences::synchronisations() const {
  const std::lock_guard lock(mutex_);
  return synchronisations_;
}

struct FakeSerialQueue::State {
  std::string label;
  std::mutex mutex;
  std::condition_variable changed;
  std::deque<std::function<void()>> work;
  bool ending = false;
};

FakeSerialQueue::FakeSerialQueue(std::string label)
    : Fake("serialQueue"),
      label_(label),
      state_(std::make_shared<State>()) {
  state_->label = std::move(label);
  thread_ = std::thread([state = state_] { runAll(state); });
}

FakeSerialQueue::~FakeSerialQueue() {
  {
    const std::lock_guard lock(state_->mutex);
    state_->ending = true;
  }
  state_->changed.notify_all();
  // The last reference may go in work of this very queue.
  if (thread_.get_id() == std::this_thread::get_id()) {
    thread_.detach();
  } else {
    thread_.join();
  }
}

const std::string& FakeSerialQueue::label() const {
  begin("label");
  return label_;
}

void FakeSerialQueue::dispatchSync(const std::function<void()>& work) {
  begin("dispatchSync");
  std::promise<void> done;
  std::future<void> ended = done.get_future();
  put([&] {
    try {
      work();
      done.set_value();
    } catch (...) {
      done.set_exception(std::current_exception());
    }
  });
  ended.get();
}

void FakeSerialQueue::dispatchAsync(std::function<void()> work) {
  begin("dispatchAsync");
  put(std::move(work));
}

std::optional<std::string> FakeSerialQueue::currentLabel() {
  if (currentQueueLabel == nullptr) return std::nullopt;
  return *currentQueueLabel;
}

void FakeSerialQueue::put(std::function<void()> work) {
  {
    const std::lock_guard lock(state_->mutex);
    state_->work.push_back(std::move(work));
  }
  state_->changed.notify_all();
}

void FakeSerialQueue::runAll(const std::shared_ptr<State>& state) {
  currentQueueLabel = &state->label;
  std::unique_lock lock(state->mutex);
  for (;;) {
    state->changed.wait(lock, [&] { return state->ending || !state->work.empty(); });
    if (state->work.empty()) return;
    {
      const std::function<void()> work = std::move(state->work.front());
      state->work.pop_front();
      lock.unlock();
      work();
    }
    lock.lock();
  }
}

FakeSerialQueues::FakeSerialQueues()
    : Fake("serialQueues") {
}

std::shared_ptr<ZQSerialQueue> FakeSerialQueues::createSerialQueue(std::string_view label) {
  begin("createSerialQueue");
  {
    const std::lock_guard lock(mutex_);
    labels_.emplace_back(label);
  }
  auto queue = std::make_shared<FakeSerialQueue>(std::string(label));
  queue->shareJournal(journal());
  return queue;
}

std::vector<std::string> FakeSerialQueues::labels() const {
  const std::lock_guard lock(mutex_);
  return labels_;
}

FakeNotificationCenter::FakeNotificationCenter()
    : Fake("notifications") {
}

int FakeNotificationCenter::registerForNotification(std::string_view name,
                                                    std::shared_ptr<ZQSerialQueue> queue,
                                                    std::function<void()> handler) {
  begin("registerForNotification");
  const std::lock_guard lock(mutex_);
  registrations_.push_back({std::string(name), std::move(queue), std::move(handler)});
  return static_cast<int>(registrations_.size());
}

void FakeNotificationCenter::post(std::string_view name) {
  for (const Registration& registration : registrations()) {
    if (registration.name == name) registration.queue->dispatchSync(registration.handler);
  }
}

std::vector<FakeNotificationCenter::Registration> FakeNotificationCenter::registrations() const {
  const std::lock_guard lock(mutex_);
  return registrations_;
}

}  // namespace fakes
