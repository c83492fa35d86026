#include "tests/fakes/FakeUserNotifications.h"

#include <algorithm>
#include <chrono>
#include <stdexcept>

namespace fakes {
namespace {

// An opaque alert is the FakeAlert itself; a host of its own kind may define ZQUserNotification, so this
// one does not.
ZQUserNotificationRef opaque(FakeAlert* alert) {
  return reinterpret_cast<ZQUserNotificationRef>(alert);
}

}  // namespace

FakeUserNotifications::FakeUserNotifications()
    : Fake("userNotifications"),
      answers_{0} {
}

FakeUserNotifications::~FakeUserNotifications() = default;

ZQUserNotificationRef FakeUserNotifications::ZQUserNotificationCreate(const ZQAllocator* allocator,
                                                                      double timeout,
                                                                      unsigned long flags,
                                                                      int* error,
                                                                      const RVDictionary& dictionary) {
  begin("ZQUserNotificationCreate");
  const std::lock_guard lock(mutex_);
  if (failToCreate_) return nullptr;
  auto alert = std::make_unique<FakeAlert>();
  alert->description = dictionary;
  alert->timeout = timeout;
  alert->flags = flags;
  alert->defaultAllocator = allocator == kZQAllocatorDefault;
  alert->errorWanted = error != nullptr;
  alerts_.push_back(std::move(alert));
  return opaque(alerts_.back().get());
}

int FakeUserNotifications::ZQUserNotificationReceiveResponse(ZQUserNotificationRef notification,
                                                             double timeout,
                                                             ZQResponseFlags* responseFlags) {
  begin("ZQUserNotificationReceiveResponse");
  if (notification == nullptr) return -1;
  std::unique_lock lock(mutex_);
  FakeAlert& alert = alertOf(notification);
  alert.receiveTimeout = timeout;
  alert.shown = true;
  changed_.notify_all();
  if (failToReceive_) return -1;
  changed_.wait(lock, [&] { return !held_; });
  alert.answered = true;
  *responseFlags = answers_.front();
  if (answers_.size() > 1) answers_.pop_front();
  return 0;
}

void FakeUserNotifications::ZQRelease(ZQUserNotificationRef notification) {
  begin("ZQRelease");
  const std::lock_guard lock(mutex_);
  FakeAlert& alert = alertOf(notification);
  if (alert.released) throw std::logic_error("an alert was released twice");
  alert.released = true;
}

void FakeUserNotifications::answerWith(std::vector<ZQResponseFlags> answers) {
  const std::lock_guard lock(mutex_);
  answers_.assign(answers.begin(), answers.end());
}

void FakeUserNotifications::failToReceive(bool fail) {
  const std::lock_guard lock(mutex_);
  failToReceive_ = fail;
}

void FakeUserNotifications::failToCreate(bool fail) {
  const std::lock_guard lock(mutex_);
  failToCreate_ = fail;
}

void FakeUserNotifications::holdAlerts() {
  const std::lock_guard lock(mutex_);
  held_ = true;
}

bool FakeUserNotifications::waitForShown(std::size_t count) {
  std::unique_lock lock(mutex_);
  return changed_.wait_for(lock, std::chrono::seconds(30), [&] {
    const auto waiting = std::count_if(
        alerts_.begin(), alerts_.end(), [](const auto& alert) { return alert->shown && !alert->answered; });
    return static_cast<std::size_t>(waiting) >= count;
  });
}

void FakeUserNotifications::answer(ZQResponseFlags flags) {
  {
    const std::lock_guard lock(mutex_);
    answers_.assign(1, flags);
    held_ = false;
  }
  changed_.notify_all();
}

std::vector<FakeAlert> FakeUserNotifications::alerts() const {
  const std::lock_guard lock(mutex_);
  std::vector<FakeAlert> copies;
  for (const auto& alert : alerts_) copies.push_back(*alert);
  return copies;
}

std::size_t FakeUserNotifications::unreleasedAlerts() const {
  const std::lock_guard lock(mutex_);
  return static_cast<std::size_t>(
      std::count_if(alerts_.begin(), alerts_.end(), [](const auto& alert) { return !alert->released; }));
}

FakeAlert& FakeUserNotifications::alertOf(ZQUserNotificationRef notification) {
  for (const auto& alert : alerts_) {
    if (opaque(alert.get()) == notification) return *alert;
  }
  throw std::logic_error("an alert was used that this service did not create");
}

}  // namespace fakes
