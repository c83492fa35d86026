#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <future>
#include <memory>
#include <string>

#include "daemon/http/TransferErrors.h"
#include "daemon/requests/RequestContext.h"
#include "tests/support/FacebookParts.h"
#include "tests/support/LoopbackServer.h"
#include "tests/support/Outcome.h"

namespace {

using http::TransferErrorCode;
using requests::RequestContext;
using requests::VoidReason;
using support::HeardRequest;
using support::httpAnswer;
using support::LoopbackConnection;
using support::LoopbackServer;
using support::Outcome;
using support::PendingOutcome;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using Fields = std::multimap<std::string, std::string>;

void expectError(const Outcome& outcome, TransferErrorCode code) {
  ASSERT_TRUE(outcome.error);
  EXPECT_EQ(outcome.error->domain, "com.zentor.transfer");
  EXPECT_EQ(outcome.error->code, static_cast<std::int64_t>(code)) << outcome.errorText();
}

class AFacebookRequest : public testing::Test {
 protected:
  http::FacebookRequests& factoryFor(std::optional<std::string> url) {
    http::FacebookServerSettings settings;
    settings.url = std::move(url);
    return parts.requestsTo(settings, "de-AT, en");
  }

  // Answers once the test says so.
  LoopbackServer::Responder whenReleased() {
    return [answer = release.get_future().share()](LoopbackConnection& connection, const HeardRequest&) {
      answer.wait();
      connection.send(httpAnswer("\"late\""));
    };
  }

  static std::shared_ptr<TKFacebookAuthorizationRequest> authorization(http::FacebookRequests& factory) {
    return factory.initWithAppId("1", "org.example.App", RVPermissionSet{"email"}, std::nullopt);
  }

  std::vector<std::string> owed() const {
    std::vector<std::string> apps;
    for (const auto& one : support::valueOf(parts.state.outbox.list())) apps.push_back(one.appId);
    return apps;
  }

