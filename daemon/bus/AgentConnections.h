// The agents, as they are reached over the bus.
#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <utility>

#include "daemon/alerts/AlertService.h"
#include "daemon/bus/BusLoop.h"

namespace sdbus {
class IProxy;
}

namespace bus {

class AgentConnections final : public alerts::AgentCaller {
 public:
  // The references outlive this object.
  AgentConnections(sdbus::IConnection& connection, BusLoop& loop);
  ~AgentConnections() override;

  // Before an agent is registered with the alert service; on the bus thread.
  void add(const alerts::AgentAddress& agent);
  void remove(const alerts::AgentAddress& agent);
  void removeAllOf(const std::string& uniqueName);

  void showAlert(const alerts::AgentAddress& agent,
                 const std::string& alertID,
                 const RVDictionary& description,
                 Answered answered) override;
  void dismissAlert(const alerts::AgentAddress& agent, const std::string& alertID) override;

 private:
  using Key = std::pair<std::string, std::string>;  // name and path
  std::shared_ptr<sdbus::IProxy> makeProxy(const alerts::AgentAddress& agent);
  std::shared_ptr<sdbus::IProxy> find(const alerts::AgentAddress& agent);

  sdbus::IConnection& connection_;
  BusLoop& loop_;
  std::mutex mutex_;
  std::map<Key, std::shared_ptr<sdbus::IProxy>> proxies_;  // guarded by mutex_
};

}  // namespace bus
