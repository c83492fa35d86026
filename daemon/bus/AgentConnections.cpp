#include "daemon/bus/AgentConnections.h"

#include <sdbus-c++/sdbus-c++.h>

#include <cstdint>
#include <limits>
#include <optional>
#include <utility>

#include "daemon/bus/Values.h"
#include "interfaces/Agent1Methods.h"

namespace bus {
namespace {

// The one number that an answer to ShowAlert holds; absent where it holds something else.
std::optional<std::uint64_t> responseFlags(sdbus::MethodReply& reply) {
  try {
    std::string type;
    std::string contents;
    reply.peekType(type, contents);
    if (type != "t") return std::nullopt;
    std::uint64_t flags = 0;
    reply >> flags;
    reply.peekType(type, contents);
    const bool isAll = type.empty() || type.front() == '\0';
    return isAll ? std::optional(flags) : std::nullopt;
  } catch (const sdbus::Error&) {
    return std::nullopt;
  }
}

}  // namespace

AgentConnections::AgentConnections(sdbus::IConnection& connection, BusLoop& loop)
    : connection_(connection),
      loop_(loop) {
}

AgentConnections::~AgentConnections() = default;

std::shared_ptr<sdbus::IProxy> AgentConnections::makeProxy(const alerts::AgentAddress& agent) {
  // A proxy goes on the bus thread, outside a handler: that is where its answers arrive.
  const auto dropOnBusThread = [&loop = loop_](sdbus::IProxy* proxy) {
    loop.post([owned = std::shared_ptr<sdbus::IProxy>(proxy)] {});
  };
  return {sdbus::createProxy(connection_, agent.name, agent.path).release(), dropOnBusThread};
}

void AgentConnections::add(const alerts::AgentAddress& agent) {
  auto proxy = makeProxy(agent);
  const std::lock_guard lock(mutex_);
  proxies_.try_emplace({agent.name, agent.path}, std::move(proxy));
}

void AgentConnections::remove(const alerts::AgentAddress& agent) {
  const std::lock_guard lock(mutex_);
  proxies_.erase({agent.name, agent.path});
}

void AgentConnections::removeAllOf(const std::string& uniqueName) {
  const std::lock_guard lock(mutex_);
  std::erase_if(proxies_, [&](const auto& entry) { return entry.first.first == uniqueName; });
}

std::shared_ptr<sdbus::IProxy> AgentConnections::find(const alerts::AgentAddress& agent) {
  const std::lock_guard lock(mutex_);
  const auto entry = proxies_.find({agent.name, agent.path});
  return entry != proxies_.end() ? entry->second : nullptr;
}

void AgentConnections::showAlert(const alerts::AgentAddress& agent,
                                 const std::string& alertID,
                                 const RVDictionary& description,
                                 Answered answered) {
  const auto proxy = find(agent);
  if (proxy == nullptr) return answered(std::nullopt);
  auto call = proxy->createMethodCall(interfaces::kAgent1, "ShowAlert");
  call << alertID;
  writeDictionary(call, description);
  constexpr auto kNoTimeout = std::numeric_limits<std::uint64_t>::max();
  auto pending = proxy->callMethod(
      call,
      [answered = std::move(answered), name = agent.name](sdbus::MethodReply& reply,
                                                          const sdbus::Error* error) {
        // The bus delivers the reply of anybody who guesses the call's number; the agent's own counts.
        const bool isAnswer = error == nullptr && reply.getSender() == name;
        answered(isAnswer ? responseFlags(reply) : std::nullopt);
      },
      kNoTimeout);
  // Let go of where the answer arrives, which lets go of it as well.
  loop_.post([held = std::move(pending)] {});
  loop_.sendRest();
}

void AgentConnections::dismissAlert(const alerts::AgentAddress& agent, const std::string& alertID) {
  // An agent that has unregistered may still show the alert.
  auto proxy = find(agent);
  if (proxy == nullptr) proxy = makeProxy(agent);
  auto call = proxy->createMethodCall(interfaces::kAgent1, "DismissAlert");
  call << alertID;
  call.dontExpectReply();
  static_cast<void>(call.send(0));
  loop_.sendRest();
}

}  // namespace bus
