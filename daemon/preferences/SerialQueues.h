// Serial work queues, each with a thread of its own.
#pragma once

#include <memory>
#include <string_view>

#include "host/RVLog.h"
#include "host/ZQPreferences.h"

namespace preferences {

// The thread of a queue ends when its last reference goes; whoever drops it waits for the work that is left,
// unless it is the queue's own work that does. An exception of work that nobody waits for goes to the log.
class SerialQueues : public ZQSerialQueueFactory {
 public:
  // The log outlives every queue.
  explicit SerialQueues(RVLogService& log);

  std::shared_ptr<ZQSerialQueue> createSerialQueue(std::string_view label) override;

 private:
  RVLogService& log_;
};

}  // namespace preferences
