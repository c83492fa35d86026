// What every maker of Facebook requests owes a plug-in: run over the daemon's own, which speaks to a
// server, and over the one of the tests.
#include <gtest/gtest.h>

#include <atomic>
#include <condition_variable>
#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "tests/fakes/FakeFacebookRequests.h"
#include "tests/support/FacebookParts.h"
#include "tests/support/LoopbackServer.h"
#include "tests/support/Outcome.h"

namespace {

using support::Outcome;
using support::PendingOutcome;

// A maker of requests whose server the test commands.
class Host {
 public:
  virtual ~Host() = default;
  virtual TKFacebookRequestFactory& factory() = 0;
  // How exchanges end from now on. An answer is held back until release().
  virtual void answer(const std::string& body, int status) = 0;
  virtual void answerLate(const std::string& body) = 0;
  virtual void breakConnections() = 0;
  // Waits until as many answers are held back, and lets them go.
  virtual bool release(std::size_t count) = 0;
};

class FakeHost final : public Host {
 public:
  TKFacebookRequestFactory& factory() override { return requests_; }
  void answer(const std::string& body, int status) override {
    reply(fakes::FakeReply::withBody(body, status));
  }
  void answerLate(const std::string& body) override { reply(fakes::FakeReply::withBody(body).held()); }
  void breakConnections() override { reply(fakes::FakeReply::withError({"com.zentor.transfer", 1, {}})); }
  bool release(std::size_t count) override {
    if (!requests_.waitForHeld(count)) return false;
    requests_.releaseHeld();
    return true;
  }

 private:
  void reply(const fakes::FakeReply& reply) {
    requests_.replyToAuthorizations({reply});
    requests_.replyToDescriptions({reply});
  }
  fakes::FakeFacebookRequests requests_;
};

class DaemonHost final : public Host {
 public:
  TKFacebookRequestFactory& factory() override { return requests_; }
  void answer(const std::string& body, int status) override {
    become(support::httpAnswer(body, status), false);
  }
  void answerLate(const std::string& body) override { become(support::httpAnswer(body), true); }
  void breakConnections() override { become("", false); }
  bool release(std::size_t count) override {
    if (!server_.waitForRequests(count)) return false;
    const std::lock_guard lock(mutex_);
    isLate_ = false;
    changed_.notify_all();
    return true;
  }

 private:
  static http::FacebookServerSettings settingsFor(const std::string& url) {
    http::FacebookServerSettings settings;
    settings.url = url;
    return settings;
  }
  void become(const std::string& bytes, bool isLate) {
    const std::lock_guard lock(mutex_);
    bytes_ = bytes;
    isLate_ = isLate;
  }

  std::mutex mutex_;
  std::condition_variable changed_;
  std::string bytes_;
  bool isLate_ = false;
  support::LoopbackServer server_{
      [this](support::LoopbackConnection& connection, const support::HeardRequest&) {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [this] { return !isLate_; });
        connection.send(bytes_);
      }};
  support::FacebookParts parts_;
  http::FacebookRequests& requests_ = parts_.requestsTo(settingsFor(server_.url()));
};

template <typename OneHost>
class AMakerOfFacebookRequests : public testing::Test {
 protected:
  std::shared_ptr<TKFacebookAuthorizationRequest> authorization() {
    return host.factory().initWithAppId("1", "org.example.App", RVPermissionSet{"email"}, "SELF");
  }
  std::shared_ptr<TKFacebookPermissionDescriptionRequest> description() {
    return host.factory().initWithPermissions({"odd"}, std::nullopt);
  }
  OneHost host;
};

struct Names {
  template <typename OneHost>
  static std::string GetName(int) {
    return std::is_same_v<OneHost, FakeHost> ? "Fake" : "Daemon";
  }
};
using Hosts = testing::Types<FakeHost, DaemonHost>;
TYPED_TEST_SUITE(AMakerOfFacebookRequests, Hosts, Names);

TYPED_TEST(AMakerOfFacebookRequests, MakesEveryObject) {
  EXPECT_NE(this->authorization(), nullptr);
  EXPECT_NE(this->description(), nullptr);
  EXPECT_NE(this->host.factory().initWithAppId("", "", std::nullopt, std::nullopt), nullptr);
  EXPECT_NE(this->host.factory().initWithPermissions({}, std::nullopt), nullptr);
  EXPECT_NE(this->host.factory().initSession(), nullptr);
}

