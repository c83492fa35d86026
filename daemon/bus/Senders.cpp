#include "daemon/bus/Senders.h"

#include <sdbus-c++/sdbus-c++.h>

#include <map>

namespace bus {

Senders::Senders(sdbus::IConnection& connection)
    : bus_(sdbus::createProxy(connection, "org.freedesktop.DBus", "/org/freedesktop/DBus")) {
}

Senders::~Senders() = default;

void Senders::learn(const std::string& uniqueName) {
  {
    const std::lock_guard lock(mutex_);
    if (known_.contains(uniqueName)) return;
  }
  const Credentials credentials = ask(uniqueName);
  const std::lock_guard lock(mutex_);
  known_.insert_or_assign(uniqueName, credentials);
}

void Senders::forget(const std::string& uniqueName) {
  const std::lock_guard lock(mutex_);
  known_.erase(uniqueName);
}

std::optional<uid_t> Senders::uid(const std::string& uniqueName) {
  const std::lock_guard lock(mutex_);
  const auto entry = known_.find(uniqueName);
  return entry != known_.end() ? entry->second.uid : std::nullopt;
}

std::optional<pid_t> Senders::pid(const std::string& uniqueName) {
  const std::lock_guard lock(mutex_);
  const auto entry = known_.find(uniqueName);
  return entry != known_.end() ? entry->second.pid : std::nullopt;
}

Senders::Credentials Senders::ask(const std::string& uniqueName) {
  Credentials credentials;
  try {
    auto question = bus_->createMethodCall("org.freedesktop.DBus", "GetConnectionCredentials");
    question << uniqueName;
    auto answer = question.send(0);
    std::map<std::string, sdbus::Variant> entries;
    answer >> entries;
    const auto number = [&](const char* key) -> std::optional<std::uint32_t> {
      const auto entry = entries.find(key);
      if (entry == entries.end() || entry->second.peekValueType() != "u") return std::nullopt;
      return entry->second.get<std::uint32_t>();
    };
    credentials.uid = number("UnixUserID");
    if (const auto pid = number("ProcessID")) credentials.pid = static_cast<pid_t>(*pid);
  } catch (const sdbus::Error&) {  // It has left already.
  }
  return credentials;
}

}  // namespace bus
