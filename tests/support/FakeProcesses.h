// Processes of a test's own, with numbers that are given again.
#pragma once

#include <atomic>
#include <map>
#include <memory>
#include <mutex>
#include <utility>

#include "daemon/clients/Inspections.h"

namespace support {

// Thread-safe.
class FakeProcesses final : public clients::Processes {
 public:
  struct Process {
    clients::ProcessFacts facts;
    std::optional<clients::InstalledApplication> application;
    std::atomic<bool> isAlive = true;
  };

  // Starts a process that has the number from now on; the one that had it has ended.
  void start(pid_t pid,
             clients::ProcessFacts::Confinement confinement,
             std::optional<clients::InstalledApplication> application = std::nullopt) {
    auto process = std::make_shared<Process>();
    process->facts.confinement = confinement;
    process->application = std::move(application);
    const std::lock_guard lock(mutex_);
    endLocked(pid);
    processes_[pid] = std::move(process);
  }
  void end(pid_t pid) {
    const std::lock_guard lock(mutex_);
    endLocked(pid);
  }

  std::unique_ptr<clients::ProcessHandle> open(pid_t pid) override {
    auto process = find(pid);
    return process != nullptr ? std::make_unique<Handle>(std::move(process)) : nullptr;
  }

  // What is to be seen of the process that has the number now.
  clients::Inspection look(pid_t pid) {
    const auto process = find(pid);
    if (process == nullptr)
      return {nullptr, {clients::ProcessFacts::Confinement::kUnknown, {}, "there is none"}, std::nullopt};
    return {nullptr, process->facts, process->application};
  }

 private:
  class Handle final : public clients::ProcessHandle {
   public:
    explicit Handle(std::shared_ptr<Process> process)
        : process_(std::move(process)) {}
    bool isAlive() const override { return process_->isAlive; }

   private:
    const std::shared_ptr<Process> process_;
  };

  std::shared_ptr<Process> find(pid_t pid) {
    const std::lock_guard lock(mutex_);
    const auto entry = processes_.find(pid);
    return entry != processes_.end() ? entry->second : nullptr;
  }
  void endLocked(pid_t pid) {
    const auto entry = processes_.find(pid);
    if (entry == processes_.end()) return;
    entry->second->isAlive = false;
    processes_.erase(entry);
  }

  std::mutex mutex_;
  std::map<pid_t, std::shared_ptr<Process>> processes_;
};

}  // namespace support
