// What the system says about a process.
#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

namespace clients {

struct ProcessFacts {
  enum class Confinement {
    kUnknown,     // it could not be found out, or nothing here is made for it
    kUnconfined,  // it runs as the user's own programs do
    kConfined,    // it runs in a sandbox that names its application
  };
  Confinement confinement = Confinement::kUnknown;
  // Confined: the one that its sandbox names. Unconfined: those that the service manager may have started
  // it as, if any. Nobody has looked yet whether they are installed.
  std::vector<std::string> applicationIDs;
  std::string reason;  // why it is unknown, for the log
};

// Reads a process's files in the process file system. What cannot be read makes the process unknown; nothing
// that is missing by mistake counts as "there is none".
//
// Immutable; called from any thread. May wait without limit: a file system in the process's own view may be
// one that never answers.
class ProcessInspector {
 public:
  // procDirectory: "/proc". user: whose service manager is believed.
  ProcessInspector(std::string procDirectory, uid_t user);

  // What is found belongs to the process that had the number from before this was called until after it
  // has returned; where there was no such one, it belongs to nobody.
  ProcessFacts inspect(pid_t pid) const;

 private:
  const std::string procDirectory_;
  const uid_t user_;
};

}  // namespace clients
