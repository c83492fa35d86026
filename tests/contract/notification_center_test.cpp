#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

#include "tests/contract/Suites.h"

namespace contract {
namespace {

template <typename Services>
class NotificationCenter : public ::testing::Test {
 protected:
  Services services_;
};

TYPED_TEST_SUITE(NotificationCenter, Implementations, Names);

TYPED_TEST(NotificationCenter, RunsTheHandlerOnItsQueueEachTimeBeforeThePostReturns) {
  const auto queue = this->services_.serialQueues().createSerialQueue("queue");
  std::thread::id queueThread;
  queue->dispatchSync([&] { queueThread = std::this_thread::get_id(); });
  std::vector<std::thread::id> ran;
  this->services_.notifications().registerForNotification(
      "changed", queue, [&] { ran.push_back(std::this_thread::get_id()); });
  this->services_.post("changed");
  EXPECT_EQ(ran, std::vector{queueThread});
  this->services_.post("changed");
  EXPECT_EQ(ran, (std::vector{queueThread, queueThread}));
}

TYPED_TEST(NotificationCenter, RunsNoHandlerOfAnotherName) {
  const auto queue = this->services_.serialQueues().createSerialQueue("queue");
  int ran = 0;
  this->services_.notifications().registerForNotification("changed", queue, [&] { ++ran; });
  this->services_.post("Changed");
  this->services_.post("");
  EXPECT_EQ(ran, 0);
}

TYPED_TEST(NotificationCenter, RunsEveryHandlerOfTheName) {
  const auto one = this->services_.serialQueues().createSerialQueue("one");
  const auto two = this->services_.serialQueues().createSerialQueue("two");
  int first = 0;
  int second = 0;
  int third = 0;
  ZQNotificationCenter& center = this->services_.notifications();
  const int a = center.registerForNotification("changed", one, [&] { ++first; });
  const int b = center.registerForNotification("changed", two, [&] { ++second; });
  const int c = center.registerForNotification("changed", one, [&] { ++third; });
  EXPECT_TRUE(a != b && b != c && a != c);
  this->services_.post("changed");
  EXPECT_EQ(first, 1);
  EXPECT_EQ(second, 1);
  EXPECT_EQ(third, 1);
}

TYPED_TEST(NotificationCenter, KeepsTheQueueOfAHandler) {
  int ran = 0;
  this->services_.notifications().registerForNotification(
      "changed", this->services_.serialQueues().createSerialQueue("queue"), [&] { ++ran; });
  this->services_.post("changed");
  EXPECT_EQ(ran, 1);
}

}  // namespace
}  // namespace contract
