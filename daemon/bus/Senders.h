// What the bus says about those who call.
#pragma once

#include <sys/types.h>

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <unordered_map>

#include "daemon/clients/Identities.h"

namespace sdbus {
class IConnection;
class IProxy;
}  // namespace sdbus

namespace bus {

// Asks the bus once about each caller, and remembers the answer until it leaves.
class Senders final : public clients::BusDriver {
 public:
  // The connection outlives this object.
  explicit Senders(sdbus::IConnection& connection);
  ~Senders() override;

  // Sees to it that the caller is known. On the bus thread; waits for the bus where the caller is new.
  void learn(const std::string& uniqueName);
  void forget(const std::string& uniqueName);

  // Absent for a caller that was not learnt, or has left. They wait for nobody.
  std::optional<uid_t> uid(const std::string& uniqueName) override;
  std::optional<pid_t> pid(const std::string& uniqueName) override;

 private:
  struct Credentials {
    std::optional<uid_t> uid;
    std::optional<pid_t> pid;
  };
  Credentials ask(const std::string& uniqueName);

  const std::unique_ptr<sdbus::IProxy> bus_;
  std::mutex mutex_;
  std::unordered_map<std::string, Credentials> known_;  // guarded by mutex_
};

}  // namespace bus
