// What agents call: com.zentor.rvd.AgentManager1.
#pragma once

#include <memory>

#include "daemon/alerts/AlertService.h"
#include "daemon/bus/AgentConnections.h"
#include "daemon/bus/Dispatcher.h"

namespace bus {

class AgentManagerService {
 public:
  // Registers the interface through the dispatcher. The references outlive this object.
  AgentManagerService(Dispatcher& dispatcher, AgentConnections& agents, alerts::AlertService& alerts);

 private:
  void registerAgent(Call& call);
  void unregisterAgent(Call& call);

  AgentConnections& agents_;
  alerts::AlertService& alerts_;
};

}  // namespace bus
