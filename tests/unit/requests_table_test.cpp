#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <condition_variable>
#include <future>
#include <map>
#include <stdexcept>
#include <thread>
#include <vector>

#include "daemon/requests/RequestTable.h"
#include "daemon/requests/WaitingLimits.h"

namespace requests {
namespace {

using Kind = Outcome::Kind;

// The answers that callers got.
class Answers {
 public:
  RequestTable::Answer next() {
    return [this](const Outcome& outcome) {
      const std::lock_guard lock(mutex_);
      outcomes_.push_back(outcome);
      arrived_.notify_all();
    };
  }
  std::vector<Outcome> wait(std::size_t count) {
    std::unique_lock lock(mutex_);
    arrived_.wait_for(lock, std::chrono::minutes(2), [&] { return outcomes_.size() >= count; });
    return outcomes_;
  }

 private:
  std::mutex mutex_;
  std::condition_variable arrived_;
  std::vector<Outcome> outcomes_;
};

class TheTable : public testing::Test {
 protected:
  TheTable()
      : table_(pool_,
               {[this](const std::string& reason) { failure_ = reason; },
                [this](const auto& context) { endedVoid_ += context->isVoid() ? 1 : 0; }}) {}

  static RequestKey key(const std::string& client, RVDictionary options = {}) {
    return RequestKey::forOptions(client, clients::Evidence::kRegistered, "type", options);
  }
  void submit(const RequestKey& requestKey, const std::string& caller, RequestTable::Work work) {
    table_.submit(requestKey, {caller, answers_.next()}, nullptr, {}, std::move(work));
  }
  // Work that says that it has begun, and ends when its request becomes void or the test says so.
  RequestTable::Work waiting() {
    return [this](const RVDAccessCompletion& completion) {
      const auto context = RequestContext::current();
      std::promise<void> isVoid;
      const auto registration = context->onVoid([&] { isVoid.set_value(); });
      ++begun_;
      begun_.notify_all();
      isVoid.get_future().wait();
      completion(true, std::nullopt);
    };
  }
  void waitForBegun(int count) {
    for (int begun = begun_; begun < count; begun = begun_) begun_.wait(begun);
  }

