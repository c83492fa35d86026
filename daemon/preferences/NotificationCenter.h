// Notifications by name.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "host/ZQPreferences.h"

namespace preferences {

// Thread-safe.
class NotificationCenter : public ZQNotificationCenter {
 public:
  int registerForNotification(std::string_view name,
                              std::shared_ptr<ZQSerialQueue> queue,
                              std::function<void()> handler) override;

  // Runs every handler of the notification on its queue and returns when all have run. Not called from work
  // on one of these queues.
  void post(std::string_view name);

 private:
  struct Registration {
    std::shared_ptr<ZQSerialQueue> queue;
    std::function<void()> handler;
  };

  std::mutex mutex_;
  int lastToken_ = 0;                                                            // guarded by mutex_
  std::map<std::string, std::vector<Registration>, std::less<>> registrations_;  // guarded by mutex_
};

}  // namespace preferences
