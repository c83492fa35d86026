#include <gtest/gtest.h>

#include <vector>

#include "daemon/clients/Identities.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/FakeBus.h"
#include "tests/support/FakeProcesses.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using clients::Evidence;
using clients::Identities;
using clients::Registration;
using Confinement = clients::ProcessFacts::Confinement;

constexpr uid_t kOwnUser = 1000;
constexpr pid_t kProcess = 42;
const clients::InstalledApplication kPhotos{"org.example.Photos", "Photos", "", true};

class AConnection : public testing::Test {
 protected:
  AConnection() {
    install("App");
    bus_.connections[":1.1"] = {kOwnUser, kProcess};
    processes_.start(kProcess, Confinement::kUnconfined);
  }
  void install(const std::string& name, const std::string& more = "") {
    files_.write("share/applications/org.example.App.desktop",
                 "[Desktop Entry]\nType=Application\nName=" + name + "\n" + more);
  }
  clients::Inspection inspect(pid_t pid) {
    std::shared_ptr<clients::ProcessHandle> process = processes_.open(pid);
    auto inspection = processes_.look(pid);
    inspection.process = std::move(process);
    if (afterLook) afterLook();
    return inspection;
  }
  // Brings the identification of the connection to its end; whether its call was let through to there.
  bool identify(const std::string& name = ":1.1") {
    bool isCalled = false;
    EXPECT_TRUE(identities_.whenIdentified(name, [&] { isCalled = true; }));
    if (!isCalled && bus_.connections.contains(name)) loop_.runOne();
    return isCalled;
  }
  Registration registered(const std::string& id = "org.example.App") {
    identify();
    return identities_.registerAs(":1.1", id);
  }
  void expectUnknown(const std::string& name = ":1.1") {
    EXPECT_FALSE(identities_.isUnconfined(name));
    EXPECT_FALSE(identities_.identityOf(name).application);
    EXPECT_EQ(identities_.identityOf(name).evidence, Evidence::kUnknown);
  }

  support::TemporaryDirectory files_;
  clients::InstalledApplications applications_{{files_.path("share")}, {}};
  support::FakeBusDriver bus_;
  support::FakeProcesses processes_;
  std::function<void()> afterLook;  // on the inspecting thread
  support::FakeLoop loop_;
  fakes::FakeLog log_;
  Identities identities_{bus_,
                         {[this](pid_t pid) { return inspect(pid); }, std::chrono::minutes(5), 4},
                         applications_,
                         loop_.post(),
                         kOwnUser,
                         log_};
};

TEST_F(AConnection, IsUnknownUntilItIsIdentified) {
  EXPECT_FALSE(identities_.isOwnUser(":1.1"));
  expectUnknown();
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.App"), Registration::kNotPossible);
  EXPECT_TRUE(identify());
  EXPECT_TRUE(identities_.isOwnUser(":1.1"));
  EXPECT_TRUE(identities_.isUnconfined(":1.1"));
}

TEST_F(AConnection, OfAnUnconfinedProgramIsWhatItRegistersAs) {
  EXPECT_EQ(registered(), Registration::kRegistered);
  const auto identity = identities_.identityOf(":1.1");
  ASSERT_TRUE(identity.application);
  EXPECT_EQ(identity.application->id, "org.example.App");
  EXPECT_EQ(identity.application->name, "App");
  EXPECT_EQ(identity.evidence, Evidence::kRegistered);
  EXPECT_TRUE(identities_.isUnconfined(":1.1"));
  expectUnknown(":1.2");
}

TEST_F(AConnection, RegistersOnce) {
  EXPECT_EQ(registered(), Registration::kRegistered);
  EXPECT_EQ(registered(), Registration::kAlreadyIdentified);
  EXPECT_EQ(registered("org.example.None"), Registration::kAlreadyIdentified);
}

TEST_F(AConnection, IsNoApplicationThatIsNotInstalled) {
  EXPECT_EQ(registered("org.example.None"), Registration::kUnknownApplication);
  EXPECT_FALSE(identities_.identityOf(":1.1").application);
  EXPECT_EQ(registered(), Registration::kRegistered);
}

