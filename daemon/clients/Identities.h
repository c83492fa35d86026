// Who the connections on the bus are.
#pragma once

#include <sys/types.h>

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "daemon/clients/Client.h"
#include "daemon/clients/InstalledApplications.h"

namespace clients {

// What the bus itself vouches for about a connection. Absent where it does not say, because the connection
// is gone for example. Called from any thread; may wait for the bus; never throws.
class BusDriver {
 public:
  virtual ~BusDriver() = default;
  virtual std::optional<uid_t> uid(const std::string& uniqueName) = 0;
  virtual std::optional<pid_t> pid(const std::string& uniqueName) = 0;
};

enum class Registration {
  kRegistered,
  kOtherUser,           // the connection is not the daemon's own user's, or the bus does not say whose it is
  kAlreadyIdentified,   // it is known which application the connection is
  kUnknownApplication,  // no installed application has the ID
};

// Keeps what is known about each connection, by its unique bus name, which the bus never gives to another
// one. Thread-safe; calls about one connection wait for each other.
class Identities {
 public:
  // The references must outlive the object.
  Identities(BusDriver& bus, const InstalledApplications& applications, uid_t ownUser);

  // Whether the connection is the daemon's own user's. The bus is asked once for each connection.
  bool isOwnUser(const std::string& uniqueName);

  // The connection's process, as the bus tells it. Asked once.
  std::optional<pid_t> pid(const std::string& uniqueName);

  // The connection says which installed application it is. Its name is read now.
  Registration registerAs(const std::string& uniqueName, const std::string& applicationID);

  // Who the connection is; `application` is absent where that is not known. Nothing that a request carries
  // changes this.
  struct Identity {
    std::optional<InstalledApplication> application;
    Evidence evidence = Evidence::kUnknown;
  };
  Identity identityOf(const std::string& uniqueName);

  // Drops what is known of a connection that left the bus.
  void forget(const std::string& uniqueName);

 private:
  struct Connection {
    std::mutex mutex;
    std::optional<uid_t> uid;
    std::optional<pid_t> pid;
    Identity identity;
  };
  std::shared_ptr<Connection> connectionOf(const std::string& uniqueName);
  bool belongsToOwnUser(const std::string& uniqueName, const std::shared_ptr<Connection>& connection);
  void forgetUnanswered(const std::string& uniqueName, const std::shared_ptr<Connection>& connection);

  BusDriver& bus_;
  const InstalledApplications& applications_;
  const uid_t ownUser_;
  std::mutex mutex_;
  std::map<std::string, std::shared_ptr<Connection>, std::less<>> connections_;
};

}  // namespace clients
