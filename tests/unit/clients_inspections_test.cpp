#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <condition_variable>
#include <future>
#include <mutex>

#include "daemon/clients/Inspections.h"
#include "tests/support/FakeProc.h"
#include "tests/support/FakeProcesses.h"

namespace {

using namespace std::chrono_literals;
using clients::Inspection;
using clients::Inspections;
using Confinement = clients::ProcessFacts::Confinement;

// Processes that are looked at for as long as the gate is closed.
class Gate {
 public:
  void open() {
    const std::lock_guard lock(mutex_);
    isOpen_ = true;
    changed_.notify_all();
  }
  void pass() {
    std::unique_lock lock(mutex_);
    ++inside_;
    changed_.notify_all();
    changed_.wait(lock, [this] { return isOpen_; });
    --inside_;
    changed_.notify_all();
  }
  void waitFor(int inside) {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [&] { return inside_ == inside; });
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  bool isOpen_ = false;
  int inside_ = 0;
};

clients::Inspect throughGate(std::shared_ptr<Gate> gate) {
  return [gate = std::move(gate)](pid_t pid) {
    if (pid < 100) gate->pass();
    return Inspection{nullptr, {Confinement::kUnconfined, {std::to_string(pid)}, ""}, std::nullopt};
  };
}

std::future<Inspection> begin(Inspections& inspections, pid_t pid) {
  auto promise = std::make_shared<std::promise<Inspection>>();
  inspections.begin(pid, [promise](Inspection result) { promise->set_value(std::move(result)); });
  return promise->get_future();
}

TEST(AnInspection, EndsWithWhatWasSeen) {
  Inspections inspections(throughGate(std::make_shared<Gate>()), 5min, 2);
  std::vector<std::future<Inspection>> results;
  for (pid_t pid = 100; pid < 150; ++pid) results.push_back(begin(inspections, pid));
  for (pid_t pid = 100; pid < 150; ++pid)
    EXPECT_EQ(results[static_cast<std::size_t>(pid - 100)].get().facts.applicationIDs.front(),
              std::to_string(pid));
}

TEST(AnInspection, ThatDoesNotEndIsGivenUpAndHoldsNobodyElseUp) {
  const auto gate = std::make_shared<Gate>();
  Inspections inspections(throughGate(gate), 50ms, 2);
  auto hanging = begin(inspections, 1);
  const auto result = hanging.get();
  EXPECT_EQ(result.facts.confinement, Confinement::kUnknown);
  EXPECT_EQ(result.facts.reason, "looking at its process took too long");
  for (pid_t pid = 100; pid < 110; ++pid)
    EXPECT_EQ(begin(inspections, pid).get().facts.confinement, Confinement::kUnconfined);
  gate->open();
}

TEST(AnInspection, IsNotBegunWhereAllThatRunWereGivenUp) {
  const auto gate = std::make_shared<Gate>();
  Inspections inspections(throughGate(gate), 50ms, 2);
  auto first = begin(inspections, 1);
  auto second = begin(inspections, 2);
  first.wait();
  second.wait();
  auto third = begin(inspections, 100);
  ASSERT_EQ(third.wait_for(0s), std::future_status::ready);
  EXPECT_EQ(third.get().facts.confinement, Confinement::kUnknown);
  gate->open();
  gate->waitFor(0);
  // The threads are free again, at the latest when they have seen that nobody waits for them.
  while (begin(inspections, 100).get().facts.confinement == Confinement::kUnknown) std::this_thread::yield();
}

TEST(AnInspection, ThatThrowsLeavesItsProcessUnknown) {
  Inspections inspections([](pid_t) -> Inspection { throw std::runtime_error("no memory"); }, 5min, 1);
  const auto result = begin(inspections, 1).get();
  EXPECT_EQ(result.facts.confinement, Confinement::kUnknown);
  EXPECT_NE(result.facts.reason.find("no memory"), std::string::npos);
}

TEST(AnInspection, ThatNoThreadTakesInTimeIsGivenUp) {
  const auto gate = std::make_shared<Gate>();
  Inspections inspections(throughGate(gate), 50ms, 1);
  auto first = begin(inspections, 1);
  auto second = begin(inspections, 100);
  EXPECT_EQ(first.get().facts.confinement, Confinement::kUnknown);
  EXPECT_EQ(second.get().facts.confinement, Confinement::kUnknown);
  gate->open();
}

TEST(AnInspection, ThatHangsHoldsUpNobodyWhoStops) {
  const auto gate = std::make_shared<Gate>();
  bool isCalled = false;
  {
    Inspections inspections(throughGate(gate), 5min, 1);
    inspections.begin(1, [&](const Inspection&) { isCalled = true; });
    inspections.begin(2, [&](const Inspection&) { isCalled = true; });
    gate->waitFor(1);
  }
  gate->open();
  gate->waitFor(0);
  EXPECT_FALSE(isCalled);
}

class ALook : public testing::Test {
 protected:
  ALook() { processes_->start(1, Confinement::kUnknown); }
  void install(const std::string& id, const std::string& more = "") {
    files_.write("share/applications/" + id + ".desktop",
                 "[Desktop Entry]\nType=Application\nName=The " + id + "\n" + more);
  }
  void startAs(const std::string& unit) {
    proc_.addUnconfined(1);
    proc_.setControlGroup(1, "/user.slice/user-1000.slice/user@1000.service/app.slice/" + unit);
  }
  std::optional<std::string> idSeen() {
    seen_ = clients::makeInspect(processes_,
                                 clients::ProcessInspector(proc_.path(), 1000),
                                 clients::InstalledApplications({files_.path("share")}, {}))(1);
    return seen_.application ? std::optional(seen_.application->id) : std::nullopt;
  }

