// Alerts, shown by agents.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <list>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "daemon/alerts/Turns.h"
#include "daemon/requests/RequestContext.h"
#include "daemon/state/RandomIdentifier.h"
#include "host/ZQUserNotification.h"

namespace alerts {

enum class AgentKind { kTerminal, kDesktop };

// Where an agent is found.
struct AgentAddress {
  std::string name;  // its unique bus name
  std::string path;  // of its object
  friend bool operator==(const AgentAddress&, const AgentAddress&) = default;
};

// Speaks to agents. Called from any thread, without a lock of the alert service.
class AgentCaller {
 public:
  virtual ~AgentCaller() = default;

  // What the agent answered, absent where it failed.
  using Answered = std::function<void(std::optional<std::uint64_t> responseFlags)>;

  // Has the agent show an alert and returns at once. answered: called at most once, on any thread; not at
  // all only when the agent has left the bus. May throw.
  virtual void showAlert(const AgentAddress& agent,
                         const std::string& alertID,
                         const RVDictionary& description,
                         Answered answered) = 0;

  // Has the agent take an alert down. Returns at once. May throw.
  virtual void dismissAlert(const AgentAddress& agent, const std::string& alertID) = 0;
};

// Shows one alert at a time, each to the best agent there is: the newest desktop agent, else the newest
// terminal agent. An alert without an agent waits for one; an agent that fails is no answer, and the alert
// is shown again. The thread that waits for the answer does the work.
//
// Clients take turns: whoever has many alerts waiting delays another client's by one at most. Clients that
// nothing is known about share one turn, since they are as many as somebody makes of them. Alerts of equal
// turn are shown in the order in which they came.
//
// An alert belongs to the RequestContext that is current when it is created; when that becomes void, the
// alert is taken down and ends with 2. Without a current context it ends by itself alone. After an answer,
// the client's next alert is not shown before the answered request has ended (requestEnded): what it asks
// may be settled then, and its request is made void as outdated, to be begun anew. Thread-safe.
class AlertService final : public ZQUserNotificationService {
 public:
  // How long an agent is left alone after it has failed this many times in a row (1 or more).
  using PauseAfter = std::function<std::chrono::milliseconds(int failures)>;

  // agents: outlives this object. newIdentifier: names alerts so that nobody can guess them.
  AlertService(AgentCaller& agents, state::IdentifierSource newIdentifier, PauseAfter pauseAfter);
  ~AlertService() override;

  // A second, doubled with every failure, up to a minute.
  static std::chrono::milliseconds growingPause(int failures);

  // The newest agent from now on. One that is registered already is registered anew.
  void registerAgent(const AgentAddress& agent, AgentKind kind);
  // Returns whether it was registered. An alert that it shows is shown again by another one.
  bool unregisterAgent(const AgentAddress& agent);
  // Unregisters all agents of a connection that left the bus.
  void agentsLeft(const std::string& name);

  // A request has ended, and those that it outdates know it (RequestContext::isOutdated).
  void requestEnded(const std::shared_ptr<requests::RequestContext>& request);

  ZQUserNotificationRef ZQUserNotificationCreate(const ZQAllocator* allocator,
                                                 double timeout,
                                                 unsigned long flags,
                                                 int* error,
                                                 const RVDictionary& dictionary) override;
  int ZQUserNotificationReceiveResponse(ZQUserNotificationRef notification,
                                        double timeout,
                                        ZQResponseFlags* responseFlags) override;
  void ZQRelease(ZQUserNotificationRef notification) override;

 private:
  using Time = std::chrono::steady_clock::time_point;
  using Lock = std::unique_lock<std::mutex>;
  struct Alert;
  struct Showing;

  struct Agent {
    AgentAddress address;
    AgentKind kind = AgentKind::kTerminal;
    int failures = 0;  // in a row
    Time pausedUntil{};
  };

  std::optional<AgentAddress> bestAgent(Time now, std::optional<Time>& nextTry) const;
  void removeAgents(const std::function<bool(const Agent&)>& which);
  void agentFailed(const AgentAddress& address);
  Alert* next() const;
  void wakeNext();
  void join(Lock& lock, Alert& alert);
  bool waitUntilShowable(Lock& lock, Alert& alert, Time deadline, AgentAddress& agent);
  std::shared_ptr<Showing> show(Lock& lock, Alert& alert, const AgentAddress& agent);
  void takeDown(const Showing& showing) noexcept;
  void end(Alert& alert, ZQResponseFlags responseFlags);
  void endedShowing(Alert& alert, const Showing& showing);

  AgentCaller& agents_;
  const state::IdentifierSource newIdentifier_;
  const PauseAfter pauseAfter_;

  std::mutex mutex_;           // protects everything below, and what of an alert changes
  std::list<Agent> known_;     // oldest first
  std::list<Alert*> waiting_;  // in the order in which they came
  Alert* shown_ = nullptr;     // one of them
  Turns turns_;
  std::map<std::string, std::weak_ptr<requests::RequestContext>> answered_;  // by client, until it has ended
};

}  // namespace alerts
