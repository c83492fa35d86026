#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <thread>
#include <vector>

#include "daemon/clients/Identities.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using clients::Evidence;
using clients::Identities;
using clients::Registration;

constexpr uid_t kOwnUser = 1000;

class FakeBusDriver final : public clients::BusDriver {
 public:
  std::optional<uid_t> uid(const std::string&) override {
    ++uidsAsked;
    if (beforeAnswer) beforeAnswer();
    return answeredUID;
  }
  std::optional<pid_t> pid(const std::string&) override {
    ++pidsAsked;
    return answeredPID;
  }
  std::optional<uid_t> answeredUID = kOwnUser;
  std::optional<pid_t> answeredPID = 42;
  std::function<void()> beforeAnswer;
  std::atomic<int> uidsAsked = 0;
  std::atomic<int> pidsAsked = 0;
};

class AConnection : public testing::Test {
 protected:
  AConnection() { install("App"); }
  void install(const std::string& name) {
    files_.write("share/applications/org.example.App.desktop",
                 "[Desktop Entry]\nType=Application\nName=" + name + "\n");
  }

  support::TemporaryDirectory files_;
  clients::InstalledApplications applications_{{files_.path("share")}, {}};
  FakeBusDriver bus_;
  Identities identities_{bus_, applications_, kOwnUser};
};

TEST_F(AConnection, IsUnknownUntilItRegisters) {
  EXPECT_FALSE(identities_.identityOf(":1.1").application);
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.App"), Registration::kRegistered);
  const auto identity = identities_.identityOf(":1.1");
  ASSERT_TRUE(identity.application);
  EXPECT_EQ(identity.application->id, "org.example.App");
  EXPECT_EQ(identity.application->name, "App");
  EXPECT_EQ(identity.evidence, Evidence::kRegistered);
  EXPECT_FALSE(identities_.identityOf(":1.2").application);
}

TEST_F(AConnection, RegistersOnce) {
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.App"), Registration::kRegistered);
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.App"), Registration::kAlreadyIdentified);
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.None"), Registration::kAlreadyIdentified);
}

TEST_F(AConnection, IsNoApplicationThatIsNotInstalled) {
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.None"), Registration::kUnknownApplication);
  EXPECT_FALSE(identities_.identityOf(":1.1").application);
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.App"), Registration::kRegistered);
}

TEST_F(AConnection, KeepsTheNameThatItsApplicationHadWhenItRegistered) {
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.App"), Registration::kRegistered);
  install("Another name");
  EXPECT_EQ(identities_.identityOf(":1.1").application->name, "App");
}

TEST_F(AConnection, OfAnotherUserCannotRegister) {
  for (const uid_t user : {uid_t{0}, uid_t{1001}, uid_t{4000000000}, static_cast<uid_t>(-1)}) {
    bus_.answeredUID = user;
    const std::string name = ":1." + std::to_string(user);
    EXPECT_EQ(identities_.registerAs(name, "org.example.App"), Registration::kOtherUser);
    EXPECT_FALSE(identities_.isOwnUser(name));
    EXPECT_FALSE(identities_.identityOf(name).application);
  }
}

TEST_F(AConnection, ThatTheBusSaysNothingAboutIsNotTheOwnUsers) {
  bus_.answeredUID = std::nullopt;
  EXPECT_FALSE(identities_.isOwnUser(":1.1"));
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.App"), Registration::kOtherUser);
  bus_.answeredUID = kOwnUser;
  EXPECT_TRUE(identities_.isOwnUser(":1.1"));
}

TEST_F(AConnection, IsAskedAboutOnce) {
  for (int i = 0; i < 3; ++i) {
    EXPECT_TRUE(identities_.isOwnUser(":1.1"));
    EXPECT_EQ(identities_.pid(":1.1"), 42);
    identities_.registerAs(":1.1", "org.example.App");
  }
  EXPECT_EQ(bus_.uidsAsked, 1);
  EXPECT_EQ(bus_.pidsAsked, 1);
}

TEST_F(AConnection, ThatLeftTheBusIsForgotten) {
  EXPECT_EQ(identities_.registerAs(":1.1", "org.example.App"), Registration::kRegistered);
  identities_.forget(":1.1");
  EXPECT_FALSE(identities_.identityOf(":1.1").application);
  identities_.forget(":1.1");
}

TEST_F(AConnection, ThatLeavesWhileItRegistersIsForgotten) {
  bus_.beforeAnswer = [this] { identities_.forget(":1.1"); };
  identities_.registerAs(":1.1", "org.example.App");
  EXPECT_FALSE(identities_.identityOf(":1.1").application);
}

TEST_F(AConnection, ThatRegistersFromManyThreadsIsIdentifiedOnce) {
  std::atomic<int> registered = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < 8; ++i)
    threads.emplace_back([this, &registered] {
      if (identities_.registerAs(":1.1", "org.example.App") == Registration::kRegistered) ++registered;
    });
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(registered, 1);
  EXPECT_EQ(bus_.uidsAsked, 1);
}

}  // namespace
