// Processes that are held on to.
#pragma once

#include <sys/types.h>

#include <memory>

namespace clients {

// One process, which its number may outlive.
class ProcessHandle {
 public:
  virtual ~ProcessHandle() = default;
  // Whether it has not ended. As long as it has not, its number is its own.
  virtual bool isAlive() const = 0;
};

// Called from any thread.
class Processes {
 public:
  virtual ~Processes() = default;
  // The process that has the number now. Null where there is none, or where the system gives no handle.
  virtual std::unique_ptr<ProcessHandle> open(pid_t pid) = 0;
};

// The system's own, by file descriptors of processes.
class SystemProcesses final : public Processes {
 public:
  std::unique_ptr<ProcessHandle> open(pid_t pid) override;
};

}  // namespace clients
