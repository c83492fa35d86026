#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <deque>
#include <memory>
#include <string>
#include <vector>

#include "daemon/http/Revocations.h"
#include "daemon/http/TransferErrors.h"
#include "daemon/records/Account.h"
#include "tests/support/StoredState.h"

namespace {

using http::Revocations;
using http::transferError;
using http::TransferErrorCode;
using std::chrono::milliseconds;
using support::succeed;
using support::valueOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

const std::string kType(RVAccountTypeIdentifierFacebook);

// A daemon's revocations, whose server, time and threads are the test's.
class AnOwedRevocation : public testing::Test {
 protected:
  struct Sent {
    std::string appID;
    std::optional<std::string> token;
    TKFacebookRequestHandler handler;
  };
  struct Pause {
    milliseconds time;
    std::function<void()> work;
  };

  void SetUp() override {
    open();
    account = state->addAccount("master-canary");
    state->put("org.example.App", true, RVDictionary{{"app_id", "4711"}});
  }

  // Ends what runs as a kill would, and starts anew.
  void open() {
    revocations.reset();
    sent.clear();
    pauses.clear();
    state.reset();
    state = std::make_unique<support::StoredState>(directory.path("rvd"));
    state->reconcile();
    Revocations::Means means;
    means.tokenOf = [this](const std::string& id) { return ownToken(id); };
    means.erase = [this](const std::string& id) {
      erased.push_back(id);
      state->keychain->eraseAccount(id);
    };
    means.send = [this](const std::string& appID, std::optional<RVSecret> token, auto handler) {
      sent.push_back({appID, token ? std::optional(std::string(token->reveal())) : std::nullopt, handler});
    };
    means.after = [this](milliseconds time, std::function<void()> work) {
      pauses.push_back({time, std::move(work)});
    };
    means.run = [this](const std::function<void()>& work) {
      if (canRun) work();
      return canRun;
    };
    means.pauseAfter = [](int failures) { return milliseconds(failures); };
    revocations =
        std::make_unique<Revocations>(valueOf(state->outbox.list()),
                                      Revocations::Stores{state->outbox, *state->accounts, *state->records},
                                      means,
                                      state->log);
    revocations->onChange([this](const std::string& accountType) { changes.push_back(accountType); });
  }

  base::Result<std::optional<RVSecret>> ownToken(const std::string& id) {
    if (isKeyringLocked) return base::Failure{base::FailureKind::kFailed, "the keyring is locked"};
    const records::Account owner({id, kType, ""}, nullptr);
    const auto credential = state->keychain->credentialForAccount(owner, std::nullopt);
    return credential != nullptr ? std::optional(credential->oauthToken()) : std::nullopt;
  }

  void owe(const std::string& appID = "4711") { succeed(revocations->owe(kType, appID)); }

  // What comes of the exchange that was begun first.
  void answer(std::optional<int> status = 200, std::optional<TransferErrorCode> code = std::nullopt) {
    ASSERT_FALSE(sent.empty());
    const auto handler = sent.front().handler;
    sent.pop_front();
    std::optional<TKHTTPResponse> response;
    if (status) response = TKHTTPResponse{*status};
    if (code)
      handler(std::nullopt, response, transferError(*code));
    else
      handler("{}", response, std::nullopt);
  }
  void breakOff() { answer(std::nullopt, TransferErrorCode::kCouldNotConnect); }

  void endPause() {
    ASSERT_FALSE(pauses.empty());
    const auto work = pauses.front().work;
    pauses.pop_front();
    work();
  }

  std::vector<std::string> owed() const {
    std::vector<std::string> apps;
    for (const auto& one : revocations->list(kType)) apps.push_back(one.appId);
    return apps;
  }
  std::vector<std::string> written() const {
    std::vector<std::string> apps;
    for (const auto& one : valueOf(state->outbox.list())) apps.push_back(one.appId);
    return apps;
  }

