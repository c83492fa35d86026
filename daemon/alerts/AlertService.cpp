#include "daemon/alerts/AlertService.h"

#include <algorithm>
#include <exception>
#include <utility>
#include <vector>

#include "host/Constants.h"

namespace alerts {
namespace {

constexpr ZQResponseFlags kEndedOtherwise = 2;

using Clock = std::chrono::steady_clock;

Clock::time_point deadlineAfter(double seconds) {
  if (!(seconds > 0)) return Clock::time_point::max();
  // Longer than anybody waits, and short enough for the clock's range.
  const std::chrono::duration<double> limited{std::min(seconds, 1e9)};
  return Clock::now() + std::chrono::duration_cast<Clock::duration>(limited);
}

}  // namespace

// One attempt of one agent.
struct AlertService::Showing {
  AgentAddress agent;
  std::string alertID;
  bool hasEnded = false;                       // answered, failed, or the agent is gone
  std::optional<std::uint64_t> responseFlags;  // what was answered
};

struct AlertService::Alert {
  RVDictionary description;
  Time deadline = Time::max();
  std::shared_ptr<requests::RequestContext> context;
  std::unique_ptr<requests::RequestContext::Waiting> waiting;

  // Protected by the service's lock.
  std::uint64_t turn = 0;
  std::condition_variable changed;
  std::optional<ZQResponseFlags> ended;
  std::shared_ptr<Showing> showing;

