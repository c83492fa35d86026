#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <latch>
#include <thread>
#include <vector>

#include "daemon/requests/RequestContext.h"

namespace requests {
namespace {

struct CountingLimiter : WaitingLimiter {
  bool beginWaiting(const std::string&) override {
    if (!mayWait) return false;
    ++waiting;
    return true;
  }
  void endWaiting(const std::string&) override { --waiting; }
  std::atomic<int> waiting = 0;
  bool mayWait = true;
};

class ARequest : public testing::Test {
 protected:
  const std::shared_ptr<CountingLimiter> limiter_ = std::make_shared<CountingLimiter>();
  const std::shared_ptr<RequestContext> context_ = std::make_shared<RequestContext>("client", limiter_);
};

TEST_F(ARequest, IsNotVoidAtFirst) {
  EXPECT_FALSE(context_->isVoid());
  EXPECT_TRUE(context_->unlessVoid([] {}));
}

TEST_F(ARequest, KeepsTheFirstReasonForWhichItBecameVoid) {
  context_->makeVoid(VoidReason::kClientRevoked);
  context_->makeVoid(VoidReason::kStopping);
  EXPECT_EQ(context_->voidReason(), VoidReason::kClientRevoked);
}

TEST_F(ARequest, ThatIsVoidWritesNothing) {
  context_->makeVoid(VoidReason::kStopping);
  bool hasWritten = false;
  EXPECT_FALSE(context_->unlessVoid([&] { hasWritten = true; }));
  EXPECT_FALSE(hasWritten);
}

TEST_F(ARequest, BecomesVoidOnlyBeforeOrAfterAnEffectThatIsBeingWritten) {
  for (int round = 0; round < 200; ++round) {
    RequestContext context("client", nullptr);
    std::atomic<bool> isWriting = false;
    std::latch both(2);
    std::thread writer([&] {
      both.arrive_and_wait();
      context.unlessVoid([&] {
        isWriting = true;
        std::this_thread::yield();
        isWriting = false;
      });
    });
    both.arrive_and_wait();
    context.makeVoid(VoidReason::kCallerGone);
    EXPECT_FALSE(isWriting);
    writer.join();
  }
}

TEST_F(ARequest, CanBeginToBeVoidWithoutWaitingForAnEffectThatIsBeingWritten) {
  std::latch isWriting(1);
  std::latch mayEnd(1);
  bool hasWritten = false;
  std::thread writer([&] {
    context_->unlessVoid([&] {
      isWriting.count_down();
      mayEnd.wait();
      hasWritten = true;
    });
    EXPECT_FALSE(context_->unlessVoid([] {}));
  });
  isWriting.wait();
  context_->beginVoid(VoidReason::kCallerGone);
  EXPECT_TRUE(context_->isVoid());
  mayEnd.count_down();
  writer.join();
  EXPECT_TRUE(hasWritten);
}

TEST_F(ARequest, TellsThoseWhoAskedWhenItBecomesVoid) {
  int told = 0;
  const auto registration = context_->onVoid([&] { ++told; });
  EXPECT_EQ(told, 0);
  context_->makeVoid(VoidReason::kCallerGone);
  context_->makeVoid(VoidReason::kCallerGone);
  EXPECT_EQ(told, 1);
}

TEST_F(ARequest, TellsAtOnceWhenItIsVoidAlready) {
  context_->makeVoid(VoidReason::kCallerGone);
  int told = 0;
  const auto registration = context_->onVoid([&] { ++told; });
  EXPECT_EQ(told, 1);
}

TEST_F(ARequest, TellsNobodyWhoDoesNotWantToKnowAnyMore) {
  int told = 0;
  {
    const auto registration = context_->onVoid([&] { ++told; });
  }
  context_->makeVoid(VoidReason::kCallerGone);
  EXPECT_EQ(told, 0);
}

TEST_F(ARequest, TellsEachOnceHoweverItsEndAndTheRegistrationMeet) {
  for (int round = 0; round < 500; ++round) {
    RequestContext context("client", nullptr);
    std::atomic<int> told = 0;
    std::latch both(2);
    std::thread ender([&] {
      both.arrive_and_wait();
      context.makeVoid(VoidReason::kCallerGone);
    });
    both.arrive_and_wait();
    {
      const auto registration = context.onVoid([&] { ++told; });
      ender.join();
    }
    EXPECT_EQ(told, 1);
  }
}

TEST_F(ARequest, IsNotToldOfAfterTheRegistrationIsGone) {
  for (int round = 0; round < 500; ++round) {
    RequestContext context("client", nullptr);
    auto living = std::make_unique<int>(0);
    std::latch both(2);
    std::thread ender([&] {
      both.arrive_and_wait();
      context.makeVoid(VoidReason::kCallerGone);
    });
    {
      const auto registration = context.onVoid([&] { ++*living; });
      both.arrive_and_wait();
    }
    living.reset();
    ender.join();
  }
}

TEST_F(ARequest, ThatWaitsTwiceAtATimeCountsOnce) {
  const auto first = context_->beginWaiting();
  {
    const auto second = context_->beginWaiting();
    EXPECT_NE(second, nullptr);
    EXPECT_EQ(limiter_->waiting, 1);
  }
  EXPECT_EQ(limiter_->waiting, 1);
}

TEST_F(ARequest, IsCountedUntilItHasStoppedWaiting) {
  context_->beginWaiting().reset();
  EXPECT_EQ(limiter_->waiting, 0);
}

TEST_F(ARequest, ThatMayNotWaitBecomesVoidForThatReason) {
  limiter_->mayWait = false;
  EXPECT_EQ(context_->beginWaiting(), nullptr);
  EXPECT_EQ(context_->voidReason(), VoidReason::kLimitReached);
}

TEST_F(ARequest, ThatIsVoidDoesNotWait) {
  context_->makeVoid(VoidReason::kStopping);
  EXPECT_EQ(context_->beginWaiting(), nullptr);
  EXPECT_EQ(limiter_->waiting, 0);
}

TEST_F(ARequest, IsTheCurrentOneOfItsThreadAlone) {
  const RequestContext::Scope scope(context_);
  EXPECT_EQ(RequestContext::current(), context_);
  std::thread([] { EXPECT_EQ(RequestContext::current(), nullptr); }).join();
  {
    const RequestContext::Scope inner(nullptr);
    EXPECT_EQ(RequestContext::current(), nullptr);
  }
  EXPECT_EQ(RequestContext::current(), context_);
}

TEST(Shares, AreOnePerClientAndCertaintyAndOneForAllThatNothingIsKnownAbout) {
  const auto share = [](const std::string& client, clients::Evidence evidence) {
    return RequestContext(client, nullptr, {}, evidence).shareKey();
  };
  using clients::Evidence;
  EXPECT_EQ(share(":1.1", Evidence::kUnknown), share(":1.2", Evidence::kUnknown));
  EXPECT_EQ(share("a", Evidence::kScope), share("a", Evidence::kScope));
  EXPECT_NE(share("a", Evidence::kScope), share("b", Evidence::kScope));
  EXPECT_NE(share("a", Evidence::kScope), share("a", Evidence::kRegistered));
  EXPECT_NE(share("a", Evidence::kRegistered), share(":1.1", Evidence::kUnknown));
}

}  // namespace
}  // namespace requests