TEST_F(AConnection, OfAnUnconfinedProgramIsNoSandboxesApplication) {
  install("App", "X-Flatpak=org.example.App\n");
  EXPECT_EQ(registered(), Registration::kSandboxed);
  EXPECT_FALSE(identities_.identityOf(":1.1").application);
}

TEST_F(AConnection, KeepsTheNameThatItsApplicationHadWhenItRegistered) {
  EXPECT_EQ(registered(), Registration::kRegistered);
  install("Another name");
  EXPECT_EQ(identities_.identityOf(":1.1").application->name, "App");
}

TEST_F(AConnection, OfAConfinedProgramIsWhatItsSandboxSays) {
  processes_.start(kProcess, Confinement::kConfined, kPhotos);
  EXPECT_TRUE(identify());
  EXPECT_EQ(identities_.identityOf(":1.1").application->id, "org.example.Photos");
  EXPECT_EQ(identities_.identityOf(":1.1").evidence, Evidence::kSandbox);
  EXPECT_TRUE(identities_.isOwnUser(":1.1"));
  EXPECT_FALSE(identities_.isUnconfined(":1.1"));
  EXPECT_EQ(registered(), Registration::kAlreadyIdentified);
}

TEST_F(AConnection, ThatTheServiceManagerStartedIsTheApplicationOfItsUnit) {
  processes_.start(kProcess, Confinement::kUnconfined, kPhotos);
  EXPECT_TRUE(identify());
  EXPECT_EQ(identities_.identityOf(":1.1").application->id, "org.example.Photos");
  EXPECT_EQ(identities_.identityOf(":1.1").evidence, Evidence::kScope);
  EXPECT_TRUE(identities_.isUnconfined(":1.1"));
  EXPECT_EQ(registered(), Registration::kAlreadyIdentified);
}

TEST_F(AConnection, ThatCouldNotBeLookedAtIsUnknownAndSaysWhyInTheLog) {
  processes_.end(kProcess);
  EXPECT_TRUE(identify());
  expectUnknown();
  EXPECT_TRUE(identities_.isOwnUser(":1.1"));
  EXPECT_EQ(registered(), Registration::kNotPossible);
  ASSERT_EQ(log_.lines().size(), 1u);
  EXPECT_EQ(log_.lines().front().arguments, (std::vector<std::optional<RVValue>>{":1.1", "there is none"}));
}

TEST_F(AConnection, OfAnotherUserIsNotLookedAt) {
  for (const uid_t user : {uid_t{0}, uid_t{1001}, uid_t{4000000000}, static_cast<uid_t>(-1)}) {
    const std::string name = ":2." + std::to_string(user);
    bus_.connections[name] = {user, kProcess};
    bool isCalled = false;
    identities_.whenIdentified(name, [&] { isCalled = true; });
    EXPECT_TRUE(isCalled);
    EXPECT_FALSE(identities_.isOwnUser(name));
    EXPECT_EQ(identities_.registerAs(name, "org.example.App"), Registration::kNotPossible);
    expectUnknown(name);
  }
  EXPECT_EQ(bus_.asked, 4);
}

TEST_F(AConnection, ThatTheBusSaysNothingAboutIsNotTheOwnUsersAndIsAskedAboutAnew) {
  EXPECT_FALSE(identities_.isOwnUser(":1.9"));
  bool isOwn = true;
  identities_.whenIdentified(":1.9", [&] { isOwn = identities_.isOwnUser(":1.9"); });
  EXPECT_FALSE(isOwn);
  bus_.connections[":1.9"] = {kOwnUser, kProcess};
  EXPECT_TRUE(identify(":1.9"));
  EXPECT_TRUE(identities_.isOwnUser(":1.9"));
}

TEST_F(AConnection, WhoseProcessTheBusDoesNotNameIsUnknown) {
  bus_.connections[":1.1"].pid = std::nullopt;
  EXPECT_TRUE(identify());
  expectUnknown();
  EXPECT_TRUE(identities_.isOwnUser(":1.1"));
}

