#include "agents/terminal/TerminalAgent.h"

#include <poll.h>
#include <sdbus-c++/sdbus-c++.h>

#include <array>
#include <cerrno>
#include <memory>
#include <optional>
#include <string>

#include "agents/terminal/AgentObject.h"
#include "agents/terminal/Conversation.h"
#include "agents/terminal/InputLines.h"
#include "base/BusNames.h"
#include "base/Text.h"
#include "interfaces/Agent1Adaptor.h"

namespace terminal {
namespace {

constexpr const char* kAgentPath = "/com/zentor/rvd/TerminalAgent";
constexpr const char* kManagerInterface = com::zentor::rvd::AgentManager1_adaptor::INTERFACE_NAME;
constexpr const char* kBusName = "org.freedesktop.DBus";

class TerminalAgent {
 public:
  TerminalAgent(sdbus::IConnection& connection, Screen& screen, int input, int stop)
      : connection_(connection),
        screen_(screen),
        input_(input),
        stop_(stop),
        lines_(input),
        conversation_(screen, [this] { lines_.discard(); }),
        object_(
            connection,
            kAgentPath,
            [this](const std::string& sender) { return !owner_.empty() && sender == owner_; },
            conversation_),
        manager_(sdbus::createProxy(connection, base::kServiceName, base::kObjectPath)) {
    ownerChanges_ =
        connection_.addMatch(std::string("type='signal',sender='") + kBusName + "',interface='" + kBusName +
                                 "',member='NameOwnerChanged',arg0='" + base::kServiceName + "'",
                             [this](sdbus::Message& message) { ownerChanged(message); });
    owner_ = currentOwner();
  }

  base::Result<void> run() {
    registerWithDaemon();
    while (!ended_ && !failure_) {
      while (connection_.processPendingRequest()) continue;
      if (!screen_.works()) failure_ = failed("The alerts cannot be written to standard output");
      if (ended_ || failure_) break;
      waitAndTakeInput();
    }
    conversation_.abandon();
    if (!failure_) unregister();
    return failure_ ? base::Result<void>(*failure_) : base::Result<void>();
  }

 private:
  static base::Failure failed(const std::string& message) { return {base::FailureKind::kFailed, message}; }

  void waitAndTakeInput() {
    const auto bus = connection_.getEventLoopPollData();
    // Until the daemon has taken this agent, the end of the input is not what ends it.
    const int input = wasRegistered_ ? input_ : -1;
    std::array<pollfd, 3> polled{{{bus.fd, bus.events, 0}, {input, POLLIN, 0}, {stop_, POLLIN, 0}}};
    if (::poll(polled.data(), polled.size(), bus.getPollTimeout()) < 0) {
      if (errno != EINTR) failure_ = failed("Waiting for input failed");
      return;
    }
    if (polled[2].revents != 0) {
      ended_ = true;
    } else if (polled[1].revents != 0) {
      ended_ = !lines_.read([this](const std::string& line) { conversation_.take(line); });
    }
  }

  // Who owns the daemon's name now; from then on, the bus says when that changes before the new owner can
  // send anything. Empty where nobody does.
  std::string currentOwner() {
    try {
      const auto bus = sdbus::createProxy(connection_, kBusName, "/org/freedesktop/DBus");
      auto call = bus->createMethodCall(kBusName, "GetNameOwner");
      call << base::kServiceName;
      auto reply = bus->callMethod(call);
      std::string owner;
      reply >> owner;
      return owner;
    } catch (const sdbus::Error& error) {
      if (error.getName() != "org.freedesktop.DBus.Error.NameHasNoOwner") throw;
      return "";
    }
  }

  void ownerChanged(sdbus::Message& message) {
    std::string name;
    std::string oldOwner;
    std::string newOwner;
    message >> name >> oldOwner >> newOwner;
    if (newOwner == owner_) return;
    owner_ = newOwner;
    conversation_.abandon();
    if (owner_.empty()) return screen_.daemonLeft();
    // The bus starts the daemon for the first registration, which is then on its way to it already.
    if (wasRegistered_) registerWithDaemon();
  }

  void registerWithDaemon() {
    isRegistered_ = false;
    auto call = manager_->createMethodCall(kManagerInterface, "RegisterAgent");
    call << sdbus::ObjectPath(kAgentPath) << "terminal";
    registration_ = manager_->callMethod(
        call, [this](sdbus::MethodReply&, const sdbus::Error* error) { registrationEnded(error); });
  }

  void registrationEnded(const sdbus::Error* error) {
    if (error == nullptr) {
      isRegistered_ = wasRegistered_ = true;
      return screen_.registered();
    }
    const std::string& reason = error->getName();
    const bool hasLeft = reason == "org.freedesktop.DBus.Error.ServiceUnknown" ||
                         reason == "org.freedesktop.DBus.Error.NoReply";
    if (hasLeft && wasRegistered_) return;  // The next one is announced by the bus.
    if (hasLeft)
      failure_ = failed("rvd is not running. Start it with: systemctl --user start rvd");
    else if (reason == base::kAccessDenied)
      failure_ =
          failed("rvd takes no agent from here: only programs of its own user outside a sandbox may be one");
    else
      failure_ = failed("rvd does not take the agent: " + base::visible(error->getMessage()));
  }

  // Nobody waits for the answer: leaving the bus, which follows, says the same.
  void unregister() {
    if (!isRegistered_ || owner_.empty()) return;
    auto call = manager_->createMethodCall(kManagerInterface, "UnregisterAgent");
    call << sdbus::ObjectPath(kAgentPath);
    call.dontExpectReply();
    static_cast<void>(call.send(0));
  }

  sdbus::IConnection& connection_;
  Screen& screen_;
  const int input_;
  const int stop_;
  InputLines lines_;
  Conversation conversation_;
  AgentObject object_;
  std::unique_ptr<sdbus::IProxy> manager_;
  sdbus::Slot ownerChanges_;
  sdbus::PendingAsyncCall registration_;
  std::string owner_;           // the unique name of the daemon; empty while there is none
  bool isRegistered_ = false;   // with the present owner
  bool wasRegistered_ = false;  // with any
  bool ended_ = false;
  std::optional<base::Failure> failure_;
};

}  // namespace

base::Result<void> serveAlerts(sdbus::IConnection& connection, Screen& screen, int input, int stop) {
  try {
    TerminalAgent agent(connection, screen, input, stop);
    return agent.run();
  } catch (const sdbus::Error& error) {
    return base::Failure{base::FailureKind::kFailed,
                         "The session bus is gone: " + base::visible(error.getMessage())};
  }
}

}  // namespace terminal