  std::string failure_;
  std::atomic<int> endedVoid_ = 0;
  std::atomic<int> begun_ = 0;
  Answers answers_;
  RequestPool pool_{16, 16, std::chrono::seconds(1)};
  RequestTable table_;
};

TEST_F(TheTable, AnswersWithThePlugInsDecision) {
  const RVError error{"domain", 7, {}};
  submit(key("a"), ":1", [&](const RVDAccessCompletion& completion) { completion(false, error); });
  const auto outcome = answers_.wait(1).at(0);
  EXPECT_EQ(outcome.kind, Kind::kDecided);
  EXPECT_FALSE(outcome.granted);
  EXPECT_EQ(outcome.error, error);
}

TEST_F(TheTable, AnswersFromWhereverTheCompletionIsCalled) {
  std::thread server;
  submit(key("a"), ":1", [&](const RVDAccessCompletion& completion) {
    server = std::thread([completion] { completion(true, std::nullopt); });
  });
  EXPECT_TRUE(answers_.wait(1).at(0).granted);
  pool_.stop();
  server.join();
}

TEST_F(TheTable, RunsTheCallForItsRequest) {
  std::promise<std::string> client;
  submit(key("a"), ":1", [&](const RVDAccessCompletion& completion) {
    client.set_value(RequestContext::current()->clientKey());
    completion(true, std::nullopt);
  });
  EXPECT_EQ(client.get_future().get(), "a");
  answers_.wait(1);
}

TEST_F(TheTable, CallsAThrowingPlugInAFailure) {
  submit(key("a"), ":1", [](const RVDAccessCompletion&) { throw std::runtime_error("broken"); });
  EXPECT_EQ(answers_.wait(1).at(0).kind, Kind::kFailed);
  EXPECT_EQ(failure_, "broken");
}

TEST_F(TheTable, CallsItAFailureAlsoWhereThePlugInHadAnsweredBeforeItThrew) {
  submit(key("a"), ":1", [](const RVDAccessCompletion& completion) {
    completion(false, std::nullopt);
    throw std::runtime_error("broken");
  });
  EXPECT_EQ(answers_.wait(1).at(0).kind, Kind::kFailed);
}

TEST_F(TheTable, CallsADroppedCompletionAFailure) {
  submit(key("a"), ":1", [](const RVDAccessCompletion&) {});
  EXPECT_EQ(answers_.wait(1).at(0).kind, Kind::kFailed);
}

TEST_F(TheTable, AnswersOnceAlsoWhereThePlugInAnswersTwice) {
  submit(key("a"), ":1", [](const RVDAccessCompletion& completion) {
    completion(true, std::nullopt);
    completion(false, std::nullopt);
  });
  pool_.stop();
  const auto outcomes = answers_.wait(1);
  ASSERT_EQ(outcomes.size(), 1U);
  EXPECT_TRUE(outcomes[0].granted);
}

TEST_F(TheTable, AnswersWhatThePoolCannotTake) {
  pool_.stop();
  submit(key("a"), ":1", [](const RVDAccessCompletion& completion) { completion(true, std::nullopt); });
  EXPECT_EQ(answers_.wait(1).at(0).kind, Kind::kFailed);
}

TEST_F(TheTable, MakesEqualRequestsOfOneClientOne) {
  const RVDictionary options{{"app_id", "1"}, {"permissions", RVArray{"a", "b"}}};
  const RVDictionary sameOptions{{"app_id", "1"}, {"permissions", RVArray{"b", "a", "a"}}};
  submit(key("a", options), ":1", waiting());
  waitForBegun(1);
  submit(key("a", sameOptions), ":1", waiting());
  submit(key("a", sameOptions), ":2", waiting());
  const auto barrier = table_.makeVoid(VoidReason::kClientRevoked, [](const auto&) { return true; });
  EXPECT_EQ(answers_.wait(3).size(), 3U);
  EXPECT_EQ(begun_, 1);
}

// Work that is made void as outdated at its first run, as an alert does it that need not be shown any more;
// at its second run it is granted. Says that it has begun each time, and does not end before `go` is ready.
RequestTable::Work outdatedOnce(std::atomic<int>& runs, std::shared_future<void> go = {}) {
  return [&runs, go](const RVDAccessCompletion& completion) {
    const bool isFirst = runs++ == 0;
    runs.notify_all();
    if (isFirst) {
      RequestContext::current()->beginVoid(VoidReason::kOutdated);
      if (go.valid()) go.wait();
    }
    completion(!isFirst, std::nullopt);
  };
}

TEST_F(TheTable, BeginsAnOutdatedRequestAnewForTheSameCallers) {
  std::atomic<int> runs = 0;
  submit(key("a"), ":1", outdatedOnce(runs));
  const auto outcome = answers_.wait(1).at(0);
  EXPECT_EQ(outcome.kind, Kind::kDecided);
  EXPECT_TRUE(outcome.granted);
  EXPECT_EQ(runs, 2);
  EXPECT_EQ(endedVoid_, 1);
}

TEST_F(TheTable, DoesNotBeginAnOutdatedRequestAnewForNobody) {
  std::atomic<int> runs = 0;
  std::promise<void> go;
  submit(key("a"), ":1", outdatedOnce(runs, go.get_future().share()));
  runs.wait(0);
  table_.callerLeft(":1");
  go.set_value();
  pool_.stop();
  EXPECT_EQ(runs, 1);
}

TEST_F(TheTable, DoesNotBeginAnOutdatedRequestAnewThatABarrierIsSetAgainst) {
  std::atomic<int> runs = 0;
  std::promise<void> go;
  submit(key("a"), ":1", outdatedOnce(runs, go.get_future().share()));
  runs.wait(0);
  {
    const auto barrier = table_.makeVoid(VoidReason::kClientRevoked, [](const auto&) { return true; });
  }
  go.set_value();
  EXPECT_EQ(answers_.wait(1).at(0).kind, Kind::kVoid);
  EXPECT_EQ(runs, 1);
}

TEST_F(TheTable, OutdatesTheOtherRequestsOfAClientWhenADecisionIsStored) {
  std::map<std::string, std::shared_ptr<RequestContext>> contexts;
  const auto wait = waiting();
  const auto submitWaiting = [&](const std::string& name, const RequestKey& requestKey) {
    const int begun = begun_;
    submit(requestKey, ":1", [&, name, wait](const RVDAccessCompletion& completion) {
      contexts[name] = RequestContext::current();
      wait(completion);
    });
    waitForBegun(begun + 1);
  };
  submitWaiting("same client", key("a", {{"app_id", "1"}}));
  submitWaiting("other client", key("b"));
  submitWaiting("other type", RequestKey::forOptions("a", clients::Evidence::kRegistered, "other type", {}));

  submit(key("a", {{"app_id", "2"}}), ":1", [](const RVDAccessCompletion& completion) {
    completion(true, std::nullopt);
  });
  answers_.wait(1);
  EXPECT_FALSE(contexts["same client"]->isOutdated()) << "nothing was stored";

  submit(key("a", {{"app_id", "3"}}), ":1", [](const RVDAccessCompletion& completion) {
    RequestContext::current()->decisionStored();
    completion(true, std::nullopt);
  });
  answers_.wait(2);
  EXPECT_TRUE(contexts["same client"]->isOutdated());
  EXPECT_FALSE(contexts["other client"]->isOutdated());
  EXPECT_FALSE(contexts["other type"]->isOutdated());
  const auto barrier = table_.makeVoid(VoidReason::kStopping, [](const auto&) { return true; });
  answers_.wait(5);
}

TEST_F(TheTable, KeepsRequestsThatDifferApart) {
  const std::vector<RequestKey> keys{
      key("a"),
      key("b"),
      key("a", {{"app_id", "1"}}),
      key("a", {{"app_id", 1}}),
      key("a", {{"permissions", RVArray{}}}),
      key("a", {{"permissions", RVArray{"a"}}}),
      key("a", {{"audience", "friends"}}),
      RequestKey::forOptions("a", clients::Evidence::kRegistered, "other type", {}),
      RequestKey::forOptions("a", clients::Evidence::kSandbox, "type", {}),
  };
  for (const auto& requestKey : keys) submit(requestKey, ":1", waiting());
  waitForBegun(static_cast<int>(keys.size()));
  const auto barrier = table_.makeVoid(VoidReason::kStopping, [](const auto&) { return true; });
  answers_.wait(keys.size());
}

TEST_F(TheTable, BeginsAnewOnceARequestIsAnswered) {
  int calls = 0;
  for (int i = 1; i <= 2; ++i) {
    submit(key("a"), ":1", [&](const RVDAccessCompletion& completion) {
      ++calls;
      completion(true, std::nullopt);
    });
    answers_.wait(static_cast<std::size_t>(i));
  }
  EXPECT_EQ(calls, 2);
}

TEST_F(TheTable, MakesARequestVoidWhenItsLastCallerLeaves) {
  submit(key("a"), ":1", waiting());
  submit(key("a"), ":2", waiting());
  waitForBegun(1);
  table_.callerLeft(":1");
  table_.callerLeft(":2");
  pool_.stop();  // returns only when the work has ended, and that only because it is void
  EXPECT_EQ(endedVoid_, 1);
  EXPECT_TRUE(answers_.wait(0).empty());
}

TEST_F(TheTable, GoesOnForTheCallersThatStay) {
  submit(key("a"), ":1", waiting());
  submit(key("a"), ":2", waiting());
  waitForBegun(1);
  table_.callerLeft(":1");
  EXPECT_EQ(endedVoid_, 0);
  const auto barrier = table_.makeVoid(VoidReason::kAccountRemoved, [](const auto&) { return true; });
  EXPECT_EQ(answers_.wait(1).at(0).kind, Kind::kVoid);
  pool_.stop();
  EXPECT_EQ(answers_.wait(1).size(), 1U);
}

TEST_F(TheTable, LetsNobodyJoinARequestWhoseCallersHaveLeft) {
  submit(key("a"), ":1", waiting());
  waitForBegun(1);
  table_.callerLeft(":1");
  submit(key("a"), ":2", [](const RVDAccessCompletion& completion) { completion(true, std::nullopt); });
  EXPECT_EQ(answers_.wait(1).at(0).kind, Kind::kDecided);
}

TEST_F(TheTable, AnswersAVoidRequestAsNotGrantedAndWithoutAnError) {
  submit(key("a"), ":1", waiting());
  waitForBegun(1);
  const auto barrier = table_.makeVoid(VoidReason::kClientRevoked, [](const auto&) { return true; });
  const auto outcome = answers_.wait(1).at(0);
  EXPECT_EQ(outcome.kind, Kind::kVoid);
  EXPECT_FALSE(outcome.granted);
  EXPECT_FALSE(outcome.error);
  EXPECT_EQ(endedVoid_, 1);
}

TEST_F(TheTable, KeepsSelectedRequestsOutAsLongAsTheBarrierStands) {
  const auto decide = [](const RVDAccessCompletion& completion) { completion(true, std::nullopt); };
  {
    const auto barrier = table_.makeVoid(VoidReason::kClientRevoked,
                                         [](const RequestKey& other) { return other.clientKey == "a"; });
    submit(key("a"), ":1", decide);
    EXPECT_EQ(answers_.wait(1).at(0).kind, Kind::kVoid);
    submit(key("b"), ":1", decide);
    EXPECT_EQ(answers_.wait(2).at(1).kind, Kind::kDecided);
  }
  submit(key("a"), ":1", decide);
  EXPECT_EQ(answers_.wait(3).at(2).kind, Kind::kDecided);
}

TEST_F(TheTable, NamesTheLimitThatARequestRanInto) {
  const auto limits = std::make_shared<WaitingLimits>(pool_, 0, 0);
  table_.submit(key("a"), {":1", answers_.next()}, limits, {}, [](const RVDAccessCompletion& completion) {
    EXPECT_EQ(RequestContext::current()->beginWaiting(), nullptr);
    completion(false, std::nullopt);
  });
  EXPECT_EQ(answers_.wait(1).at(0).kind, Kind::kLimitReached);
}

TEST_F(TheTable, NeverMakesWhatIsSubmittedAloneOne) {
  for (int i = 0; i < 2; ++i) table_.submitAlone(key("a"), {"", answers_.next()}, nullptr, waiting());
  submit(key("a"), ":1", waiting());
  waitForBegun(3);
  const auto barrier = table_.makeVoid(VoidReason::kStopping, [](const auto&) { return true; });
  answers_.wait(3);
}

TEST_F(TheTable, AnswersEveryCallerOnceWhateverHappensAtTheSameTime) {
  constexpr int kThreads = 4;
  constexpr int kRequests = 300;
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i)
    threads.emplace_back([&, i] {
      for (int j = 0; j < kRequests; ++j)
        submit(key(std::to_string(j % 3)),
               ":" + std::to_string(i),
               [](const RVDAccessCompletion& completion) { completion(true, std::nullopt); });
    });
  threads.emplace_back([&] {
    for (int j = 0; j < 100; ++j) {
      const auto barrier = table_.makeVoid(VoidReason::kClientRevoked,
                                           [&](const RequestKey& other) { return other.clientKey == "1"; });
    }
  });
  threads.emplace_back([&] {
    for (int j = 0; j < 100; ++j) table_.callerLeft(":nobody");
  });
  for (auto& thread : threads) thread.join();
  pool_.stop();
  EXPECT_EQ(answers_.wait(kThreads * kRequests).size(), std::size_t{kThreads * kRequests});
}

}  // namespace
}  // namespace requests
