#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <condition_variable>
#include <deque>
#include <future>
#include <set>
#include <thread>
#include <vector>

#include "daemon/alerts/AlertService.h"
#include "daemon/requests/RequestContext.h"

namespace alerts {
namespace {

using std::chrono::milliseconds;

// Agents that do what the test tells them.
class FakeAgents : public AgentCaller {
 public:
  struct Shown {
    AgentAddress agent;
    std::string alertID;
    RVDictionary description;
    Answered answered;
  };

  void showAlert(const AgentAddress& agent,
                 const std::string& alertID,
                 const RVDictionary& description,
                 Answered answered) override {
    const std::lock_guard lock(mutex_);
    ++open_;
    mostOpen_ = std::max(mostOpen_, open_);
    shown_.push_back({agent, alertID, description, std::move(answered)});
    changed_.notify_all();
  }
  void dismissAlert(const AgentAddress&, const std::string& alertID) override {
    const std::lock_guard lock(mutex_);
    --open_;
    dismissed_.insert(alertID);
    changed_.notify_all();
  }

  // The next alert that is shown.
  Shown next() {
    std::unique_lock lock(mutex_);
    EXPECT_TRUE(changed_.wait_for(lock, std::chrono::minutes(2), [this] { return !shown_.empty(); }));
    Shown shown = shown_.front();
    shown_.pop_front();
    return shown;
  }
  void answer(const Shown& shown, std::optional<std::uint64_t> responseFlags) {
    {
      const std::lock_guard lock(mutex_);
      --open_;
    }
    shown.answered(responseFlags);
  }
  void waitForDismissed(const std::string& alertID) {
    std::unique_lock lock(mutex_);
    EXPECT_TRUE(
        changed_.wait_for(lock, std::chrono::minutes(2), [&] { return dismissed_.contains(alertID); }));
  }
  bool isShowing() {
    const std::lock_guard lock(mutex_);
    return !shown_.empty();
  }
  int mostOpen() {
    const std::lock_guard lock(mutex_);
    return mostOpen_;
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<Shown> shown_;
  std::set<std::string> dismissed_;
  int open_ = 0;
  int mostOpen_ = 0;
};

const AgentAddress kTerminal{":1.1", "/terminal"};
const AgentAddress kDesktop{":1.2", "/desktop"};
const AgentAddress kNewerDesktop{":1.3", "/desktop"};

class AnAlert : public testing::Test {
 protected:
  std::future<ZQResponseFlags> ask(std::shared_ptr<requests::RequestContext> context = nullptr,
                                   const std::string& header = "header",
                                   bool endsRequest = true) {
    return std::async(std::launch::async, [this, context, header, endsRequest]() -> ZQResponseFlags {
      const requests::RequestContext::Scope scope(context);
      const auto alert =
          service_.ZQUserNotificationCreate(kZQAllocatorDefault, 0, 0, nullptr, {{"header", header}});
      if (alert == nullptr) return 99;
      ZQResponseFlags flags = 98;
      EXPECT_EQ(service_.ZQUserNotificationReceiveResponse(alert, 0, &flags), 0);
      service_.ZQRelease(alert);
      if (context != nullptr && endsRequest) service_.requestEnded(context);
      return flags;
    });
  }
  static std::shared_ptr<requests::RequestContext> request(
      const std::string& client = "client",
      clients::Evidence evidence = clients::Evidence::kRegistered) {
    return std::make_shared<requests::RequestContext>(
        client, nullptr, RVDictionary{{"client_id", "org.example.App"}}, evidence);
  }

