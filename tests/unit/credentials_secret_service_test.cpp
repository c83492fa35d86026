#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sdbus-c++/sdbus-c++.h>

#include <csignal>
#include <cstdio>
#include <filesystem>
#include <future>
#include <thread>

#include "daemon/credentials/SecretServiceStore.h"
#include "tests/support/DesktopKeyring.h"
#include "tests/support/StoredState.h"

namespace {

using credentials::Place;
using credentials::SecretServiceStore;
using support::succeed;
using support::valueOf;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

const Place kPlace{"account-1", "org.example.PhotoApp"};

RVAccountCredential credential(const std::string& token) {
  return {RVSecret(token), RVSecret(), kRVDistantFuture};
}

class TheDesktopsKeyring : public ::testing::Test {
 protected:
  std::string token(const Place& place = kPlace) {
    const auto found = valueOf(store_.read(place));
    return found ? std::string(found->oauthToken().reveal()) : "(absent)";
  }
  // Every call of the store, each of which is to fail with this.
  void expectFailures(const std::string& message) {
    const auto expect = [&](const auto& result) {
      ASSERT_FALSE(result);
      EXPECT_TRUE(result.failure().kind == base::FailureKind::kFailed);
      EXPECT_THAT(result.failure().message, HasSubstr(message));
    };
    expect(store_.read(kPlace));
    expect(store_.read({"account-2", std::nullopt}));
    expect(store_.write(kPlace, credential("new")));
    expect(store_.remove(kPlace));
    expect(store_.places());
  }
  // What a program of the desktop prints.
  static std::string output(const std::string& command) {
    std::FILE* pipe = ::popen(command.c_str(), "r");
    std::string text;
    for (int byte = std::fgetc(pipe); byte != EOF; byte = std::fgetc(pipe)) text += static_cast<char>(byte);
    ::pclose(pipe);
    return text;
  }