  support::TemporaryDirectory files_;
  support::FakeProc proc_;
  std::shared_ptr<support::FakeProcesses> processes_ = std::make_shared<support::FakeProcesses>();
  Inspection seen_;
};

TEST_F(ALook, FindsTheNameOfTheSandboxesApplication) {
  proc_.addFlatpak(1, "org.example.Photos");
  EXPECT_EQ(idSeen(), "org.example.Photos");
  EXPECT_EQ(seen_.application->name, "org.example.Photos");
  install("org.example.Photos", "X-Flatpak=org.example.Photos\n");
  EXPECT_EQ(idSeen(), "org.example.Photos");
  EXPECT_EQ(seen_.application->name, "The org.example.Photos");
  EXPECT_NE(seen_.process, nullptr);
}

TEST_F(ALook, BelievesAUnitOfAnInstalledApplicationThatIsInNoSandbox) {
  startAs("app-org.example.Photos-1.scope");
  EXPECT_EQ(idSeen(), std::nullopt);
  EXPECT_EQ(seen_.facts.confinement, Confinement::kUnconfined);
  install("org.example.Photos");
  EXPECT_EQ(idSeen(), "org.example.Photos");
  EXPECT_EQ(seen_.application->name, "The org.example.Photos");
  install("org.example.Photos", "X-Flatpak=org.example.Photos\n");
  EXPECT_EQ(idSeen(), std::nullopt);
}

TEST_F(ALook, BelievesNoUnitThatMayMeanTwoApplications) {
  startAs("app-gnome-org.example.Photos.service");
  install("org.example.Photos");
  EXPECT_EQ(idSeen(), "org.example.Photos");
  install("gnome");
  EXPECT_EQ(idSeen(), std::nullopt);
  EXPECT_EQ(seen_.facts.confinement, Confinement::kUnconfined);
}

TEST_F(ALook, AtAProcessThatIsNotThereIsUnknown) {
  startAs("app-org.example.Photos-1.scope");
  install("org.example.Photos");
  processes_->end(1);
  EXPECT_EQ(idSeen(), std::nullopt);
  EXPECT_EQ(seen_.facts.confinement, Confinement::kUnknown);
}

TEST(ASystemProcess, IsAliveUntilItHasEnded) {
  clients::SystemProcesses processes;
  int ends[2];
  ASSERT_EQ(::pipe(ends), 0);
  const pid_t child = ::fork();
  if (child == 0) {
    char byte = 0;
    ::close(ends[1]);
    ::_exit(static_cast<int>(::read(ends[0], &byte, 1)));
  }
  ::close(ends[0]);
  const auto process = processes.open(child);
  ASSERT_NE(process, nullptr);
  EXPECT_TRUE(process->isAlive());
  ::close(ends[1]);
  siginfo_t info{};
  ::waitid(P_PID, static_cast<id_t>(child), &info, WEXITED | WNOWAIT);
  EXPECT_FALSE(process->isAlive());  // it has ended, though its number is not free yet
  ::waitpid(child, nullptr, 0);
  EXPECT_FALSE(process->isAlive());
  EXPECT_EQ(processes.open(child), nullptr);
  EXPECT_EQ(processes.open(0), nullptr);
}

}  // namespace