  FakeAgents agents_;
  std::atomic<int> names_ = 0;
  std::atomic<int> failuresPaused_ = 0;
  AlertService service_{agents_,
                        [this] { return "alert " + std::to_string(++names_); },
                        [this](int failures) {
                          failuresPaused_ = failures;
                          return milliseconds(1);
                        }};
};

TEST_F(AnAlert, EndsWithTheAgentsAnswer) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  for (const ZQResponseFlags flags : {0UL, 1UL, 2UL}) {
    auto answer = ask();
    agents_.answer(agents_.next(), flags);
    EXPECT_EQ(answer.get(), flags);
  }
}

TEST_F(AnAlert, ShowsThePlugInsWordsAndWhoTheClientIs) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  auto answer = ask(request());
  const auto shown = agents_.next();
  EXPECT_EQ(shown.description, (RVDictionary{{"client_id", "org.example.App"}, {"header", "header"}}));
  agents_.answer(shown, 1);
  answer.get();
}

TEST_F(AnAlert, WaitsForAnAgent) {
  auto answer = ask();
  EXPECT_FALSE(agents_.isShowing());
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  agents_.answer(agents_.next(), 0);
  EXPECT_EQ(answer.get(), 0U);
}

TEST_F(AnAlert, GoesToTheNewestDesktopAgent) {
  service_.registerAgent(kDesktop, AgentKind::kDesktop);
  service_.registerAgent(kNewerDesktop, AgentKind::kDesktop);
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  auto answer = ask();
  const auto shown = agents_.next();
  EXPECT_EQ(shown.agent, kNewerDesktop);
  agents_.answer(shown, 1);
  answer.get();
}

TEST_F(AnAlert, GoesToTheNewestTerminalWhereThereIsNoDesktop) {
  service_.registerAgent({":1.8", "/"}, AgentKind::kTerminal);
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  auto answer = ask();
  const auto shown = agents_.next();
  EXPECT_EQ(shown.agent, kTerminal);
  agents_.answer(shown, 1);
  answer.get();
}

TEST_F(AnAlert, StaysWhereItIsWhenABetterAgentComes) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  auto answer = ask();
  const auto shown = agents_.next();
  service_.registerAgent(kDesktop, AgentKind::kDesktop);
  agents_.answer(shown, 0);
  EXPECT_EQ(answer.get(), 0U);
  EXPECT_FALSE(agents_.isShowing());
}

TEST_F(AnAlert, IsShownByTheNextAgentWhenItsOwnLeaves) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  service_.registerAgent(kDesktop, AgentKind::kDesktop);
  auto answer = ask();
  const auto first = agents_.next();
  EXPECT_EQ(first.agent, kDesktop);
  service_.agentsLeft(kDesktop.name);
  const auto second = agents_.next();
  EXPECT_EQ(second.agent, kTerminal);
  EXPECT_NE(second.alertID, first.alertID);
  first.answered(0);  // too late
  agents_.answer(second, 1);
  EXPECT_EQ(answer.get(), 1U);
}

TEST_F(AnAlert, IsShownAgainByAnotherAgentWhenItsOwnUnregisters) {
  service_.registerAgent(kDesktop, AgentKind::kDesktop);
  auto answer = ask();
  const auto first = agents_.next();
  EXPECT_TRUE(service_.unregisterAgent(kDesktop));
  EXPECT_FALSE(service_.unregisterAgent(kDesktop));
  agents_.waitForDismissed(first.alertID);
  service_.registerAgent(kNewerDesktop, AgentKind::kDesktop);
  agents_.answer(agents_.next(), 0);
  EXPECT_EQ(answer.get(), 0U);
}

TEST_F(AnAlert, IsNotAnsweredByAnErrorOrByNonsense) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  auto answer = ask();
  const std::vector<std::optional<std::uint64_t>> nonsense{
      std::nullopt, 3, 4, 0x100, 1ULL << 32, 0xFFFFFFFFFFFFFFFF};
  for (const auto& flags : nonsense) agents_.answer(agents_.next(), flags);
  const auto shown = agents_.next();
  EXPECT_EQ(failuresPaused_, 6);
  agents_.answer(shown, 0);
  EXPECT_EQ(answer.get(), 0U);
}

TEST_F(AnAlert, GoesToTheNextAgentWhenTheBestOneFails) {
  AlertService service(
      agents_, [] { return "id"; }, [](int) { return std::chrono::hours(1); });
  service.registerAgent(kTerminal, AgentKind::kTerminal);
  service.registerAgent(kDesktop, AgentKind::kDesktop);
  auto answer = std::async(std::launch::async, [&] {
    const auto alert = service.ZQUserNotificationCreate(kZQAllocatorDefault, 0, 0, nullptr, {});
    ZQResponseFlags flags = 98;
    service.ZQUserNotificationReceiveResponse(alert, 0, &flags);
    service.ZQRelease(alert);
    return flags;
  });
  agents_.answer(agents_.next(), std::nullopt);
  // Registering again does not end the pause.
  service.registerAgent(kDesktop, AgentKind::kDesktop);
  const auto shown = agents_.next();
  EXPECT_EQ(shown.agent, kTerminal);
  agents_.answer(shown, 1);
  EXPECT_EQ(answer.get(), 1U);
}