  std::promise<void> release;
  mutable support::FacebookParts parts;
  fakes::FakeLog& log = parts.state.log;
  http::TransferThread& transfers = parts.transfers;
};

TEST_F(AFacebookRequest, ForAuthorizationSendsEverythingItHas) {
  const LoopbackServer server(httpAnswer("{}"));
  const auto request =
      factoryFor(server.url() + "/graph/")
          .initWithAppId("47 11", "org.example.App", RVPermissionSet{"user_photos", "email"}, "SELF");
  request->setAccessToken(RVSecret("a-token"));
  PendingOutcome pending;
  request->performRequestWithHandler(pending.handler());
  EXPECT_EQ(pending.wait().body, "{}");
  const HeardRequest heard = server.heard().at(0);
  EXPECT_EQ(heard.method(), "POST");
  EXPECT_EQ(heard.path(), "/graph/authorize");
  EXPECT_EQ(heard.header("authorization"), "Bearer a-token");
  EXPECT_EQ(heard.header("accept-language"), "de-AT, en");
  EXPECT_EQ(heard.form(),
            (Fields{{"app_id", "47 11"},
                    {"bundle_id", "org.example.App"},
                    {"permissions", "email,user_photos"},
                    {"audience", "SELF"}}));
}

TEST_F(AFacebookRequest, LeavesWhatIsAbsentOutAndSendsWhatIsEmpty) {
  const LoopbackServer server(httpAnswer("{}"));
  auto& factory = factoryFor(server.url());
  PendingOutcome absent;
  factory.initWithAppId("1", "b", std::nullopt, std::nullopt)->performRequestWithHandler(absent.handler());
  absent.wait();
  PendingOutcome empty;
  factory.initWithAppId("", "", RVPermissionSet{}, "")->performRequestWithHandler(empty.handler());
  empty.wait();
  EXPECT_EQ(server.heard().at(0).form(), (Fields{{"app_id", "1"}, {"bundle_id", "b"}}));
  EXPECT_EQ(server.heard().at(1).form(),
            (Fields{{"app_id", ""}, {"bundle_id", ""}, {"permissions", ""}, {"audience", ""}}));
  EXPECT_THAT(server.heard().at(0).head, Not(HasSubstr("Authorization")));
}

TEST_F(AFacebookRequest, ForADescriptionSendsThePermissionsAndTheAudience) {
  const LoopbackServer server(httpAnswer("\"do odd things\""));
  const auto request = factoryFor(server.url()).initWithPermissions({"b", "a"}, "EVERYONE");
  request->setAccessToken(RVSecret("a-token"));
  PendingOutcome pending;
  request->performRequestWithHandler(pending.handler());
  EXPECT_EQ(pending.wait().body, "\"do odd things\"");
  EXPECT_EQ(server.heard().at(0).path(), "/describe");
  EXPECT_EQ(server.heard().at(0).form(), (Fields{{"permissions", "a,b"}, {"audience", "EVERYONE"}}));
}

TEST_F(AFacebookRequest, MayBeLetGoOfOnceItHasBeenStarted) {
  LoopbackServer server(whenReleased());
  PendingOutcome pending;
  authorization(factoryFor(server.url()))->performRequestWithHandler(pending.handler());
  ASSERT_TRUE(server.waitForRequests(1));
  release.set_value();
  EXPECT_EQ(pending.wait().body, "\"late\"");
}

TEST_F(AFacebookRequest, WithoutAServerSaysSoAndNotOnTheCallersStack) {
  PendingOutcome pending;
  authorization(factoryFor(std::nullopt))->performRequestWithHandler(pending.handler());
  const Outcome outcome = pending.wait();
  expectError(outcome, TransferErrorCode::kNoServer);
  EXPECT_THAT(outcome.errorText(), HasSubstr("[Server]"));
  EXPECT_NE(outcome.thread, std::this_thread::get_id());
}

TEST_F(AFacebookRequest, ToAServerThatMayNotBeUsedSaysWhy) {
  PendingOutcome pending;
  authorization(factoryFor("http://facebook.example"))->performRequestWithHandler(pending.handler());
  const Outcome outcome = pending.wait();
  expectError(outcome, TransferErrorCode::kServerNotAllowed);
  EXPECT_THAT(outcome.errorText(), HasSubstr("is plain http"));
}

TEST_F(AFacebookRequest, ThatWillNotBeSentIsKnownBeforehand) {
  const auto& factory = factoryFor("https://facebook.example");
  EXPECT_EQ(factory.problemWithSending(RVPermissionSet{"email", "odd"}), std::nullopt);
  EXPECT_EQ(factory.problemWithSending(std::nullopt), std::nullopt);
  EXPECT_EQ(factory.problemWithSending(RVPermissionSet{"odd,email"})->code,
            static_cast<std::int64_t>(TransferErrorCode::kNotSendable));
  EXPECT_EQ(factoryFor(std::nullopt).problemWithSending(std::nullopt)->code,
            static_cast<std::int64_t>(TransferErrorCode::kNoServer));
}

TEST_F(AFacebookRequest, ForANameThatWouldReadAsTwoIsNotSent) {
  const LoopbackServer server(httpAnswer("{}"));
  auto& factory = factoryFor(server.url());
  PendingOutcome first;
  factory.initWithAppId("1", "b", RVPermissionSet{"odd,email"}, std::nullopt)
      ->performRequestWithHandler(first.handler());
  expectError(first.wait(), TransferErrorCode::kNotSendable);
  PendingOutcome second;
  factory.initWithPermissions({"odd,email"}, std::nullopt)->performRequestWithHandler(second.handler());
  expectError(second.wait(), TransferErrorCode::kNotSendable);
  EXPECT_EQ(server.connectionCount(), 0);
}

// Counts who waits, and lets nobody wait where it is told so.
class CountingLimiter : public requests::WaitingLimiter {
 public:
  bool beginWaiting(const std::string&) override {
    if (isFull) return false;
    ++waiting;
    return true;
  }
  void endWaiting(const std::string&) override { --waiting; }
  std::atomic<int> waiting = 0;
  bool isFull = false;
};

class AFacebookRequestOfARequest : public AFacebookRequest {
 protected:
  void perform(http::FacebookRequests& factory, TKFacebookRequestHandler handler) {
    const RequestContext::Scope scope(context);
    authorization(factory)->performRequestWithHandler(std::move(handler));
  }