TEST_F(AConnection, IsIdentifiedOnce) {
  for (int i = 0; i < 3; ++i) EXPECT_TRUE(identify());
  EXPECT_EQ(bus_.asked, 2);
}

TEST_F(AConnection, WhoseProcessEndsWhileItIsLookedAtIsUnknown) {
  processes_.start(kProcess, Confinement::kConfined, kPhotos);
  afterLook = [this] { processes_.end(kProcess); };
  EXPECT_TRUE(identify());
  expectUnknown();
}

TEST_F(AConnection, ThatTheBusNamesAnotherProcessForAfterwardsIsUnknown) {
  processes_.start(kProcess, Confinement::kConfined, kPhotos);
  using Credentials = clients::BusDriver::Credentials;
  int count = 0;
  for (const Credentials& later : {Credentials{kOwnUser, 43},
                                   Credentials{1001, kProcess},
                                   Credentials{kOwnUser, std::nullopt},
                                   Credentials{std::nullopt, kProcess},
                                   Credentials{}}) {
    const std::string name = ":3." + std::to_string(++count);
    bus_.connections[name] = {kOwnUser, kProcess};
    bus_.beforeAnswer = [this, name, later, answers = 0]() mutable {
      if (++answers == 2) bus_.connections[name] = later;
    };
    EXPECT_TRUE(identify(name));
    expectUnknown(name);
  }
}

TEST_F(AConnection, HasItsCallsWaitInTheirOrderWhileOthersDoNot) {
  bus_.answersAtOnce = false;
  bus_.connections[":1.2"] = {kOwnUser, kProcess};
  std::vector<int> ran;
  for (int i = 0; i < 3; ++i) identities_.whenIdentified(":1.1", [&ran, i] { ran.push_back(i); });
  identities_.whenIdentified(":1.2", [&ran] { ran.push_back(9); });
  EXPECT_EQ(bus_.open(), 2u);
  EXPECT_TRUE(bus_.answerOne());
  EXPECT_TRUE(bus_.answerOne());
  loop_.runOne();
  loop_.runOne();
  EXPECT_TRUE(ran.empty());
  EXPECT_TRUE(bus_.answerOne());
  EXPECT_TRUE(bus_.answerOne());
  EXPECT_EQ(ran.size(), 4u);
  std::erase(ran, 9);
  EXPECT_EQ(ran, (std::vector<int>{0, 1, 2}));
  identities_.whenIdentified(":1.1", [&ran] { ran.push_back(3); });
  EXPECT_EQ(ran, (std::vector<int>{0, 1, 2, 3}));
}

TEST_F(AConnection, HasNoMoreThanSomeCallsWait) {
  bus_.answersAtOnce = false;
  int ran = 0;
  int taken = 0;
  for (int i = 0; i < 300; ++i)
    if (identities_.whenIdentified(":1.1", [&ran] { ++ran; })) ++taken;
  EXPECT_EQ(taken, 256);
  bus_.answerOne();
  loop_.runOne();
  bus_.answerOne();
  EXPECT_EQ(ran, 256);
}

TEST_F(AConnection, ThatLeftTheBusIsForgotten) {
  EXPECT_EQ(registered(), Registration::kRegistered);
  identities_.forget(":1.1");
  expectUnknown();
  EXPECT_FALSE(identities_.isOwnUser(":1.1"));
  EXPECT_TRUE(identities_.connectionsOf("org.example.App").empty());
  identities_.forget(":1.1");
}

TEST_F(AConnection, IsFoundByItsApplication) {
  EXPECT_TRUE(identities_.connectionsOf("org.example.App").empty());
  registered();
  EXPECT_EQ(identities_.connectionsOf("org.example.App"), (std::vector<std::string>{":1.1"}));
  EXPECT_TRUE(identities_.connectionsOf("org.example.Photos").empty());
}

}  // namespace
