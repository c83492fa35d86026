// Looking at processes without waiting for them.
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <memory>
#include <optional>
#include <thread>

#include "daemon/clients/InstalledApplications.h"
#include "daemon/clients/ProcessInspector.h"
#include "daemon/clients/Processes.h"

namespace clients {

// What one look at a process came to.
struct Inspection {
  std::shared_ptr<const ProcessHandle> process;  // null where there was nothing to hold on to
  ProcessFacts facts;
  std::optional<InstalledApplication> application;  // the one that its sandbox or its unit says it is
};

// Looks at the process that has the number. May wait without limit. Where it
// throws, the process is unknown.
using Inspect = std::function<Inspection(pid_t pid)>;

// Holds on to the process first, then looks at it, then finds the application among those installed. What
// it uses lives as long as it does.
Inspect makeInspect(std::shared_ptr<Processes> processes,
                    ProcessInspector inspector,
                    InstalledApplications applications);

// Runs inspections on threads of their own. One that does not end in time is given up: its process is then
// unknown, and its thread is left to itself. Thread-safe.
class Inspections {
 public:
  // most: how many may run at a time, those that were given up included. More of them wait; where all that
  // run were given up, they are not begun at all.
  Inspections(Inspect inspect, std::chrono::milliseconds deadline, std::size_t most);
  Inspections(const Inspections&) = delete;
  Inspections& operator=(const Inspections&) = delete;

  // Waits for no inspection: what is on its way has no effect any more. Nothing is called back after it.
  ~Inspections();

  // inspected: called once, on any thread, or on this one before begin returns; it takes no lock that is
  // held while begin is called. Not called where the object goes before.
  void begin(pid_t pid, std::function<void(Inspection)> inspected);

 private:
  struct Shared;
  const std::shared_ptr<Shared> shared_;
  std::thread watch_;  // gives up what has not ended in time
};

}  // namespace clients
