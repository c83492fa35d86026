#include "daemon/clients/Identities.h"

#include <utility>

namespace clients {

Identities::Identities(BusDriver& bus, const InstalledApplications& applications, uid_t ownUser)
    : bus_(bus),
      applications_(applications),
      ownUser_(ownUser) {
}

std::shared_ptr<Identities::Connection> Identities::connectionOf(const std::string& uniqueName) {
  const std::lock_guard lock(mutex_);
  auto& connection = connections_[uniqueName];
  if (connection == nullptr) connection = std::make_shared<Connection>();
  return connection;
}

// A connection that the bus says nothing about is gone, and nobody would ever forget it.
void Identities::forgetUnanswered(const std::string& uniqueName,
                                  const std::shared_ptr<Connection>& connection) {
  const std::lock_guard lock(mutex_);
  const auto entry = connections_.find(uniqueName);
  if (entry != connections_.end() && entry->second == connection) connections_.erase(entry);
}

// The connection's mutex is held.
bool Identities::belongsToOwnUser(const std::string& uniqueName,
                                  const std::shared_ptr<Connection>& connection) {
  if (!connection->uid) connection->uid = bus_.uid(uniqueName);
  if (!connection->uid) forgetUnanswered(uniqueName, connection);
  return connection->uid == ownUser_;
}

bool Identities::isOwnUser(const std::string& uniqueName) {
  const auto connection = connectionOf(uniqueName);
  const std::lock_guard lock(connection->mutex);
  return belongsToOwnUser(uniqueName, connection);
}

std::optional<pid_t> Identities::pid(const std::string& uniqueName) {
  const auto connection = connectionOf(uniqueName);
  const std::lock_guard lock(connection->mutex);
  if (!connection->pid) connection->pid = bus_.pid(uniqueName);
  if (!connection->pid) forgetUnanswered(uniqueName, connection);
  return connection->pid;
}

Registration Identities::registerAs(const std::string& uniqueName, const std::string& applicationID) {
  const auto connection = connectionOf(uniqueName);
  const std::lock_guard lock(connection->mutex);
  if (!belongsToOwnUser(uniqueName, connection)) return Registration::kOtherUser;
  if (connection->identity.application) return Registration::kAlreadyIdentified;
  auto application = applications_.find(applicationID);
  if (!application) return Registration::kUnknownApplication;
  connection->identity = {std::move(application), Evidence::kRegistered};
  return Registration::kRegistered;
}

Identities::Identity Identities::identityOf(const std::string& uniqueName) {
  std::shared_ptr<Connection> connection;
  {
    const std::lock_guard lock(mutex_);
    const auto entry = connections_.find(uniqueName);
    if (entry == connections_.end()) return {};
    connection = entry->second;
  }
  const std::lock_guard lock(connection->mutex);
  return connection->identity;
}

void Identities::forget(const std::string& uniqueName) {
  const std::lock_guard lock(mutex_);
  connections_.erase(uniqueName);
}

}  // namespace clients