TYPED_TEST(AMakerOfFacebookRequests, DeliversTheBodyAndTheStatus) {
  for (const int status : {200, 400, 503}) {
    this->host.answer("{\"error_msg\":\"no\"}", status);
    for (const bool asksForAuthorization : {true, false}) {
      PendingOutcome pending;
      if (asksForAuthorization)
        this->authorization()->performRequestWithHandler(pending.handler());
      else
        this->description()->performRequestWithHandler(pending.handler());
      const Outcome outcome = pending.wait();
      EXPECT_EQ(outcome.body, "{\"error_msg\":\"no\"}");
      ASSERT_TRUE(outcome.response);
      EXPECT_EQ(outcome.response->statusCode, status);
      EXPECT_FALSE(outcome.error);
    }
  }
}

TYPED_TEST(AMakerOfFacebookRequests, DeliversAnErrorAndNoBodyWhereTheExchangeFails) {
  this->host.breakConnections();
  PendingOutcome pending;
  this->authorization()->performRequestWithHandler(pending.handler());
  const Outcome outcome = pending.wait();
  ASSERT_TRUE(outcome.error);
  EXPECT_EQ(outcome.error->domain, "com.zentor.transfer");
  EXPECT_FALSE(outcome.body);
}

TYPED_TEST(AMakerOfFacebookRequests, NeverRunsAHandlerOnTheCallersStack) {
  this->host.answer("x", 200);
  PendingOutcome pending;
  this->description()->performRequestWithHandler(pending.handler());
  EXPECT_NE(pending.wait().thread, std::this_thread::get_id());
}

TYPED_TEST(AMakerOfFacebookRequests, ReturnsBeforeTheAnswerAndNeedsTheRequestNoMore) {
  this->host.answerLate("\"late\"");
  PendingOutcome pending;
  {
    const auto request = this->authorization();
    request->setAccessToken(RVSecret("a-token"));
    request->performRequestWithHandler(pending.handler());
  }
  EXPECT_FALSE(pending.hasCome());
  ASSERT_TRUE(this->host.release(1));
  EXPECT_EQ(pending.wait().body, "\"late\"");
}

TYPED_TEST(AMakerOfFacebookRequests, ReleasesAHandlerThatHasRun) {
  this->host.answer("x", 200);
  std::promise<void> released;
  {
    const std::shared_ptr<void> held(nullptr, [&released](void*) { released.set_value(); });
    this->authorization()->performRequestWithHandler([held](const auto&, const auto&, const auto&) {});
  }
  EXPECT_EQ(released.get_future().wait_for(std::chrono::minutes(1)), std::future_status::ready);
}

TYPED_TEST(AMakerOfFacebookRequests, RunsEachHandlerOnce) {
  this->host.answerLate("x");
  std::deque<PendingOutcome> pending(20);
  std::atomic<int> runs = 0;
  for (auto& one : pending)
    this->authorization()->performRequestWithHandler([&runs, handler = one.handler()](const auto&... answer) {
      ++runs;
      handler(answer...);
    });
  ASSERT_TRUE(this->host.release(20));
  for (auto& one : pending) EXPECT_EQ(one.wait().body, "x");
  EXPECT_EQ(runs, 20);
}

TYPED_TEST(AMakerOfFacebookRequests, SurvivesAHandlerThatThrows) {
  this->host.answer("x", 200);
  this->authorization()->performRequestWithHandler(
      [](const auto&, const auto&, const auto&) { throw std::runtime_error("the handler's fault"); });
  PendingOutcome pending;
  this->authorization()->performRequestWithHandler(pending.handler());
  EXPECT_EQ(pending.wait().body, "x");
}

TYPED_TEST(AMakerOfFacebookRequests, TakesARequestFromAHandler) {
  this->host.answer("x", 200);
  PendingOutcome second;
  this->authorization()->performRequestWithHandler(
      [this, handler = second.handler()](const auto&, const auto&, const auto&) {
        this->description()->performRequestWithHandler(handler);
      });
  EXPECT_EQ(second.wait().body, "x");
}

}  // namespace
