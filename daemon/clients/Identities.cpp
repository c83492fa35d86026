#include "daemon/clients/Identities.h"

#include <utility>

#include "daemon/log/Log.h"

namespace clients {
namespace {

// Calls of one connection that wait until it is known whose they are.
constexpr std::size_t kMostWaiting = 256;

}  // namespace

Identities::Identities(BusDriver& bus,
                       Inspecting inspecting,
                       const InstalledApplications& applications,
                       std::function<void(std::function<void()>)> post,
                       uid_t ownUser,
                       RVLogService& log)
    : bus_(bus),
      applications_(applications),
      post_(std::move(post)),
      ownUser_(ownUser),
      log_(log),
      inspections_(std::move(inspecting.inspect), inspecting.deadline, inspecting.most) {
}

bool Identities::whenIdentified(const std::string& uniqueName, std::function<void()> work) {
  std::shared_ptr<Attempt> attempt;
  {
    const std::lock_guard lock(mutex_);
    auto& connection = connections_[uniqueName];
    if (connection == nullptr) {
      connection = std::make_shared<Connection>();
      attempt = std::make_shared<Attempt>(Attempt{uniqueName, connection, {}, {}});
    }
    if (!connection->isIdentified) {
      if (connection->waiting.size() >= kMostWaiting) return false;
      connection->waiting.push_back(std::move(work));
      work = nullptr;
    }
  }
  if (work) work();
  if (attempt != nullptr) begin(attempt);
  return true;
}

void Identities::begin(const std::shared_ptr<Attempt>& attempt) {
  bus_.ask(attempt->uniqueName, [this, attempt](const BusDriver::Credentials& credentials) {
    if (attempt->connection.expired()) return;
    attempt->credentials = credentials;
    if (credentials.uid != ownUser_) settle(*attempt, Standing::kOtherUser, {});
    // It has left, or somebody garbled the answer: nothing is kept, and its next call is looked into anew.
    if (!credentials.uid) forget(attempt->uniqueName);
    if (credentials.uid != ownUser_) return;
    if (!credentials.pid) return settleUnknown(*attempt, "the bus does not name its process");
    inspect(attempt);
  });
}

void Identities::inspect(const std::shared_ptr<Attempt>& attempt) {
  inspections_.begin(*attempt->credentials.pid, [this, attempt](Inspection inspection) {
    post_([this, attempt, inspection = std::move(inspection)] {
      if (attempt->connection.expired()) return;
      attempt->inspection = inspection;
      if (inspection.facts.confinement == ProcessFacts::Confinement::kUnknown)
        return settleUnknown(*attempt, inspection.facts.reason);
      checkAgain(attempt);
    });
  });
}

// What was read belongs to the process that has lived since before the reading. That it is still the one
// that the bus names shows that the number had not been given to another process in between.
void Identities::checkAgain(const std::shared_ptr<Attempt>& attempt) {
  bus_.ask(attempt->uniqueName, [this, attempt](const BusDriver::Credentials& credentials) {
    if (attempt->connection.expired()) return;
    const Inspection& inspection = attempt->inspection;
    if (credentials != attempt->credentials)
      return settleUnknown(*attempt, "the bus does not name the same process any more");
    if (!inspection.process->isAlive()) return settleUnknown(*attempt, "its process has ended");
    const bool isConfined = inspection.facts.confinement == ProcessFacts::Confinement::kConfined;
    Identity identity;
    if (inspection.application)
      identity = {inspection.application, isConfined ? Evidence::kSandbox : Evidence::kScope};
    settle(*attempt, isConfined ? Standing::kConfined : Standing::kUnconfined, std::move(identity));
  });
}

void Identities::settleUnknown(const Attempt& attempt, const std::string& reason) {
  logging::notice(log_, "It is not known who %@ is: %@", {attempt.uniqueName, reason});
  settle(attempt, Standing::kUnknown, {});
}

void Identities::settle(const Attempt& attempt, Standing standing, Identity identity) {
  const auto connection = attempt.connection.lock();
  if (connection == nullptr) return;
  std::vector<std::function<void()>> waiting;
  {
    const std::lock_guard lock(mutex_);
    connection->isIdentified = true;
    connection->standing = standing;
    connection->identity = std::move(identity);
    waiting.swap(connection->waiting);
  }
  for (auto& work : waiting) work();
}

std::shared_ptr<Identities::Connection> Identities::connectionOf(const std::string& uniqueName) const {
  const auto entry = connections_.find(uniqueName);
  return entry != connections_.end() ? entry->second : nullptr;
}

bool Identities::isOwnUser(const std::string& uniqueName) const {
  const std::lock_guard lock(mutex_);
  const auto connection = connectionOf(uniqueName);
  return connection != nullptr && connection->isIdentified && connection->standing != Standing::kOtherUser;
}

bool Identities::isUnconfined(const std::string& uniqueName) const {
  const std::lock_guard lock(mutex_);
  const auto connection = connectionOf(uniqueName);
  return connection != nullptr && connection->isIdentified && connection->standing == Standing::kUnconfined;
}

Identities::Identity Identities::identityOf(const std::string& uniqueName) const {
  const std::lock_guard lock(mutex_);
  const auto connection = connectionOf(uniqueName);
  return connection != nullptr ? connection->identity : Identity();
}

Registration Identities::registerAs(const std::string& uniqueName, const std::string& applicationID) {
  if (identityOf(uniqueName).application) return Registration::kAlreadyIdentified;
  if (!isUnconfined(uniqueName)) return Registration::kNotPossible;
  auto application = applications_.find(applicationID);
  if (!application) return Registration::kUnknownApplication;
  if (application->belongsToSandbox) return Registration::kSandboxed;
  const std::lock_guard lock(mutex_);
  if (const auto connection = connectionOf(uniqueName))
    connection->identity = {std::move(application), Evidence::kRegistered};
  return Registration::kRegistered;
}

std::vector<std::string> Identities::connectionsOf(std::string_view applicationID) const {
  std::vector<std::string> names;
  const std::lock_guard lock(mutex_);
  for (const auto& [name, connection] : connections_)
    if (connection->identity.application && connection->identity.application->id == applicationID)
      names.push_back(name);
  return names;
}

void Identities::forget(const std::string& uniqueName) {
  std::shared_ptr<Connection> dropped;
  const std::lock_guard lock(mutex_);
  const auto entry = connections_.find(uniqueName);
  if (entry == connections_.end()) return;
  dropped = std::move(entry->second);
  connections_.erase(entry);
}

}  // namespace clients