  support::DesktopKeyring keyring_;
  SecretServiceStore store_{"a database"};
};

TEST_F(TheDesktopsKeyring, HoldsAnItemThatAPersonCanTellAndThatSaysNoToken) {
  succeed(store_.write(kPlace, credential("the-token")));
  const std::string shown =
      output("secret-tool search --all account account-1 client org.example.PhotoApp 2>&1");
  EXPECT_THAT(shown, HasSubstr("label = rvd: access of org.example.PhotoApp to account account-1\n"));
  EXPECT_THAT(shown, HasSubstr("schema = com.zentor.rvd.Credential\n"));
  EXPECT_THAT(shown, HasSubstr("attribute.kind = client\n"));
  EXPECT_EQ(shown.find("the-token"), std::string::npos);
  succeed(store_.remove(kPlace));
  EXPECT_EQ(output("secret-tool search --all account account-1 2>&1"), "");
}

TEST_F(TheDesktopsKeyring, KeepsCredentialsOverItsRestart) {
  const std::string canary = "canary-5f0c7be1d2a94e38";
  succeed(store_.write(kPlace, credential(canary)));
  keyring_.restart();
  EXPECT_EQ(token(), canary);
  for (const auto& file : std::filesystem::recursive_directory_iterator(keyring_.home())) {
    if (file.is_regular_file()) {
      EXPECT_EQ(support::contentOf(file.path()).find(canary), std::string::npos) << file.path();
    }
  }
}

TEST_F(TheDesktopsKeyring, ThatIsLockedIsAnErrorAndNobodyIsAskedToUnlockIt) {
  succeed(store_.write(kPlace, credential("token")));
  keyring_.lock();
  expectFailures("the desktop's keyring is locked");
  keyring_.restart();
  EXPECT_EQ(token(), "token");
}

TEST_F(TheDesktopsKeyring, ThatIsGoneIsAnErrorUntilItIsBack) {
  succeed(store_.write(kPlace, credential("token")));
  keyring_.kill();
  expectFailures("the desktop's keyring cannot be used: ");
  keyring_.start();
  EXPECT_EQ(token(), "token");
  succeed(store_.write(kPlace, credential("new")));
  EXPECT_EQ(token(), "new");
}

TEST_F(TheDesktopsKeyring, ThatDoesNotAnswerIsAnErrorInTime) {
  succeed(store_.write(kPlace, credential("token")));
  SecretServiceStore impatient("a database", std::chrono::milliseconds(50));
  keyring_.signal(SIGSTOP);
  const auto read = impatient.read(kPlace);
  keyring_.signal(SIGCONT);
  ASSERT_FALSE(read);
  EXPECT_EQ(read.failure().message, "the desktop's keyring did not answer in time");
  EXPECT_EQ(token(), "token");
}

TEST_F(TheDesktopsKeyring, ThatGoesDuringACallIsAnErrorOfThatCall) {
  succeed(store_.write(kPlace, credential("token")));
  SecretServiceStore patient("a database", std::chrono::minutes(10));
  for (int round = 0; round < 3; ++round) {
    const auto connection = sdbus::createSessionBusConnection();
    std::promise<void> joined;
    connection->addMatch(
        "type='signal',sender='org.freedesktop.DBus',member='NameOwnerChanged'",
        [&, isFirst = true](sdbus::Message&) mutable {
          if (std::exchange(isFirst, false)) joined.set_value();
        },
        sdbus::floating_slot);
    connection->enterEventLoopAsync();
    keyring_.signal(SIGSTOP);
    auto call = std::async(std::launch::async, [&] { return patient.write(kPlace, credential("lost")); });
    joined.get_future().wait();  // the call is on the bus now, and the keyring says nothing
    keyring_.kill();
    const auto written = call.get();
    ASSERT_FALSE(written);
    EXPECT_THAT(written.failure().message, HasSubstr("the desktop's keyring cannot be used: "));
    connection->leaveEventLoop();
    keyring_.start();
    EXPECT_EQ(token(), "token");
  }
}

TEST_F(TheDesktopsKeyring, KeepsDatabasesAndOtherProgramsApart) {
  SecretServiceStore other("another database");
  succeed(store_.write(kPlace, credential("token")));
  succeed(other.write(kPlace, credential("another")));
  output(
      "printf secret | secret-tool store --label=foreign database 'a%20database' account account-1 kind "
      "account");
  EXPECT_EQ(token(), "token");
  EXPECT_THAT(valueOf(store_.places()), ElementsAre(kPlace));
  EXPECT_EQ(token({"account-1", std::nullopt}), "(absent)");
  succeed(store_.remove(kPlace));
  succeed(store_.remove({"account-1", std::nullopt}));
  EXPECT_THAT(valueOf(store_.places()), IsEmpty());
  EXPECT_EQ(valueOf(other.read(kPlace))->oauthToken().reveal(), "another");
  EXPECT_EQ(output("secret-tool lookup kind account"), "secret");
}

TEST_F(TheDesktopsKeyring, ThatHoldsSomethingElseInAPlaceSaysSo) {
  output(
      "printf 'no credential' | secret-tool store --label=x xdg:schema com.zentor.rvd.Credential "
      "database 'a%20database' account account-1 kind client client org.example.PhotoApp");
  const auto read = store_.read(kPlace);
  ASSERT_FALSE(read);
  EXPECT_TRUE(read.failure().kind == base::FailureKind::kDamaged);
  EXPECT_EQ(read.failure().message.find("no credential\""), std::string::npos);
  succeed(store_.write(kPlace, credential("token")));
  EXPECT_EQ(token(), "token");
}

TEST_F(TheDesktopsKeyring, IsUsedFromManyThreadsAndLeftAsItWas) {
  const auto descriptors = [] {
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return std::distance(begin(all), end(all));
  };
  succeed(store_.write(kPlace, credential("token")));
  const auto before = descriptors();
  std::vector<std::thread> threads;
  for (int number = 0; number < 4; ++number)
    threads.emplace_back([this, number] {
      const Place place{"account-1", "app" + std::to_string(number)};
      for (int round = 0; round < 10; ++round) {
        succeed(store_.write(place, credential(std::to_string(round))));
        EXPECT_EQ(token(place), std::to_string(round));
      }
      succeed(store_.remove(place));
    });
  for (std::thread& thread : threads) thread.join();
  EXPECT_THAT(valueOf(store_.places()), ElementsAre(kPlace));
  // A connection is closed soon after its call, on a thread of the library's.
  EXPECT_LT(descriptors(), before + 20);
}

}  // namespace
