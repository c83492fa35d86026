#include "daemon/bus/Senders.h"

#include <sdbus-c++/sdbus-c++.h>

#include <cstdint>
#include <map>
#include <optional>
#include <utility>

namespace bus {
namespace {

constexpr const char* kDriver = "org.freedesktop.DBus";
constexpr std::uint64_t kTimeout = 10'000'000;  // microseconds

clients::BusDriver::Credentials credentialsIn(sdbus::MethodReply& reply) {
  std::map<std::string, sdbus::Variant> entries;
  reply >> entries;
  const auto number = [&](const char* key) -> std::optional<std::uint32_t> {
    const auto entry = entries.find(key);
    if (entry == entries.end() || entry->second.peekValueType() != "u") return std::nullopt;
    return entry->second.get<std::uint32_t>();
  };
  clients::BusDriver::Credentials credentials;
  credentials.uid = number("UnixUserID");
  if (const auto pid = number("ProcessID")) credentials.pid = static_cast<pid_t>(*pid);
  return credentials;
}

}  // namespace

Senders::Senders(sdbus::IConnection& connection)
    : bus_(sdbus::createProxy(connection, kDriver, "/org/freedesktop/DBus")) {
}

Senders::~Senders() = default;

void Senders::ask(const std::string& uniqueName, Answered answered) {
  const auto answer = std::make_shared<Answered>(std::move(answered));
  try {
    auto question = bus_->createMethodCall(kDriver, "GetConnectionCredentials");
    question << uniqueName;
    bus_->callMethod(
        question,
        [answer](sdbus::MethodReply& reply, const sdbus::Error* error) {
          Credentials credentials;
          try {
            // The bus delivers the reply of anybody who guesses the call's number.
            if (error == nullptr && reply.getSender() == kDriver) credentials = credentialsIn(reply);
          } catch (const sdbus::Error&) {  // It is none that the bus would give.
            credentials = {};
          }
          (*answer)(credentials);
        },
        kTimeout);
    return;
  } catch (const sdbus::Error&) {  // The bus is gone.
  }
  (*answer)({});
}

}  // namespace bus