  // Has nothing more written to the table, as a disk that is full would.
  void makeUnwritable(const char* what) const {
    sqlite3* database = nullptr;
    ASSERT_EQ(sqlite3_open(directory.path("rvd/accounts.db").c_str(), &database), SQLITE_OK);
    const std::string trigger = std::string("CREATE TRIGGER no BEFORE ") + what +
                                " ON outbox BEGIN SELECT RAISE(ABORT, 'the disk is full'); END";
    EXPECT_EQ(sqlite3_exec(database, trigger.c_str(), nullptr, nullptr, nullptr), SQLITE_OK);
    sqlite3_close(database);
  }

  support::TemporaryDirectory directory;
  std::unique_ptr<support::StoredState> state;
  std::string account;
  bool canRun = true;
  bool isKeyringLocked = false;
  std::deque<Sent> sent;
  std::deque<Pause> pauses;
  std::vector<std::string> changes;
  std::vector<std::string> erased;
  std::unique_ptr<Revocations> revocations;
};

TEST_F(AnOwedRevocation, IsWrittenDownAndTriedAtOnceAndNoMoreOnceItWasAnswered) {
  owe();
  EXPECT_THAT(written(), ElementsAre("4711"));
  const auto listed = revocations->list(kType);
  ASSERT_EQ(listed.size(), 1u);
  EXPECT_EQ(listed[0].account, account);
  EXPECT_THAT(listed[0].clientIds, ElementsAre("org.example.App"));
  EXPECT_EQ(listed[0].since, support::StoredState::clock());
  EXPECT_EQ(listed[0].attempts, 0);
  EXPECT_FALSE(listed[0].failure);
  EXPECT_THAT(revocations->list("com.zentor.other"), IsEmpty());
  ASSERT_EQ(sent.size(), 1u);
  EXPECT_EQ(sent[0].appID, "4711");
  EXPECT_EQ(sent[0].token, "master-canary");
  answer();
  EXPECT_THAT(owed(), IsEmpty());
  EXPECT_THAT(written(), IsEmpty());
  EXPECT_THAT(pauses, IsEmpty());
  EXPECT_THAT(changes, ElementsAre(kType, kType));
  EXPECT_TRUE(state->log.lines().empty());
}

TEST_F(AnOwedRevocation, IsAnsweredByAnyResponseThatTheServerItselfMakes) {
  struct Case {
    std::optional<int> status;
    std::optional<TransferErrorCode> error;
    bool isAnswered;
  };
  const std::vector<Case> cases = {
      {200, std::nullopt, true},
      {401, std::nullopt, true},
      {429, std::nullopt, false},
      {500, std::nullopt, false},
      {503, std::nullopt, false},
      {502, TransferErrorCode::kAnswerTooLarge, false},
      {302, TransferErrorCode::kNoBody, true},
      {404, TransferErrorCode::kNoBody, true},
      {200, TransferErrorCode::kAnswerTooLarge, true},
      {500, TransferErrorCode::kNoBody, false},
      {503, TransferErrorCode::kNoBody, false},
      {200, TransferErrorCode::kTimedOut, false},
      {200, TransferErrorCode::kConnectionBroken, false},
      {std::nullopt, TransferErrorCode::kAnswerTooLarge, false},
      {std::nullopt, TransferErrorCode::kNoServer, false},
      {std::nullopt, TransferErrorCode::kServerNotTrusted, false},
      {std::nullopt, TransferErrorCode::kUnreadableAnswer, false},
  };
  for (std::size_t i = 0; i < cases.size(); ++i) {
    const std::string appID = std::to_string(i);
    owe(appID);
    answer(cases[i].status, cases[i].error);
    const bool isAnswered = owed().empty() || owed().back() != appID;
    EXPECT_EQ(isAnswered, cases[i].isAnswered) << "case " << i;
  }
}

TEST_F(AnOwedRevocation, ThatFailsIsTriedAgainAfterGrowingPausesUntilItIsAnswered) {
  owe();
  for (int failures = 1; failures <= 5; ++failures) {
    breakOff();
    EXPECT_THAT(sent, IsEmpty());
    ASSERT_EQ(pauses.size(), 1u);
    EXPECT_EQ(pauses.front().time, milliseconds(failures));
    const auto listed = revocations->list(kType);
    EXPECT_EQ(listed.at(0).attempts, failures);
    EXPECT_THAT(listed.at(0).failure.value_or(""), HasSubstr("could not be reached"));
    EXPECT_EQ(valueOf(state->outbox.list()), listed);
    endPause();
  }
  answer();
  EXPECT_THAT(written(), IsEmpty());
  EXPECT_EQ(changes.size(), 7u);
  // One line when it begins to fail and one when it is over, however often it was tried.
  ASSERT_EQ(state->log.lines().size(), 2u);
  EXPECT_THAT(state->log.texts()[0], HasSubstr("could not be told to forget the token of app 4711"));
  EXPECT_THAT(state->log.texts()[1], HasSubstr("was told to forget the token of app 4711"));
  for (const std::string& text : state->log.texts()) EXPECT_THAT(text, Not(HasSubstr("canary")));
}

TEST_F(AnOwedRevocation, PausesOneSecondAtFirstAndAnHourAtMost) {
  EXPECT_EQ(Revocations::growingPause(1), std::chrono::seconds(1));
  EXPECT_EQ(Revocations::growingPause(2), std::chrono::seconds(2));
  EXPECT_EQ(Revocations::growingPause(12), std::chrono::seconds(2048));
  EXPECT_EQ(Revocations::growingPause(13), std::chrono::hours(1));
  EXPECT_EQ(Revocations::growingPause(1'000'000), std::chrono::hours(1));
}

TEST_F(AnOwedRevocation, OutlivesTheDaemonAndIsTriedAtItsStart) {
  owe("4711");
  owe("4712");
  breakOff();
  open();
  EXPECT_THAT(owed(), ElementsAre("4711", "4712"));
  EXPECT_EQ(revocations->list(kType)[0].attempts, 1);
  EXPECT_TRUE(revocations->list(kType)[0].failure);
  EXPECT_THAT(sent, IsEmpty());
  revocations->start();
  ASSERT_EQ(sent.size(), 2u);
  EXPECT_EQ(sent[0].token, "master-canary");
  answer();
  answer();
  EXPECT_THAT(owed(), IsEmpty());
  open();
  EXPECT_THAT(owed(), IsEmpty());
}

TEST_F(AnOwedRevocation, JoinsTheOneThatIsOwedAlready) {
  owe();
  breakOff();
  state->put("org.example.App", false);
  state->put("org.example.Other", true, RVDictionary{{"app_id", "4711"}});
  owe();
  ASSERT_EQ(owed().size(), 1u);
  EXPECT_THAT(revocations->list(kType)[0].clientIds, ElementsAre("org.example.App", "org.example.Other"));
  EXPECT_EQ(revocations->list(kType)[0].attempts, 1);
  EXPECT_EQ(revocations->list(kType), valueOf(state->outbox.list()));
  EXPECT_EQ(sent.size(), 1u) << "does not wait for the pause of the earlier one";
  answer();
  endPause();
  EXPECT_THAT(sent, IsEmpty());
  EXPECT_THAT(written(), IsEmpty());
}

TEST_F(AnOwedRevocation, ThatIsOwedWhileAnotherIsOnItsWayIsToldAfterThat) {
  owe();
  owe();
  EXPECT_EQ(sent.size(), 1u);
  answer();
  EXPECT_EQ(sent.size(), 1u) << "the answer may be older than what is owed";
  EXPECT_THAT(written(), ElementsAre("4711"));
  answer();
  EXPECT_THAT(sent, IsEmpty());
  EXPECT_THAT(written(), IsEmpty());
}

TEST_F(AnOwedRevocation, IsTriedOnceAtATime) {
  owe();
  breakOff();
  revocations->start();
  EXPECT_EQ(sent.size(), 1u);
  endPause();
  EXPECT_EQ(sent.size(), 1u);
  breakOff();
  EXPECT_EQ(pauses.size(), 1u);
}

TEST_F(AnOwedRevocation, ThatCannotBeWrittenDownIsNotOwed) {
  makeUnwritable("INSERT");
  EXPECT_FALSE(revocations->owe(kType, "4711"));
  EXPECT_THAT(owed(), IsEmpty());
  EXPECT_THAT(sent, IsEmpty());
}

TEST_F(AnOwedRevocation, WhoseAnswerCannotBeWrittenDownStaysOwed) {
  owe();
  makeUnwritable("DELETE");
  answer();
  EXPECT_THAT(owed(), ElementsAre("4711"));
  EXPECT_EQ(pauses.size(), 1u);
  EXPECT_THAT(revocations->list(kType)[0].failure.value_or(""), HasSubstr("the disk is full"));
}

TEST_F(AnOwedRevocation, WithoutAnAccountIsNotOwed) {
  succeed(state->accounts->remove(account));
  EXPECT_FALSE(revocations->owe(kType, "4711"));
  EXPECT_THAT(sent, IsEmpty());
}

TEST_F(AnOwedRevocation, WhoseTokenCannotBeReadIsTriedAgain) {
  isKeyringLocked = true;
  owe();
  EXPECT_THAT(sent, IsEmpty());
  EXPECT_THAT(revocations->list(kType).at(0).failure.value_or(""), HasSubstr("the keyring is locked"));
  isKeyringLocked = false;
  endPause();
  ASSERT_EQ(sent.size(), 1u);
  EXPECT_EQ(sent[0].token, "master-canary");
}

TEST_F(AnOwedRevocation, WhoseTokenIsLostIsSentUnsigned) {
  owe("1");
  sent.clear();
  std::filesystem::remove(directory.path("rvd/credentials.key"));
  open();
  revocations->start();
  ASSERT_EQ(sent.size(), 1u);
  EXPECT_FALSE(sent[0].token);
}

TEST_F(AnOwedRevocation, ThatEndsWithTheDaemonHasNotFailed) {
  owe();
  answer(std::nullopt, TransferErrorCode::kStopping);
  EXPECT_THAT(pauses, IsEmpty());
  EXPECT_THAT(written(), ElementsAre("4711"));
  EXPECT_EQ(revocations->list(kType)[0].attempts, 0);
  EXPECT_TRUE(state->log.lines().empty());
}

TEST_F(AnOwedRevocation, ThatNoThreadCanTryWaitsAgain) {
  owe();
  breakOff();
  canRun = false;
  endPause();
  EXPECT_THAT(sent, IsEmpty());
  canRun = true;
  endPause();
  EXPECT_EQ(sent.size(), 1u);
}

class ARemovedAccount : public AnOwedRevocation {
 protected:
  void remove() {
    succeed(state->accounts->retire(account));
    revocations->accountWasRetired(account);
  }
  std::size_t retired() const { return valueOf(state->accounts->retired()).size(); }
};

TEST_F(ARemovedAccount, IsErasedAtOnceWhereNothingIsOwed) {
  remove();
  EXPECT_EQ(retired(), 0u);
  EXPECT_FALSE(state->accounts->remove(account)) << "it is not there any more";
  EXPECT_THAT(erased, ElementsAre(account));
}

TEST_F(ARemovedAccount, KeepsItsTokenUntilTheLastRevocationWasAnswered) {
  owe("4711");
  owe("4712");
  remove();
  EXPECT_EQ(retired(), 1u);
  breakOff();
  answer();
  EXPECT_EQ(retired(), 1u);
  open();
  revocations->start();
  ASSERT_EQ(sent.size(), 1u);
  EXPECT_EQ(sent[0].appID, "4711");
  EXPECT_EQ(sent[0].token, "master-canary");
  EXPECT_THAT(erased, IsEmpty());
  answer();
  EXPECT_EQ(retired(), 0u);
  EXPECT_FALSE(state->accounts->remove(account));
  EXPECT_THAT(erased, ElementsAre(account));
}

TEST_F(ARemovedAccount, WhoseServerWasFasterIsErasedWhenItIsRemoved) {
  owe();
  answer();
  EXPECT_EQ(state->accounts->list().size(), 1u);
  remove();
  EXPECT_EQ(retired(), 0u);
}

TEST_F(ARemovedAccount, IsNoOtherAccount) {
  owe("4711");
  remove();
  const std::string other = state->addAccount("other-canary");
  owe("4711");
  ASSERT_EQ(sent.size(), 2u);
  EXPECT_EQ(sent[0].token, "master-canary");
  EXPECT_EQ(sent[1].token, "other-canary");
  answer();
  EXPECT_EQ(retired(), 0u);
  answer();
  EXPECT_EQ(state->accounts->list().size(), 1u);
  EXPECT_THAT(written(), IsEmpty());
}

class AnAuthorization : public AnOwedRevocation {
 protected:
  Revocations::WaiterID begin(const std::string& appID = "4711") {
    return revocations->beforeAuthorizing(appID, [this](const std::optional<RVError>& error) {
      ends.push_back(error ? error->localizedDescription().value_or("") : "may begin");
    });
  }
  std::vector<std::string> ends;
};

TEST_F(AnAuthorization, BeginsAtOnceWhereNothingIsOwedForItsApp) {
  owe("4712");
  EXPECT_EQ(begin(), 0u);
  EXPECT_THAT(ends, ElementsAre("may begin"));
}

TEST_F(AnAuthorization, BeginsWhenTheRevocationThatIsOnItsWayIsAnswered) {
  owe();
  begin();
  begin();
  EXPECT_THAT(ends, IsEmpty());
  EXPECT_EQ(sent.size(), 1u) << "both wait for the same";
  answer();
  EXPECT_THAT(ends, ElementsAre("may begin", "may begin"));
}

TEST_F(AnAuthorization, HasWhatIsOwedTriedAtOnce) {
  owe();
  breakOff();
  begin();
  ASSERT_EQ(sent.size(), 1u) << "does not wait for the pause";
  answer();
  EXPECT_THAT(ends, ElementsAre("may begin"));
  endPause();
  EXPECT_THAT(sent, IsEmpty());
}

TEST_F(AnAuthorization, FailsAsTheRevocationDoes) {
  owe();
  begin();
  begin();
  breakOff();
  EXPECT_THAT(ends, ElementsAre(HasSubstr("could not be reached"), HasSubstr("could not be reached")));
  EXPECT_THAT(written(), ElementsAre("4711"));
  begin();
  answer();
  EXPECT_EQ(ends.back(), "may begin");
}

TEST_F(AnAuthorization, WaitsForTheRevocationsOfAllAccounts) {
  owe();
  succeed(state->accounts->retire(account));
  state->addAccount("other-canary");
  owe();
  begin();
  answer();
  EXPECT_THAT(ends, IsEmpty());
  answer();
  EXPECT_THAT(ends, ElementsAre("may begin"));
}

TEST_F(AnAuthorization, WaitsAlsoForWhatIsOwedMeanwhile) {
  owe();
  begin();
  owe();
  answer();
  EXPECT_THAT(ends, IsEmpty());
  answer();
  EXPECT_THAT(ends, ElementsAre("may begin"));
}

TEST_F(AnAuthorization, ThatIsGivenUpIsOwedNothing) {
  owe();
  const auto first = begin();
  begin();
  EXPECT_TRUE(revocations->giveUp(first));
  EXPECT_FALSE(revocations->giveUp(first));
  answer();
  EXPECT_THAT(ends, ElementsAre("may begin"));
  EXPECT_THAT(written(), IsEmpty());
}

TEST_F(AnAuthorization, FailsWhereTheTokenThatRevokesCannotBeRead) {
  isKeyringLocked = true;
  owe();
  begin();
  EXPECT_THAT(ends, ElementsAre(HasSubstr("the keyring is locked")));
}

}  // namespace
