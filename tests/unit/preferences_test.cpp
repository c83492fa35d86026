#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <stdexcept>
#include <thread>

#include "daemon/preferences/NotificationCenter.h"
#include "daemon/preferences/PreferencesStore.h"
#include "daemon/preferences/SerialQueues.h"
#include "tests/support/StoredState.h"

namespace {

using preferences::PreferencesStore;
using support::succeed;
using support::valueOf;
using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

class StoredPreferences : public ::testing::Test {
 protected:
  std::optional<RVValue> read(const std::string& application, const std::string& key) {
    return store_.ZQPreferencesCopyValue(key, application, kZQPreferencesCurrentUser, kZQPreferencesAnyHost);
  }

  support::TemporaryDirectory temporary_;
  std::unique_ptr<state::Directory> directory_ = valueOf(state::Directory::open(temporary_.path("rvd")));
  const std::string file_ = temporary_.path("rvd/preferences.json");
  fakes::FakeLog log_;
  PreferencesStore store_{*directory_, log_};
};

TEST_F(StoredPreferences, AreKeptInAFileForItsOwnerAlone) {
  const mode_t before = ::umask(0);
  succeed(store_.set("app", "key", true));
  ::umask(before);
  struct stat status {};
  ASSERT_EQ(::stat(file_.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600U);
  succeed(store_.set("app", "other", "text"));
  EXPECT_EQ(support::contentOf(file_), R"({"app":{"key":true,"other":"text"}})");
  PreferencesStore another(*directory_, log_);
  EXPECT_TRUE(valueOf(another.get("app", "key")) == RVValue(true));
}

TEST_F(StoredPreferences, AreReadFromTheFileByWhoeverManagesThem) {
  EXPECT_FALSE(read("app", "key"));
  succeed(store_.set("app", "key", 1));
  EXPECT_FALSE(read("app", "key"));
  EXPECT_TRUE(valueOf(store_.get("app", "key")) == RVValue(1));
  succeed(store_.reset("app", "key"));
  EXPECT_FALSE(valueOf(store_.get("app", "key")));
  succeed(store_.reset("app", "key"));
  succeed(store_.reset("nobody", "key"));
}

TEST_F(StoredPreferences, OfOneApplicationDoNotTouchAnothers) {
  succeed(store_.set("one", "key", 1));
  succeed(store_.set("two", "key", 2));
  succeed(store_.reset("one", "key"));
  EXPECT_TRUE(valueOf(store_.get("two", "key")) == RVValue(2));
}

TEST_F(StoredPreferences, WithAnyBytesInThemStayWhatTheyAre) {
  using std::string_literals::operator""s;
  succeed(store_.set("\xff", "\0"s, "\xc0\xaf"));
  succeed(store_.set("app", "key", "good"));
  EXPECT_TRUE(valueOf(store_.get("\xff", "\0"s)) == RVValue("\xc0\xaf"));
  EXPECT_TRUE(valueOf(store_.get("app", "key")) == RVValue("good"));
}

TEST_F(StoredPreferences, ThatAreDamagedAreSetAsideAndReported) {
  int number = 0;
  for (const std::string damaged : {"", "{", "[]", "{\"app\":", "no JSON"}) {
    temporary_.write("rvd/preferences.json", damaged, 0600);
    EXPECT_FALSE(valueOf(store_.get("app", "key")));
    EXPECT_EQ(support::contentOf(file_ + ".damaged-" + std::to_string(++number)), damaged);
    EXPECT_THAT(log_.texts(), Contains(HasSubstr("damaged-" + std::to_string(number))));
  }
  succeed(store_.set("app", "key", true));
  EXPECT_TRUE(valueOf(store_.get("app", "key")) == RVValue(true));
}

TEST_F(StoredPreferences, OfAnApplicationThatAreNoDictionaryAreNone) {
  temporary_.write("rvd/preferences.json", R"({"app":1,"other":{"key":2}})", 0600);
  EXPECT_FALSE(read("app", "key"));
  EXPECT_TRUE(read("other", "key") == RVValue(2));
}

TEST_F(StoredPreferences, ThatOthersCouldHaveWrittenAreAbsentAndLeftAlone) {
  temporary_.write("rvd/preferences.json", R"({"app":{"key":true}})", 0666);
  EXPECT_FALSE(read("app", "key"));
  EXPECT_FALSE(store_.get("app", "key"));
  EXPECT_FALSE(store_.set("app", "key", true));
  EXPECT_THAT(log_.texts(), Contains(HasSubstr("chmod 600")));
  // Once that is mended they are there, without anybody synchronising.
  ASSERT_EQ(::chmod(file_.c_str(), 0600), 0);
  EXPECT_TRUE(read("app", "key") == RVValue(true));
}

TEST_F(StoredPreferences, ThatWouldBeTooLargeAreNotStored) {
  succeed(store_.set("app", "key", true));
  const auto set = store_.set("app", "large", std::string(2 * 1024 * 1024, 'x'));
  ASSERT_FALSE(set);
  EXPECT_EQ(set.failure().kind, base::FailureKind::kInvalid);
  EXPECT_FALSE(valueOf(store_.get("app", "large")));
  EXPECT_TRUE(valueOf(store_.get("app", "key")) == RVValue(true));
}

TEST_F(StoredPreferences, CanBeChangedFromManyThreads) {
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&, t] {
      for (int i = 0; i < 10; ++i) {
        succeed(store_.set("app", std::to_string(t * 10 + i), i));
        (void)read("app", std::to_string(i));
        store_.ZQPreferencesAppSynchronize("app");
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  for (int i = 0; i < 40; ++i) EXPECT_TRUE(read("app", std::to_string(i)) == RVValue(i % 10));
}

class AQueueOfTheDaemon : public ::testing::Test {
 protected:
  fakes::FakeLog log_;
  preferences::SerialQueues queues_{log_};
};

TEST_F(AQueueOfTheDaemon, LogsTheExceptionOfWorkThatNobodyWaitsForAndGoesOn) {
  const auto queue = queues_.createSerialQueue("queue");
  queue->dispatchAsync([] { throw std::runtime_error("gone wrong"); });
  queue->dispatchAsync([] { throw 1; });
  queue->dispatchSync([] {});
  EXPECT_THAT(log_.texts(), Contains(HasSubstr("gone wrong")));
  EXPECT_EQ(log_.lines().size(), 2U);
}

TEST_F(AQueueOfTheDaemon, HasDoneAllWorkWhenItsLastReferenceIsGone) {
  int done = 0;
  auto queue = queues_.createSerialQueue("queue");
  for (int i = 0; i < 100; ++i) queue->dispatchAsync([&] { ++done; });
  queue.reset();
  EXPECT_EQ(done, 100);
}

TEST_F(AQueueOfTheDaemon, LetsAPostEndAlsoWhereAHandlerThrows) {
  preferences::NotificationCenter center;
  int ran = 0;
  const auto queue = queues_.createSerialQueue("queue");
  center.registerForNotification("changed", queue, [] { throw std::runtime_error("gone wrong"); });
  center.registerForNotification("changed", queue, [&] { ++ran; });
  center.post("changed");
  EXPECT_EQ(ran, 1);
  EXPECT_THAT(log_.texts(), Contains(HasSubstr("gone wrong")));
}

}  // namespace