  const std::shared_ptr<CountingLimiter> limiter = std::make_shared<CountingLimiter>();
  const std::shared_ptr<RequestContext> context =
      std::make_shared<RequestContext>("org.example.App", limiter);
};

TEST_F(AFacebookRequestOfARequest, CountsAsWaitingUntilItsAnswerHasCome) {
  LoopbackServer server(whenReleased());
  std::promise<int> waitingInHandler;
  perform(factoryFor(server.url()),
          [&](const auto&, const auto&, const auto&) { waitingInHandler.set_value(limiter->waiting); });
  EXPECT_EQ(limiter->waiting, 1);
  release.set_value();
  EXPECT_EQ(waitingInHandler.get_future().get(), 0) << "whoever the handler answers may ask again at once";
}

TEST_F(AFacebookRequestOfARequest, HandlesItsAnswerAsThatRequest) {
  const LoopbackServer server(httpAnswer("{}"));
  std::promise<std::shared_ptr<RequestContext>> current;
  perform(factoryFor(server.url()),
          [&](const auto&, const auto&, const auto&) { current.set_value(RequestContext::current()); });
  EXPECT_EQ(current.get_future().get(), context);
}

TEST_F(AFacebookRequestOfARequest, EndsWhenTheRequestBecomesVoid) {
  LoopbackServer server([](LoopbackConnection& connection, const HeardRequest&) {
    EXPECT_TRUE(connection.waitUntilClientGoes());
  });
  PendingOutcome pending;
  perform(factoryFor(server.url()), pending.handler());
  ASSERT_TRUE(server.waitForRequests(1));
  context->makeVoid(VoidReason::kCallerGone);
  expectError(pending.wait(), TransferErrorCode::kCancelled);
}

TEST_F(AFacebookRequestOfARequest, IsAnsweredAndNotSentWhereTheRequestIsVoid) {
  const LoopbackServer server(httpAnswer("{}"));
  context->makeVoid(VoidReason::kClientRevoked);
  PendingOutcome pending;
  perform(factoryFor(server.url()), pending.handler());
  const Outcome outcome = pending.wait();
  expectError(outcome, TransferErrorCode::kCancelled);
  EXPECT_NE(outcome.thread, std::this_thread::get_id());
  EXPECT_EQ(server.connectionCount(), 0);
}

TEST_F(AFacebookRequestOfARequest, IsAnsweredAndNotSentWhereNoMoreMayWait) {
  const LoopbackServer server(httpAnswer("{}"));
  limiter->isFull = true;
  PendingOutcome pending;
  perform(factoryFor(server.url()), pending.handler());
  expectError(pending.wait(), TransferErrorCode::kCancelled);
  EXPECT_EQ(context->voidReason(), VoidReason::kLimitReached);
  EXPECT_EQ(server.connectionCount(), 0);
}

TEST_F(AFacebookRequestOfARequest, IsAnsweredOnceHoweverTheAnswerAndTheEndMeet) {
  const LoopbackServer server(httpAnswer("{}"));
  auto& factory = factoryFor(server.url());
  for (int i = 0; i < 200; ++i) {
    const auto one = std::make_shared<RequestContext>("client", nullptr);
    PendingOutcome pending;
    {
      const RequestContext::Scope scope(one);
      authorization(factory)->performRequestWithHandler(pending.handler());
    }
    if (i % 4 != 0) std::this_thread::yield();
    one->makeVoid(VoidReason::kCallerGone);
    const Outcome outcome = pending.wait();
    EXPECT_NE(outcome.body.has_value(), outcome.error.has_value());
  }
}

TEST_F(AFacebookRequestOfARequest, EndsWithTheDaemon) {
  LoopbackServer server(
      [](LoopbackConnection& connection, const HeardRequest&) { connection.waitUntilClientGoes(); });
  PendingOutcome pending;
  perform(factoryFor(server.url()), pending.handler());
  ASSERT_TRUE(server.waitForRequests(1));
  transfers.stop(std::chrono::milliseconds(0));
  expectError(pending.wait(), TransferErrorCode::kStopping);
  EXPECT_EQ(limiter->waiting, 0);
}

class ARevocation : public AFacebookRequest {};

TEST_F(ARevocation, IsSignedWithTheMasterToken) {
  LoopbackServer server(httpAnswer("whatever"));
  factoryFor(server.url()).initSession()->revokeAccessTokenForAppWithID("4711");
  ASSERT_TRUE(server.waitForRequests(1));
  const HeardRequest heard = server.heard().at(0);
  EXPECT_EQ(heard.path(), "/revoke");
  EXPECT_EQ(heard.header("authorization"), "Bearer master-canary");
  EXPECT_EQ(heard.form(), (Fields{{"app_id", "4711"}}));
  transfers.stop(http::kRevocationGrace);
  EXPECT_TRUE(log.texts().empty());
}

TEST_F(ARevocation, WithoutAMasterTokenIsSentUnsigned) {
  LoopbackServer server(httpAnswer("whatever"));
  parts.masterToken.reset();
  factoryFor(server.url()).initSession()->revokeAccessTokenForAppWithID("4711");
  ASSERT_TRUE(server.waitForRequests(1));
  EXPECT_THAT(server.heard().at(0).head, Not(HasSubstr("Authorization")));
}

TEST_F(ARevocation, IsSentForAVoidRequestToo) {
  LoopbackServer server(httpAnswer("whatever"));
  const auto context = std::make_shared<RequestContext>("client", nullptr);
  context->makeVoid(VoidReason::kCallerGone);
  const RequestContext::Scope scope(context);
  factoryFor(server.url()).initSession()->revokeAccessTokenForAppWithID("4711");
  EXPECT_TRUE(server.waitForRequests(1));
}

TEST_F(ARevocation, MayEndLateWhenTheDaemonStops) {
  LoopbackServer server(httpAnswer("whatever"));
  factoryFor(server.url()).initSession()->revokeAccessTokenForAppWithID("4711");
  transfers.stop(std::chrono::hours(1));
  EXPECT_EQ(server.heard().size(), 1u);
}

TEST_F(ARevocation, ThatFailsIsLoggedWithoutTheToken) {
  factoryFor(std::nullopt).initSession()->revokeAccessTokenForAppWithID("4711");
  factoryFor("http://facebook.example").initSession()->revokeAccessTokenForAppWithID("4712");
  transfers.stop(std::chrono::hours(1));
  ASSERT_EQ(log.texts().size(), 2u);
  EXPECT_THAT(log.texts()[0], HasSubstr("4711"));
  EXPECT_THAT(log.texts()[1], HasSubstr("4712"));
  for (const std::string& text : log.texts()) EXPECT_THAT(text, Not(HasSubstr("canary")));
}

TEST_F(ARevocation, NeedsNoBodyInItsAnswer) {
  LoopbackServer server(httpAnswer(""));
  factoryFor(server.url()).initSession()->revokeAccessTokenForAppWithID("4711");
  transfers.stop(std::chrono::hours(1));
  EXPECT_EQ(server.heard().size(), 1u);
  EXPECT_THAT(owed(), IsEmpty());
  EXPECT_TRUE(log.texts().empty());
}

TEST_F(ARevocation, IsOwedWhenItReturns) {
  LoopbackServer server(whenReleased());
  factoryFor(server.url()).initSession()->revokeAccessTokenForAppWithID("4711");
  EXPECT_THAT(owed(), ElementsAre("4711"));
  release.set_value();
}

TEST_F(ARevocation, ThatCannotBeWrittenDownThrows) {
  support::succeed(parts.state.accounts->remove(parts.state.accounts->list().at(0).identifier));
  const auto session = factoryFor("http://127.0.0.1:1").initSession();
  EXPECT_THROW(session->revokeAccessTokenForAppWithID("4711"), std::runtime_error);
}

// A server that answers revocations when the test says so, and then with what it says.
class AnAuthorizationOfARevokedApp : public AFacebookRequestOfARequest {
 protected:
  void revoke() { factory.initSession()->revokeAccessTokenForAppWithID("1"); }
  void answerRevocations(std::string bytes) { revocationAnswer.set_value(std::move(bytes)); }
  std::vector<std::string> heard() const {
    std::vector<std::string> paths;
    for (const HeardRequest& request : server.heard()) paths.push_back(request.path());
    return paths;
  }