TEST_F(AnAlert, IsTakenDownWhenItsRequestBecomesVoid) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  const auto context = request();
  auto answer = ask(context);
  const auto shown = agents_.next();
  context->makeVoid(requests::VoidReason::kCallerGone);
  EXPECT_EQ(answer.get(), 2U);
  agents_.waitForDismissed(shown.alertID);
  shown.answered(0);  // the user was too late
}

TEST_F(AnAlert, EndsWhileItWaitsForAnAgentWhenItsRequestBecomesVoid) {
  const auto context = request();
  auto answer = ask(context);
  context->makeVoid(requests::VoidReason::kStopping);
  EXPECT_NE(answer.get(), 0U);
}

TEST_F(AnAlert, IsNotCreatedForAVoidRequest) {
  const auto context = request();
  context->makeVoid(requests::VoidReason::kStopping);
  EXPECT_EQ(ask(context).get(), 99U);
}

TEST_F(AnAlert, ThatIsNoneEndsAtOnceAndLeavesTheFlagsAlone) {
  ZQResponseFlags flags = 98;
  EXPECT_NE(service_.ZQUserNotificationReceiveResponse(nullptr, 0, &flags), 0);
  EXPECT_EQ(flags, 98U);
}

TEST_F(AnAlert, WithATimeoutEndsByItself) {
  const auto alert = service_.ZQUserNotificationCreate(kZQAllocatorDefault, 0.001, 0, nullptr, {});
  ZQResponseFlags flags = 98;
  EXPECT_EQ(service_.ZQUserNotificationReceiveResponse(alert, 0, &flags), 0);
  EXPECT_EQ(flags, 2U);
  service_.ZQRelease(alert);
}

TEST_F(AnAlert, IsNotEndedByTheTimeoutOfItsReceiver) {
  const auto alert = service_.ZQUserNotificationCreate(kZQAllocatorDefault, 0, 0, nullptr, {});
  ZQResponseFlags flags = 98;
  EXPECT_NE(service_.ZQUserNotificationReceiveResponse(alert, 0.001, &flags), 0);
  EXPECT_EQ(flags, 98U);
  service_.ZQRelease(alert);
}

TEST_F(AnAlert, IsShownWhenThoseBeforeItHaveEnded) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  std::vector<std::future<ZQResponseFlags>> answers;
  answers.push_back(ask(nullptr, "0"));
  auto shown = agents_.next();
  for (int i = 1; i < 5; ++i) answers.push_back(ask(nullptr, std::to_string(i)));
  for (int i = 0; i < 5; ++i) {
    EXPECT_FALSE(agents_.isShowing());
    agents_.answer(shown, 1);
    if (i < 4) shown = agents_.next();
  }
  for (auto& answer : answers) EXPECT_EQ(answer.get(), 1U);
  EXPECT_EQ(agents_.mostOpen(), 1);
}

TEST_F(AnAlert, GetsItsOwnAnswerAmongManyThatComeAndGo) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  constexpr int kAlerts = 200;
  std::vector<std::shared_ptr<requests::RequestContext>> contexts;
  std::vector<std::thread> clients;
  std::atomic<int> allowed = 0;
  std::atomic<int> wrong = 0;
  std::atomic<int> left = kAlerts;
  for (int i = 0; i < kAlerts; ++i) contexts.push_back(request());
  std::thread user([&] {
    while (left > 0) {
      if (!agents_.isShowing()) {
        std::this_thread::yield();
        continue;
      }
      const auto shown = agents_.next();
      const int number = std::stoi(*RVValueForKey(shown.description, "header")->string());
      agents_.answer(shown, number % 3 == 0 ? 0 : 1);
    }
  });
  for (int i = 0; i < kAlerts; ++i)
    clients.emplace_back([&, i] {
      const auto flags = ask(contexts[static_cast<std::size_t>(i)], std::to_string(i)).get();
      if (flags == 0) ++allowed;
      if (flags == 0 && i % 3 != 0) ++wrong;
      --left;
    });
  for (int i = 1; i < kAlerts; i += 2)
    contexts[static_cast<std::size_t>(i)]->makeVoid(requests::VoidReason::kCallerGone);
  for (auto& client : clients) client.join();
  user.join();
  EXPECT_EQ(wrong, 0);
  EXPECT_GE(allowed, 34);  // the even multiples of three, whose requests never became void
}

