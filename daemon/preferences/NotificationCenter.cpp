#include "daemon/preferences/NotificationCenter.h"

#include <future>
#include <utility>

namespace preferences {

int NotificationCenter::registerForNotification(std::string_view name,
                                                std::shared_ptr<ZQSerialQueue> queue,
                                                std::function<void()> handler) {
  const std::lock_guard lock(mutex_);
  registrations_[std::string(name)].push_back({std::move(queue), std::move(handler)});
  return ++lastToken_;
}

void NotificationCenter::post(std::string_view name) {
  std::vector<Registration> registered;
  {
    const std::lock_guard lock(mutex_);
    const auto found = registrations_.find(name);
    if (found != registrations_.end()) registered = found->second;
  }
  std::vector<std::future<void>> running;
  for (const Registration& registration : registered) {
    // Given back when the work goes, also where the handler throws.
    auto done = std::make_shared<std::promise<void>>();
    running.push_back(done->get_future());
    registration.queue->dispatchAsync(
        [done = std::move(done), handler = registration.handler] { handler(); });
  }
  for (const std::future<void>& handler : running) handler.wait();
}

}  // namespace preferences
