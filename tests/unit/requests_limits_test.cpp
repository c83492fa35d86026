#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

#include "daemon/requests/WaitingLimits.h"

namespace requests {
namespace {

class TheLimits : public testing::Test {
 protected:
  RequestPool pool_{1, 1, std::chrono::milliseconds(1)};
  WaitingLimits limits_{pool_, 2, 3};
};

TEST_F(TheLimits, LetAClientWaitAsOftenAsItMay) {
  EXPECT_TRUE(limits_.beginWaiting("a"));
  EXPECT_TRUE(limits_.beginWaiting("a"));
  EXPECT_FALSE(limits_.beginWaiting("a"));
}

TEST_F(TheLimits, OfOneClientAreNotThoseOfAnother) {
  EXPECT_TRUE(limits_.beginWaiting("a"));
  EXPECT_TRUE(limits_.beginWaiting("a"));
  EXPECT_TRUE(limits_.beginWaiting("b"));
}

TEST_F(TheLimits, HoldForAllClientsTogether) {
  EXPECT_TRUE(limits_.beginWaiting("a"));
  EXPECT_TRUE(limits_.beginWaiting("b"));
  EXPECT_TRUE(limits_.beginWaiting("c"));
  EXPECT_FALSE(limits_.beginWaiting("d"));
}

TEST_F(TheLimits, MakeRoomWhenAWaitEnds) {
  EXPECT_TRUE(limits_.beginWaiting("a"));
  EXPECT_TRUE(limits_.beginWaiting("a"));
  limits_.endWaiting("a");
  EXPECT_TRUE(limits_.beginWaiting("a"));
  EXPECT_FALSE(limits_.beginWaiting("a"));
}

TEST_F(TheLimits, AreNeverExceededByManyThreads) {
  std::atomic<int> waiting = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < 8; ++i)
    threads.emplace_back([&, client = std::to_string(i)] {
      for (int j = 0; j < 2000; ++j) {
        if (!limits_.beginWaiting(client)) continue;
        EXPECT_LE(++waiting, 3);
        --waiting;
        limits_.endWaiting(client);
      }
    });
  for (auto& thread : threads) thread.join();
  EXPECT_TRUE(limits_.beginWaiting("a"));
}

}  // namespace
}  // namespace requests
