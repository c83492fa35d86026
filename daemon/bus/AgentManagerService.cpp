#include "daemon/bus/AgentManagerService.h"

#include <sdbus-c++/sdbus-c++.h>

#include <string>

#include "daemon/bus/Names.h"
#include "interfaces/Agent1Methods.h"

namespace bus {

AgentManagerService::AgentManagerService(Dispatcher& dispatcher,
                                         AgentConnections& agents,
                                         alerts::AlertService& alerts)
    : agents_(agents),
      alerts_(alerts) {
  using SharedCall = const std::shared_ptr<Call>&;
  dispatcher.serve(interfaces::kAgentManager1,
                   Callers::kUnconfined,
                   interfaces::methodsOfAgentManager1(),
                   {{"RegisterAgent", [this](SharedCall call) { registerAgent(*call); }},
                    {"UnregisterAgent", [this](SharedCall call) { unregisterAgent(*call); }}});
}

void AgentManagerService::registerAgent(Call& call) {
  sdbus::ObjectPath path;
  std::string kindName;
  call.message() >> path >> kindName;
  if (kindName != "desktop" && kindName != "terminal")
    throw sdbus::Error(kInvalidArgs, "The kind of an agent is \"desktop\" or \"terminal\"");
  const alerts::AgentAddress agent{call.sender(), path};
  agents_.add(agent);
  // Answered first, so that an agent knows that it is one before the first alert comes.
  call.reply();
  alerts_.registerAgent(agent,
                        kindName == "desktop" ? alerts::AgentKind::kDesktop : alerts::AgentKind::kTerminal);
}

void AgentManagerService::unregisterAgent(Call& call) {
  sdbus::ObjectPath path;
  call.message() >> path;
  const alerts::AgentAddress agent{call.sender(), path};
  if (!alerts_.unregisterAgent(agent)) throw sdbus::Error(kInvalidArgs, "No such agent is registered");
  agents_.remove(agent);
  call.reply();
}

}  // namespace bus
