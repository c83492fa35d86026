// What the bus says about those who call.
#pragma once

#include <memory>
#include <string>

#include "daemon/clients/Identities.h"

namespace sdbus {
class IConnection;
class IProxy;
}  // namespace sdbus

namespace bus {

// Asks the bus itself, and believes nobody else's answer.
class Senders final : public clients::BusDriver {
 public:
  // The connection outlives this object.
  explicit Senders(sdbus::IConnection& connection);
  ~Senders() override;

  void ask(const std::string& uniqueName, Answered answered) override;

 private:
  const std::unique_ptr<sdbus::IProxy> bus_;
};

}  // namespace bus
