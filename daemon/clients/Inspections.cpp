#include "daemon/clients/Inspections.h"

#include <algorithm>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <exception>
#include <map>
#include <mutex>
#include <string>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

namespace clients {
namespace {

using Clock = std::chrono::steady_clock;
using Inspected = std::function<void(Inspection)>;

Inspection unknown(std::string reason) {
  return {nullptr, {ProcessFacts::Confinement::kUnknown, {}, std::move(reason)}, std::nullopt};
}

// The only one of them that is installed and that no sandbox owns.
std::optional<InstalledApplication> onlyOwnOne(const InstalledApplications& applications,
                                               const std::vector<std::string>& ids) {
  std::optional<InstalledApplication> only;
  for (const std::string& id : ids) {
    auto found = applications.find(id);
    if (!found || found->belongsToSandbox) continue;
    if (only) return std::nullopt;
    only = std::move(found);
  }
  return only;
}

}  // namespace

Inspect makeInspect(std::shared_ptr<Processes> processes,
                    ProcessInspector inspector,
                    InstalledApplications applications) {
  return [processes = std::move(processes),
          inspector = std::move(inspector),
          applications = std::move(applications)](pid_t pid) {
    std::shared_ptr<const ProcessHandle> process = processes->open(pid);
    if (process == nullptr) return unknown("its process cannot be held on to");
    Inspection result{process, inspector.inspect(pid), std::nullopt};
    const auto& ids = result.facts.applicationIDs;
    if (result.facts.confinement == ProcessFacts::Confinement::kConfined)
      result.application = applications.find(ids.front()).value_or(namedByItsID(ids.front()));
    else
      result.application = onlyOwnOne(applications, ids);
    return result;
  };
}

// What the threads work with, for as long as any of them runs. Once it is closed, none calls back.
struct Inspections::Shared : std::enable_shared_from_this<Shared> {
  struct Job {
    pid_t pid = 0;
    Inspected inspected;
    Clock::time_point deadline;
    bool runs = false;
  };
  using ID = std::uint64_t;

  Shared(Inspect inspectProcess, std::chrono::milliseconds longest, std::size_t mostThreads)
      : inspect(std::move(inspectProcess)),
        deadline(longest),
        most(mostThreads) {}

  // In these, `lock` holds the mutex; it is let go of while a callback runs.
  void deliver(std::unique_lock<std::mutex>& lock, Inspected inspected, Inspection result);
  bool startThread();

  Inspection inspectSafely(pid_t pid) const;
  void runThread();
  void watch();

  const Inspect inspect;
  const std::chrono::milliseconds deadline;
  const std::size_t most;

  std::mutex mutex;  // protects everything below
  std::condition_variable changed;
  std::map<ID, Job> jobs;  // not yet called back; in the order of their deadlines
  std::deque<ID> queue;    // those that no thread has taken
  ID lastID = 0;
  std::size_t threads = 0;
  std::size_t givenUp = 0;     // threads whose job is not waited for any more
  std::size_t delivering = 0;  // callbacks that run
  bool isClosed = false;
};

void Inspections::Shared::deliver(std::unique_lock<std::mutex>& lock,
                                  Inspected inspected,
                                  Inspection result) {
  ++delivering;
  lock.unlock();
  inspected(std::move(result));
  inspected = nullptr;
  lock.lock();
  --delivering;
  changed.notify_all();
}

bool Inspections::Shared::startThread() {
  try {
    std::thread([self = shared_from_this()] { self->runThread(); }).detach();
    ++threads;
    return true;
  } catch (const std::system_error&) {  // the system has no thread left
    return false;
  }
}

Inspection Inspections::Shared::inspectSafely(pid_t pid) const {
  try {
    return inspect(pid);
  } catch (const std::exception& exception) {  // there is no memory left, for example
    return unknown(std::string("its process could not be looked at: ") + exception.what());
  }
}

void Inspections::Shared::runThread() {
  std::unique_lock lock(mutex);
  while (!queue.empty() && !isClosed) {
    const ID id = queue.front();
    queue.pop_front();
    const auto taken = jobs.find(id);
    if (taken == jobs.end()) continue;
    taken->second.runs = true;
    const pid_t pid = taken->second.pid;
    lock.unlock();
    Inspection result = inspectSafely(pid);
    lock.lock();
    const auto job = jobs.find(id);
    if (job == jobs.end()) {
      if (givenUp > 0) --givenUp;
      continue;
    }
    Inspected inspected = std::move(job->second.inspected);
    jobs.erase(job);
    if (!isClosed) deliver(lock, std::move(inspected), std::move(result));
  }
  --threads;
}

// Gives up what has not ended in time.
void Inspections::Shared::watch() {
  std::unique_lock lock(mutex);
  while (!isClosed) {
    if (jobs.empty()) {
      changed.wait(lock);
      continue;
    }
    const auto first = jobs.begin();
    // A copy: who waits looks at it again when the job may be gone.
    const Clock::time_point until = first->second.deadline;
    if (Clock::now() < until) {
      changed.wait_until(lock, until);
      continue;
    }
    if (first->second.runs) ++givenUp;
    Inspected inspected = std::move(first->second.inspected);
    jobs.erase(first);
    deliver(lock, std::move(inspected), unknown("looking at its process took too long"));
  }
}

Inspections::Inspections(Inspect inspect, std::chrono::milliseconds deadline, std::size_t most)
    : shared_(std::make_shared<Shared>(std::move(inspect), deadline, most)),
      watch_([shared = shared_] { shared->watch(); }) {
}

Inspections::~Inspections() {
  std::map<Shared::ID, Shared::Job> dropped;
  {
    std::unique_lock lock(shared_->mutex);
    shared_->isClosed = true;
    shared_->changed.notify_all();
    shared_->changed.wait(lock, [this] { return shared_->delivering == 0; });
    dropped.swap(shared_->jobs);
  }
  watch_.join();
}

void Inspections::begin(pid_t pid, std::function<void(Inspection)> inspected) {
  Shared& shared = *shared_;
  std::unique_lock lock(shared.mutex);
  if (shared.givenUp >= shared.most)
    return shared.deliver(
        lock, std::move(inspected), unknown("too many processes do not let themselves be looked at"));
  const Shared::ID id = ++shared.lastID;
  shared.jobs.emplace(id, Shared::Job{pid, std::move(inspected), Clock::now() + shared.deadline});
  shared.queue.push_back(id);
  if (shared.jobs.size() == 1) shared.changed.notify_all();
  if (shared.threads < shared.most && !shared.startThread() && shared.threads == 0) {
    const auto job = shared.jobs.find(id);
    Inspected mine = std::move(job->second.inspected);
    shared.jobs.erase(job);
    shared.queue.pop_back();
    shared.deliver(lock, std::move(mine), unknown("the system has no thread to look at its process"));
  }
}

}  // namespace clients
