#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <latch>
#include <thread>
#include <vector>

#include "daemon/requests/RequestPool.h"

namespace requests {
namespace {

using std::chrono::milliseconds;

constexpr auto kLongTime = std::chrono::hours(1);

class APool : public testing::Test {};

TEST_F(APool, RunsWhatIsSubmitted) {
  RequestPool pool(2, 4, kLongTime);
  std::promise<int> result;
  ASSERT_TRUE(pool.submit([&] { result.set_value(7); }));
  EXPECT_EQ(result.get_future().get(), 7);
}

TEST_F(APool, RunsEverythingOnceFromManyThreads) {
  RequestPool pool(3, 3, kLongTime);
  std::atomic<int> ran = 0;
  std::vector<std::thread> submitters;
  for (int i = 0; i < 8; ++i)
    submitters.emplace_back([&] {
      for (int j = 0; j < 500; ++j) EXPECT_TRUE(pool.submit([&] { ++ran; }));
    });
  for (auto& submitter : submitters) submitter.join();
  pool.stop();
  EXPECT_EQ(ran, 4000);
}

TEST_F(APool, HasNoMoreRunningThreadsThanItMay) {
  RequestPool pool(2, 10, kLongTime);
  std::promise<void> letGo;
  const auto future = letGo.get_future().share();
  std::latch bothRun(2);
  for (int i = 0; i < 20; ++i)
    ASSERT_TRUE(pool.submit([&, future, i] {
      if (i < 2) bothRun.count_down();
      future.wait();
    }));
  bothRun.wait();
  EXPECT_EQ(pool.threadCount(), 2U);
  letGo.set_value();
}

TEST_F(APool, GrowsSoThatNothingWaitsBehindWhatWaits) {
  RequestPool pool(1, 101, kLongTime);
  std::promise<void> letGo;
  const auto future = letGo.get_future().share();
  std::latch allWait(100);
  for (int i = 0; i < 100; ++i)
    ASSERT_TRUE(pool.submit([&, future] {
      pool.beginWaiting();
      allWait.count_down();
      future.wait();
      pool.endWaiting();
    }));
  allWait.wait();
  std::promise<void> ran;
  ASSERT_TRUE(pool.submit([&] { ran.set_value(); }));
  ran.get_future().wait();
  EXPECT_LE(pool.threadCount(), 101U);
  letGo.set_value();
}

TEST_F(APool, RunsWhatWasQueuedBehindWorkThatBeginsToWait) {
  RequestPool pool(1, 2, kLongTime);
  std::promise<void> queued;
  std::promise<void> ran;
  ASSERT_TRUE(pool.submit([&] {
    queued.get_future().wait();
    pool.beginWaiting();
    ran.get_future().wait();
    pool.endWaiting();
  }));
  ASSERT_TRUE(pool.submit([&] { ran.set_value(); }));
  queued.set_value();
  pool.stop();
}

TEST_F(APool, LetsIdleThreadsGo) {
  RequestPool pool(4, 4, milliseconds(1));
  std::latch all(4);
  for (int i = 0; i < 4; ++i) ASSERT_TRUE(pool.submit([&] { all.arrive_and_wait(); }));
  all.wait();
  while (pool.threadCount() > 0) std::this_thread::yield();
  std::promise<void> ran;
  ASSERT_TRUE(pool.submit([&] { ran.set_value(); }));
  ran.get_future().wait();
}

TEST_F(APool, RunsWhatIsLeftBeforeItStops) {
  std::atomic<int> ran = 0;
  RequestPool pool(1, 1, kLongTime);
  for (int i = 0; i < 100; ++i) ASSERT_TRUE(pool.submit([&] { ++ran; }));
  pool.stop();
  EXPECT_EQ(ran, 100);
  EXPECT_EQ(pool.threadCount(), 0U);
}

TEST_F(APool, ThatHasStoppedTakesNoMore) {
  RequestPool pool(1, 1, kLongTime);
  pool.stop();
  bool hasRun = false;
  EXPECT_FALSE(pool.submit([&] { hasRun = true; }));
  EXPECT_FALSE(hasRun);
}

}  // namespace
}  // namespace requests
