// Modal alerts.
#pragma once

#include "host/Values.h"

// Where a host object is allocated; the default is the only one there is.
struct ZQAllocator;
inline constexpr const ZQAllocator* kZQAllocatorDefault = nullptr;

// An alert. Opaque; owned by whoever created it until it is handed to ZQRelease.
struct ZQUserNotification;
using ZQUserNotificationRef = ZQUserNotification*;

// How an alert ended: 0 for the default button and for nothing else, 1 for the alternate button, 2 for
// every other end (closed, taken down, the device was locked).
using ZQResponseFlags = unsigned long;

// Shows alerts to the user of the device. Called from any thread; each alert is used by one thread.
class ZQUserNotificationService {
 public:
  virtual ~ZQUserNotificationService() = default;

  // Creates an alert and returns at once; whether it is on the screen already is the host's business.
  // timeout: seconds until the alert ends by itself, 0 for never. error: where not null, receives a
  // host-specific code. dictionary: the alert's texts and traits by the keys of Constants.h. Returns
  // null where no alert can be created.
  virtual ZQUserNotificationRef ZQUserNotificationCreate(const ZQAllocator* allocator,
                                                         double timeout,
                                                         unsigned long flags,
                                                         int* error,
                                                         const RVDictionary& dictionary) = 0;

  // Blocks until the alert has ended (timeout 0: without limit) and stores how into responseFlags.
  // Returns 0 when it did; otherwise, and at once for a null alert, another value, with responseFlags
  // untouched.
  virtual int ZQUserNotificationReceiveResponse(ZQUserNotificationRef notification,
                                                double timeout,
                                                ZQResponseFlags* responseFlags) = 0;

  // Frees the alert, taking it down where it is still shown. Not called with null.
  virtual void ZQRelease(ZQUserNotificationRef notification) = 0;
};
