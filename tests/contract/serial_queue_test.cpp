#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <stdexcept>
#include <thread>

#include "tests/contract/Suites.h"

namespace contract {
namespace {

template <typename Services>
class SerialQueue : public ::testing::Test {
 protected:
  std::shared_ptr<ZQSerialQueue> create(std::string_view label = "queue") {
    return services_.serialQueues().createSerialQueue(label);
  }

  Services services_;
};

TYPED_TEST_SUITE(SerialQueue, Implementations, Names);

TYPED_TEST(SerialQueue, HasItsLabel) {
  EXPECT_EQ(this->create("com.zentor.tessel.facebook.preferencesQueue")->label(),
            "com.zentor.tessel.facebook.preferencesQueue");
}

TYPED_TEST(SerialQueue, RunsWorkInTheOrderInWhichItCame) {
  const auto queue = this->create();
  std::vector<int> order;
  for (int i = 0; i < 100; ++i) queue->dispatchAsync([&order, i] { order.push_back(i); });
  queue->dispatchSync([&] { order.push_back(100); });
  ASSERT_EQ(order.size(), 101U);
  for (int i = 0; i <= 100; ++i) EXPECT_EQ(order[static_cast<std::size_t>(i)], i);
}

TYPED_TEST(SerialQueue, RunsWorkOfManyThreadsOneAfterTheOther) {
  const auto queue = this->create();
  int counter = 0;  // unguarded on purpose
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 250; ++i) {
        if (i % 2 == 0) {
          queue->dispatchSync([&] { ++counter; });
        } else {
          queue->dispatchAsync([&] { ++counter; });
        }
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  queue->dispatchSync([&] { EXPECT_EQ(counter, 1000); });
}

TYPED_TEST(SerialQueue, ThrowsTheExceptionOfWorkToWhoeverWaitsForIt) {
  const auto queue = this->create();
  EXPECT_THROW(queue->dispatchSync([] { throw std::out_of_range("of the work"); }), std::out_of_range);
  bool ran = false;
  queue->dispatchSync([&] { ran = true; });
  EXPECT_TRUE(ran);
}

TYPED_TEST(SerialQueue, RunsTheWorkThatIsLeftWhenTheLastReferenceGoes) {
  auto queue = this->create();
  std::promise<void> gate;
  std::promise<void> last;
  auto done = last.get_future();
  queue->dispatchAsync([opened = gate.get_future().share()] { opened.wait(); });
  for (int i = 0; i < 10; ++i) queue->dispatchAsync([] {});
  queue->dispatchAsync([&] { last.set_value(); });
  // The work cannot be done before the reference goes.
  std::thread dropping([dropped = std::move(queue)]() mutable { dropped.reset(); });
  gate.set_value();
  EXPECT_EQ(done.wait_for(std::chrono::seconds(60)), std::future_status::ready);
  dropping.join();
}

TYPED_TEST(SerialQueue, MayBeDroppedByItsOwnWork) {
  auto queue = this->create();
  std::promise<void> handedOver;
  std::promise<void> last;
  auto done = last.get_future();
  ZQSerialQueue& alias = *queue;
  alias.dispatchAsync([&, ready = handedOver.get_future().share()] {
    ready.wait();
    queue->dispatchAsync([&] { last.set_value(); });
    queue.reset();
  });
  handedOver.set_value();
  EXPECT_EQ(done.wait_for(std::chrono::seconds(60)), std::future_status::ready);
}

TYPED_TEST(SerialQueue, DoesNotWaitForAnother) {
  const auto blocked = this->create("blocked");
  const auto free = this->create("free");
  std::promise<void> gate;
  blocked->dispatchAsync([opened = gate.get_future().share()] { opened.wait(); });
  bool ran = false;
  free->dispatchSync([&] { ran = true; });
  EXPECT_TRUE(ran);
  gate.set_value();
}

}  // namespace
}  // namespace contract