  requests::RequestContext::Registration registration;  // goes first: what it calls uses the others
};

AlertService::AlertService(AgentCaller& agents, state::IdentifierSource newIdentifier, PauseAfter pauseAfter)
    : agents_(agents),
      newIdentifier_(std::move(newIdentifier)),
      pauseAfter_(std::move(pauseAfter)) {
}

AlertService::~AlertService() = default;

std::chrono::milliseconds AlertService::growingPause(int failures) {
  return std::min(std::chrono::seconds(1) * (1 << std::min(failures - 1, 6)), std::chrono::seconds(60));
}

void AlertService::registerAgent(const AgentAddress& agent, AgentKind kind) {
  const std::lock_guard lock(mutex_);
  const auto known =
      std::find_if(known_.begin(), known_.end(), [&](const Agent& other) { return other.address == agent; });
  Agent registered{agent, kind, 0, {}};
  if (known != known_.end()) {
    // Registering again is no way round the pause.
    registered.failures = known->failures;
    registered.pausedUntil = known->pausedUntil;
    known_.erase(known);
  }
  known_.push_back(std::move(registered));
  wakeNext();
}

bool AlertService::unregisterAgent(const AgentAddress& agent) {
  const std::lock_guard lock(mutex_);
  const auto before = known_.size();
  removeAgents([&](const Agent& other) { return other.address == agent; });
  return known_.size() != before;
}

void AlertService::agentsLeft(const std::string& name) {
  const std::lock_guard lock(mutex_);
  removeAgents([&](const Agent& agent) { return agent.address.name == name; });
}

void AlertService::removeAgents(const std::function<bool(const Agent&)>& which) {
  for (auto agent = known_.begin(); agent != known_.end();) {
    if (!which(*agent)) {
      ++agent;
      continue;
    }
    Showing* showing = shown_ == nullptr ? nullptr : shown_->showing.get();
    if (showing != nullptr && showing->agent == agent->address) {
      showing->hasEnded = true;
      shown_->changed.notify_all();
    }
    agent = known_.erase(agent);
  }
  wakeNext();
}

// The best agent that is not paused; where there is none, nextTry is when the first pause ends.
std::optional<AgentAddress> AlertService::bestAgent(Time now, std::optional<Time>& nextTry) const {
  const Agent* best = nullptr;
  nextTry.reset();
  for (const Agent& agent : known_) {
    if (agent.pausedUntil > now)
      nextTry = std::min(nextTry.value_or(agent.pausedUntil), agent.pausedUntil);
    else if (best == nullptr || agent.kind >= best->kind)
      best = &agent;
  }
  return best != nullptr ? std::optional(best->address) : std::nullopt;
}

void AlertService::agentFailed(const AgentAddress& address) {
  for (Agent& agent : known_) {
    if (agent.address != address) continue;
    ++agent.failures;
    agent.pausedUntil = Clock::now() + pauseAfter_(agent.failures);
  }
}

// The alert whose turn it is; null where none can be shown now.
AlertService::Alert* AlertService::next() const {
  if (shown_ != nullptr) return nullptr;
  Alert* first = nullptr;
  for (Alert* alert : waiting_) {
    if (alert->ended || (first != nullptr && first->turn <= alert->turn)) continue;
    if (const auto& context = alert->context) {
      const auto answered = answered_.find(context->clientKey());
      const auto request = answered != answered_.end() ? answered->second.lock() : nullptr;
      if (context->isOutdated() || (request != nullptr && request != context)) continue;
    }
    first = alert;
  }
  return first;
}

void AlertService::wakeNext() {
  if (Alert* alert = next()) alert->changed.notify_all();
}

// Has the alert wait for its turn.
void AlertService::join(Lock& lock, Alert& alert) {
  alert.turn = turns_.join(alert.context != nullptr ? alert.context->shareKey() : "");
  waiting_.push_back(&alert);
  if (alert.context == nullptr || !alert.context->isOutdated()) return;
  lock.unlock();
  alert.context->beginVoid(requests::VoidReason::kOutdated);
  lock.lock();
}

void AlertService::requestEnded(const std::shared_ptr<requests::RequestContext>& request) {
  std::vector<std::shared_ptr<requests::RequestContext>> outdated;
  {
    const std::lock_guard lock(mutex_);
    const auto entry = answered_.find(request->clientKey());
    if (entry != answered_.end() && (entry->second.expired() || entry->second.lock() == request))
      answered_.erase(entry);
    for (const Alert* alert : waiting_)
      if (!alert->ended && alert->context != nullptr && alert->context->isOutdated())
        outdated.push_back(alert->context);
    wakeNext();
  }
  for (const auto& context : outdated) context->beginVoid(requests::VoidReason::kOutdated);
}

ZQUserNotificationRef AlertService::ZQUserNotificationCreate(const ZQAllocator*,
                                                             double timeout,
                                                             unsigned long,
                                                             int* error,
                                                             const RVDictionary& dictionary) {
  auto alert = std::make_unique<Alert>();
  alert->description = dictionary;
  alert->deadline = deadlineAfter(timeout);
  alert->context = requests::RequestContext::current();
  if (alert->context != nullptr) {
    alert->waiting = alert->context->beginWaiting();
    if (alert->waiting == nullptr) {
      if (error != nullptr) *error = 1;
      return nullptr;
    }
    for (const auto& [key, value] : alert->context->clientDetails())
      alert->description.insert_or_assign(key, value);
    alert->registration = alert->context->onVoid([this, watched = alert.get()] {
      const std::lock_guard lock(mutex_);
      end(*watched, kEndedOtherwise);
    });
  }
  return reinterpret_cast<ZQUserNotificationRef>(alert.release());  // the type is never completed
}

void AlertService::end(Alert& alert, ZQResponseFlags responseFlags) {
  if (alert.ended) return;
  alert.ended = responseFlags;
  alert.changed.notify_all();
}

int AlertService::ZQUserNotificationReceiveResponse(ZQUserNotificationRef notification,
                                                    double timeout,
                                                    ZQResponseFlags* responseFlags) {
  if (notification == nullptr) return 1;
  Alert& alert = *reinterpret_cast<Alert*>(notification);
  const Time deadline = std::min(deadlineAfter(timeout), alert.deadline);
  Lock lock(mutex_);
  join(lock, alert);
  AgentAddress agent;
  while (!alert.ended && waitUntilShowable(lock, alert, deadline, agent)) {
    const auto showing = show(lock, alert, agent);
    const auto hasEnded = [&] { return alert.ended || showing->hasEnded; };
    if (deadline == Time::max())
      alert.changed.wait(lock, hasEnded);
    else
      alert.changed.wait_until(lock, deadline, hasEnded);
    endedShowing(alert, *showing);
    if (!showing->responseFlags) {
      // Nobody has answered: the agent's window, where it has one, is taken down.
      lock.unlock();
      takeDown(*showing);
      lock.lock();
    }
    if (Clock::now() >= deadline) break;
  }
  if (!alert.ended && Clock::now() >= alert.deadline) end(alert, kEndedOtherwise);
  waiting_.remove(&alert);
  wakeNext();
  if (!alert.ended) return 1;
  *responseFlags = *alert.ended;
  return 0;
}

// Waits until it is the alert's turn and an agent can show it. False where the alert ended first, or the
// deadline came.
bool AlertService::waitUntilShowable(Lock& lock, Alert& alert, Time deadline, AgentAddress& agent) {
  for (;;) {
    if (alert.ended) return false;
    const Time now = Clock::now();
    if (now >= deadline) return false;
    std::optional<Time> nextTry;
    if (next() == &alert) {
      if (const auto best = bestAgent(now, nextTry)) {
        agent = *best;
        return true;
      }
    }
    const Time until = std::min(deadline, nextTry.value_or(Time::max()));
    if (until == Time::max())
      alert.changed.wait(lock);
    else
      alert.changed.wait_until(lock, until);
  }
}

// Hands the alert to the agent. The lock is let go of meanwhile.
std::shared_ptr<AlertService::Showing> AlertService::show(Lock& lock,
                                                          Alert& alert,
                                                          const AgentAddress& agent) {
  // A new name each time, so that a late answer to an earlier attempt is an answer to nothing.
  auto showing = std::make_shared<Showing>(Showing{agent, newIdentifier_(), false, std::nullopt});
  alert.showing = showing;
  shown_ = &alert;
  turns_.reach(alert.turn);
  lock.unlock();
  // The alert may be gone when a late answer comes; the attempt says whether it still counts.
  const auto answered = [this, showing, &alert](std::optional<std::uint64_t> responseFlags) {
    const std::lock_guard answerLock(mutex_);
    if (showing->hasEnded) return;
    showing->hasEnded = true;
    if (responseFlags && *responseFlags <= kEndedOtherwise) showing->responseFlags = responseFlags;
    alert.changed.notify_all();
  };
  try {
    agents_.showAlert(agent, showing->alertID, alert.description, answered);
  } catch (const std::exception&) {
    answered(std::nullopt);
  }
  lock.lock();
  return showing;
}

// Draws the conclusion from an attempt that is over.
void AlertService::endedShowing(Alert& alert, const Showing& showing) {
  const bool agentHasFailed = showing.hasEnded && !showing.responseFlags;
  alert.showing->hasEnded = true;  // what comes now comes too late
  alert.showing = nullptr;
  shown_ = nullptr;
  if (agentHasFailed) return agentFailed(showing.agent);
  if (!showing.responseFlags) return;
  for (Agent& agent : known_)
    if (agent.address == showing.agent) agent.failures = 0;
  if (alert.context != nullptr) answered_.insert_or_assign(alert.context->clientKey(), alert.context);
  end(alert, static_cast<ZQResponseFlags>(*showing.responseFlags));
}

void AlertService::takeDown(const Showing& showing) noexcept {
  try {
    agents_.dismissAlert(showing.agent, showing.alertID);
  } catch (const std::exception&) {  // the agent is gone, and the alert with it
  }
}

void AlertService::ZQRelease(ZQUserNotificationRef notification) {
  delete reinterpret_cast<Alert*>(notification);
}

}  // namespace alerts
