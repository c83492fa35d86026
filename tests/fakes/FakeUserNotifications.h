// Alerts that are answered as a test says, on no screen.
#pragma once

#include <condition_variable>
#include <deque>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

#include "host/ZQUserNotification.h"
#include "tests/fakes/Fake.h"

namespace fakes {

// One alert, from its creation to its release.
struct FakeAlert {
  RVDictionary description;
  double timeout = -1;
  unsigned long flags = ~0UL;
  bool defaultAllocator = false;
  bool errorWanted = false;
  double receiveTimeout = -1;
  bool shown = false;     // somebody waits, or has waited, for its answer
  bool answered = false;  // the wait is over
  bool released = false;
};

class FakeUserNotifications final : public ZQUserNotificationService, public Fake {
 public:
  // Every alert is answered with the default button until the test says otherwise.
  FakeUserNotifications();
  ~FakeUserNotifications();

  ZQUserNotificationRef ZQUserNotificationCreate(const ZQAllocator* allocator,
                                                 double timeout,
                                                 unsigned long flags,
                                                 int* error,
                                                 const RVDictionary& dictionary) override;
  int ZQUserNotificationReceiveResponse(ZQUserNotificationRef notification,
                                        double timeout,
                                        ZQResponseFlags* responseFlags) override;
  void ZQRelease(ZQUserNotificationRef notification) override;

  // The answers to the coming alerts, in order; the last one is given again and again.
  void answerWith(std::vector<ZQResponseFlags> answers);
  // From now on waiting for an answer fails at once and leaves the flags as they are.
  void failToReceive(bool fail = true);
  // From now on no alert can be created.
  void failToCreate(bool fail = true);

  // From now on alerts wait for answer().
  void holdAlerts();
  // Waits until this many alerts are shown and not answered, for half a minute at most; returns whether
  // they are.
  [[nodiscard]] bool waitForShown(std::size_t count);
  // Answers every alert that is shown or comes until holdAlerts() is called again.
  void answer(ZQResponseFlags flags);

  // All alerts, in the order of their creation.
  std::vector<FakeAlert> alerts() const;
  std::size_t unreleasedAlerts() const;

 private:
  FakeAlert& alertOf(ZQUserNotificationRef notification);

  mutable std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<std::unique_ptr<FakeAlert>> alerts_;
  std::deque<ZQResponseFlags> answers_;
  bool failToCreate_ = false;
  bool failToReceive_ = false;
  bool held_ = false;
};

}  // namespace fakes
