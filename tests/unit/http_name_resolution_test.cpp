// A program of its own: it stands in for the system's name resolution.
#include <gtest/gtest.h>
#include <netdb.h>

#include <future>
#include <string>

#include "daemon/http/TransferErrors.h"
#include "daemon/http/TransferThread.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/Outcome.h"

namespace {

struct NameServer {
  std::promise<void> wasAsked;
  std::promise<void> mayAnswer;
  std::promise<void> hasAnswered;
};
NameServer* nameServer = nullptr;

}  // namespace

// libcurl calls this one instead of the C library's.
extern "C" int getaddrinfo(const char*, const char*, const addrinfo*, addrinfo**) {
  NameServer* const server = nameServer;
  server->wasAsked.set_value();
  server->mayAnswer.get_future().wait();
  server->hasAnswered.set_value();
  return EAI_NONAME;
}

namespace {

class ANameServerThatHangs : public testing::Test {
 protected:
  ANameServerThatHangs() { nameServer = &server; }
  ~ANameServerThatHangs() override {
    server.mayAnswer.set_value();
    server.hasAnswered.get_future().wait();
  }

  http::Transfer transfer() const {
    http::Transfer transfer;
    transfer.url = "https://facebook.example/authorize";
    transfer.timeout = std::chrono::milliseconds(300);
    return transfer;
  }

  NameServer server;
  fakes::FakeLog log;
};

TEST_F(ANameServerThatHangs, DoesNotHoldATransferUpBeyondItsTime) {
  http::TransferThread thread(log);
  support::PendingOutcome pending;
  thread.start(transfer(), pending.handler());
  const auto outcome = pending.wait();
  ASSERT_TRUE(outcome.error);
  EXPECT_EQ(outcome.error->code, static_cast<std::int64_t>(http::TransferErrorCode::kTimedOut));
}

TEST_F(ANameServerThatHangs, DoesNotHoldAStopUp) {
  http::TransferThread thread(log);
  http::Transfer patient = transfer();
  patient.timeout = std::chrono::hours(1);
  support::PendingOutcome pending;
  thread.start(std::move(patient), pending.handler());
  server.wasAsked.get_future().wait();
  thread.stop(std::chrono::milliseconds(0));
  EXPECT_EQ(pending.wait().error->code, static_cast<std::int64_t>(http::TransferErrorCode::kStopping));
}

}  // namespace