TEST_F(AnAlert, IsNotShownBeforeTheRequestOfItsClientThatWasAnsweredHasEnded) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  const auto first = request();
  auto answer = ask(first, "first", false);
  agents_.answer(agents_.next(), 0);
  EXPECT_EQ(answer.get(), 0U);

  auto second = ask(request(), "second");
  for (int i = 0; i < 3; ++i) {
    auto other = ask(request("other"), "other");
    const auto shown = agents_.next();
    EXPECT_EQ(*RVValueForKey(shown.description, "header"), RVValue("other"));
    agents_.answer(shown, 1);
    other.get();
  }
  service_.requestEnded(first);
  const auto shown = agents_.next();
  EXPECT_EQ(*RVValueForKey(shown.description, "header"), RVValue("second"));
  agents_.answer(shown, 1);
  EXPECT_EQ(second.get(), 1U);
}

TEST_F(AnAlert, WhoseQuestionMayBeSettledIsNotShownAndItsRequestIsOutdated) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  const auto first = request();
  auto answer = ask(first, "first", false);
  agents_.answer(agents_.next(), 0);
  answer.get();

  const auto second = request();
  auto settled = ask(second, "second");
  second->outdate();
  service_.requestEnded(first);
  EXPECT_EQ(settled.get(), 2U);
  EXPECT_EQ(second->voidReason(), requests::VoidReason::kOutdated);
  EXPECT_FALSE(agents_.isShowing());
}

TEST_F(AnAlert, OfARequestThatIsOutdatedAlreadyIsNotShown) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  const auto context = request();
  context->outdate();
  EXPECT_EQ(ask(context).get(), 2U);
  EXPECT_EQ(context->voidReason(), requests::VoidReason::kOutdated);
  EXPECT_FALSE(agents_.isShowing());
}

TEST_F(AnAlert, ThatIsShownIsTakenDownWhenWhatItAsksMayBeSettled) {
  service_.registerAgent(kTerminal, AgentKind::kTerminal);
  const auto context = request();
  auto answer = ask(context);
  const auto shown = agents_.next();
  context->outdate();
  service_.requestEnded(request());
  EXPECT_EQ(answer.get(), 2U);
  agents_.waitForDismissed(shown.alertID);
}

TEST(Turns, ComeOneAfterTheOtherForOneOwner) {
  Turns turns;
  const auto first = turns.join("a");
  EXPECT_LT(first, turns.join("a"));
}

TEST(Turns, OfOneOwnerDelayAnotherByOneAtMost) {
  Turns turns;
  const auto shown = turns.join("many");
  turns.reach(shown);
  const auto second = turns.join("many");
  const auto third = turns.join("many");
  const auto other = turns.join("one");
  EXPECT_LE(other, second);
  EXPECT_LT(other, third);
}

TEST(Turns, AreNotWonByAskingAnewAfterEachAnswer) {
  Turns turns;
  turns.reach(turns.join("eager"));
  const auto patient = turns.join("patient");
  turns.reach(patient);
  const auto waiting = turns.join("patient");
  for (int i = 0; i < 3; ++i) {
    const auto again = turns.join("eager");
    if (again > waiting) return;  // the patient one's second comes before this
    turns.reach(again);
  }
  FAIL() << "the one that asks anew was always first";
}

TEST(ThePauseOfAnAgent, GrowsToAMinute) {
  EXPECT_EQ(AlertService::growingPause(1), std::chrono::seconds(1));
  EXPECT_EQ(AlertService::growingPause(2), std::chrono::seconds(2));
  EXPECT_EQ(AlertService::growingPause(1000), std::chrono::seconds(60));
}

}  // namespace
}  // namespace alerts
