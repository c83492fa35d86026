// Who the connections on the bus are.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstddef>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "daemon/clients/Evidence.h"
#include "daemon/clients/Inspections.h"
#include "daemon/clients/InstalledApplications.h"
#include "host/RVLog.h"

namespace clients {

// What the bus itself vouches for about a connection.
class BusDriver {
 public:
  // Absent where it does not say, because the connection is gone for example.
  struct Credentials {
    std::optional<uid_t> uid;
    std::optional<pid_t> pid;
    friend bool operator==(const Credentials&, const Credentials&) = default;
  };
  using Answered = std::function<void(const Credentials&)>;

  virtual ~BusDriver() = default;
  // Asks the bus anew, on the bus thread, and waits for nothing. answered: called once on the bus thread,
  // before this returns or later. Does not throw.
  virtual void ask(const std::string& uniqueName, Answered answered) = 0;
};

enum class Registration {
  kRegistered,
  kNotPossible,         // the connection is not an unconfined program's of the daemon's own user
  kAlreadyIdentified,   // it is known which application the connection is
  kUnknownApplication,  // no installed application has the ID
  kSandboxed,           // the application that has the ID runs in a sandbox
};

// Finds out who each connection is, once, and keeps it by the connection's unique name, which the bus never
// gives to another one. What is found out about a process counts only where the bus still names the
// process afterwards and the process has lived all the while; everything that fails makes its connection
// unknown.
//
// Called on the bus thread, but for the functions that say otherwise.
class Identities {
 public:
  // How processes are looked at: see Inspections.
  struct Inspecting {
    Inspect inspect;
    std::chrono::milliseconds deadline;
    std::size_t most;
  };

  // post: has work run on the bus thread; from any thread. The references outlive the object.
  Identities(BusDriver& bus,
             Inspecting inspecting,
             const InstalledApplications& applications,
             std::function<void(std::function<void()>)> post,
             uid_t ownUser,
             RVLogService& log);
  Identities(const Identities&) = delete;
  Identities& operator=(const Identities&) = delete;

  // Runs the work when it is known who the connection is: now, or later on the bus thread, in the order in
  // which it was given. The work is dropped where the connection leaves before. Returns false, and drops the
  // work, where too much waits for this connection already. The work does not throw.
  bool whenIdentified(const std::string& uniqueName, std::function<void()> work);

  // These say of a connection that is not identified (yet, or any more) what is true of an unknown one.

  // Whether the connection is the daemon's own user's.
  bool isOwnUser(const std::string& uniqueName) const;

  // Whether it is a program's of the daemon's own user that runs in no sandbox.
  bool isUnconfined(const std::string& uniqueName) const;

  // Who the connection is; `application` is absent where that is not known. Nothing that a request carries
  // changes this.
  struct Identity {
    std::optional<InstalledApplication> application;
    Evidence evidence = Evidence::kUnknown;
  };
  // From any thread.
  Identity identityOf(const std::string& uniqueName) const;

  // The connection says which installed application it is. Its name is read now.
  Registration registerAs(const std::string& uniqueName, const std::string& applicationID);

  // The connections that are known to be the application's. From any thread.
  std::vector<std::string> connectionsOf(std::string_view applicationID) const;

  // Drops what is known of a connection that left the bus, and what waits for it.
  void forget(const std::string& uniqueName);

 private:
  enum class Standing { kOtherUser, kUnknown, kConfined, kUnconfined };
  struct Connection {
    bool isIdentified = false;
    Standing standing = Standing::kUnknown;
    Identity identity;
    std::vector<std::function<void()>> waiting;
  };
  // One attempt to find out who a connection is. It comes to nothing where the connection has left.
  struct Attempt {
    std::string uniqueName;
    std::weak_ptr<Connection> connection;
    BusDriver::Credentials credentials;
    Inspection inspection;
  };

  void begin(const std::shared_ptr<Attempt>& attempt);
  void inspect(const std::shared_ptr<Attempt>& attempt);
  void checkAgain(const std::shared_ptr<Attempt>& attempt);
  void settleUnknown(const Attempt& attempt, const std::string& reason);
  void settle(const Attempt& attempt, Standing standing, Identity identity);
  // With the mutex held; null where the connection has left.
  std::shared_ptr<Connection> connectionOf(const std::string& uniqueName) const;

  BusDriver& bus_;
  const InstalledApplications& applications_;
  const std::function<void(std::function<void()>)> post_;
  const uid_t ownUser_;
  RVLogService& log_;
  mutable std::mutex mutex_;
  std::map<std::string, std::shared_ptr<Connection>, std::less<>> connections_;  // guarded by mutex_
  Inspections inspections_;  // goes first, as it calls back
};

}  // namespace clients