  std::promise<std::string> revocationAnswer;
  LoopbackServer server{[answer = revocationAnswer.get_future().share()](LoopbackConnection& connection,
                                                                         const HeardRequest& request) {
    connection.send(request.path() == "/revoke" ? answer.get() : httpAnswer("{}"));
  }};
  http::FacebookRequests& factory = factoryFor(server.url());
};

TEST_F(AnAuthorizationOfARevokedApp, ReachesTheServerAfterTheRevocationWasAnswered) {
  revoke();
  PendingOutcome first;
  PendingOutcome second;
  perform(factory, first.handler());
  perform(factory, second.handler());
  ASSERT_TRUE(server.waitForRequests(1));
  EXPECT_FALSE(first.hasCome());
  EXPECT_EQ(limiter->waiting, 1);
  answerRevocations(httpAnswer("{}"));
  EXPECT_EQ(first.wait().body, "{}");
  EXPECT_EQ(second.wait().body, "{}");
  EXPECT_THAT(heard(), ElementsAre("/revoke", "/authorize", "/authorize"));
  EXPECT_EQ(limiter->waiting, 0);
}

TEST_F(AnAuthorizationOfARevokedApp, FailsWithTheRevocationsErrorAndIsNotSent) {
  revoke();
  PendingOutcome pending;
  perform(factory, pending.handler());
  answerRevocations("");
  const Outcome outcome = pending.wait();
  expectError(outcome, TransferErrorCode::kConnectionBroken);
  EXPECT_NE(outcome.thread, std::this_thread::get_id());
  EXPECT_THAT(heard(), ElementsAre("/revoke"));
  EXPECT_THAT(owed(), ElementsAre("1"));
}

TEST_F(AnAuthorizationOfARevokedApp, EndsWhenItsRequestBecomesVoidAndLeavesTheRevocationAlone) {
  revoke();
  const auto other = std::make_shared<RequestContext>("other", nullptr);
  PendingOutcome ended;
  perform(factory, ended.handler());
  PendingOutcome waiting;
  {
    const RequestContext::Scope scope(other);
    authorization(factory)->performRequestWithHandler(waiting.handler());
  }
  context->makeVoid(VoidReason::kCallerGone);
  expectError(ended.wait(), TransferErrorCode::kCancelled);
  EXPECT_FALSE(waiting.hasCome());
  answerRevocations(httpAnswer("{}"));
  EXPECT_EQ(waiting.wait().body, "{}");
  EXPECT_THAT(heard(), ElementsAre("/revoke", "/authorize"));
  EXPECT_THAT(owed(), IsEmpty());
}

TEST_F(AnAuthorizationOfARevokedApp, EndsWhenItsRequestBecomesVoidAfterTheRevocationToo) {
  std::promise<void> isGone;
  LoopbackServer slow([&](LoopbackConnection& connection, const HeardRequest& request) {
    if (request.path() == "/revoke") {
      connection.send(httpAnswer("{}"));
    } else {
      EXPECT_TRUE(connection.waitUntilClientGoes());
      isGone.set_value();
    }
  });
  http::FacebookRequests& toSlow = factoryFor(slow.url());
  toSlow.initSession()->revokeAccessTokenForAppWithID("1");
  PendingOutcome pending;
  perform(toSlow, pending.handler());
  ASSERT_TRUE(slow.waitForRequests(2));
  context->makeVoid(VoidReason::kCallerGone);
  expectError(pending.wait(), TransferErrorCode::kCancelled);
  isGone.get_future().wait();
}

TEST_F(AnAuthorizationOfARevokedApp, EndsWithTheDaemon) {
  revoke();
  PendingOutcome pending;
  perform(factory, pending.handler());
  ASSERT_TRUE(server.waitForRequests(1));
  transfers.stop(std::chrono::milliseconds(0));
  expectError(pending.wait(), TransferErrorCode::kStopping);
  EXPECT_THAT(owed(), ElementsAre("1"));
  answerRevocations("");
}

TEST_F(AnAuthorizationOfARevokedApp, DoesNotConcernOtherApps) {
  revoke();
  PendingOutcome pending;
  factory.initWithAppId("2", "b", std::nullopt, std::nullopt)->performRequestWithHandler(pending.handler());
  EXPECT_EQ(pending.wait().body, "{}");
  answerRevocations("");
}

}  // namespace
