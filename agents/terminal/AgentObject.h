// The object on the bus that the daemon shows its alerts to.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "agents/terminal/Conversation.h"

namespace sdbus {
class IConnection;
}

namespace terminal {

// Hands the daemon's calls to a conversation. Calls of anybody else are answered with AccessDenied.
class AgentObject {
 public:
  // isDaemon: whether a unique bus name is the daemon's. connection and conversation outlive this object.
  // Throws sdbus::Error where the path is taken on this connection.
  AgentObject(sdbus::IConnection& connection,
              const std::string& path,
              std::function<bool(const std::string& sender)> isDaemon,
              Conversation& conversation);
  ~AgentObject();

 private:
  class Adaptor;
  std::unique_ptr<Adaptor> adaptor_;
};

}  // namespace terminal
