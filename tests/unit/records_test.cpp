#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>

#include <csignal>
#include <filesystem>
#include <future>
#include <set>
#include <thread>

#include "tests/support/StoredState.h"

namespace {

using support::succeed;
using support::valueOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

const std::string kType(RVAccountTypeIdentifierFacebook);

class StoredRecords : public ::testing::Test {
 protected:
  void reopen() {
    state_.reset();
    open();
  }
  void open() { state_ = std::make_unique<support::StoredState>(path_); }
  void SetUp() override { open(); }

  std::vector<std::string> clients(bool onlyGranted = false) {
    std::vector<std::string> ids;
    for (const auto& record : state_->records->list(kType))
      if (record.granted || !onlyGranted) ids.push_back(record.clientId);
    return ids;
  }
  // Whether these bytes stand anywhere in the state directory.
  bool isOnDisk(const std::string& bytes) {
    for (const auto& entry : std::filesystem::recursive_directory_iterator(path_))
      if (entry.is_regular_file() && support::contentOf(entry.path()).find(bytes) != std::string::npos)
        return true;
    return false;
  }

  support::TemporaryDirectory temporary_;
  const std::string path_ = temporary_.path("rvd");
  std::unique_ptr<support::StoredState> state_;
};

TEST_F(StoredRecords, SurviveReopening) {
  using std::string_literals::operator""s;
  const records::AuthorizationRecord written{
      kType,
      "app\0\xff"s,
      true,
      RVPermissionSet{"email", "\xfe"s, ""},
      RVDictionary{{"app_id", "1\0\xff"s}, {"\xed\xa0\x80", RVArray{1, 1.0, true, RVValue()}}},
      {},
      clients::Evidence::kScope};
  succeed(state_->records->put(written));
  state_->put("refused", false);
  const auto before = state_->records->list(kType);
  reopen();
  EXPECT_TRUE(state_->records->list(kType) == before);
  const auto read = state_->records->find(kType, "app\0\xff"s);
  ASSERT_TRUE(read);
  EXPECT_EQ(read->changed, support::StoredState::clock());
  EXPECT_TRUE(read->permissions == written.permissions);
  EXPECT_TRUE(read->options == written.options);
  EXPECT_EQ(read->evidence, clients::Evidence::kScope);
  EXPECT_TRUE(state_->log.lines().empty());
}

TEST_F(StoredRecords, AreReadWithoutTheDatabase) {
  state_->put("app", true);
  // The database is in use until the read is done.
  succeed(state_->database->read([&](records::Connection&) -> base::Result<void> {
    auto read = std::async(std::launch::async, [&] {
      return state_->records->find(kType, "app").has_value() && state_->records->list(kType).size() == 1 &&
             state_->storeFor(nullptr)->accountsWithAccountTypeIdentifier(kType).empty();
    });
    EXPECT_EQ(read.wait_for(std::chrono::seconds(60)), std::future_status::ready);
    EXPECT_TRUE(read.get());
    return {};
  }));
}

TEST_F(StoredRecords, TellWhoListensAfterEachWriteThatWorked) {
  std::vector<std::string> heard;
  state_->records->onChange([&](const std::string& type) {
    heard.push_back(type + " " + std::to_string(state_->records->list(type).size()));
  });
  state_->put("app", false);
  succeed(state_->records->forgetRefusal(kType, "app"));
  EXPECT_FALSE(state_->records->forgetRefusal(kType, "app"));
  succeed(state_->records->removeAll("other"));
  EXPECT_THAT(heard, ElementsAre(kType + " 1", kType + " 0", "other 0"));
}

TEST_F(StoredRecords, AreNotReplacedByACallerOfWeakerEvidence) {
  using clients::Evidence;
  const auto put = [&](bool granted, Evidence evidence) {
    return state_->records->put({kType, "app", granted, {}, {}, {}, evidence});
  };
  succeed(put(true, Evidence::kRegistered));
  EXPECT_FALSE(state_->records->isStronger(kType, "app", Evidence::kRegistered));
  EXPECT_TRUE(state_->records->isStronger(kType, "app", Evidence::kUnknown));
  EXPECT_FALSE(state_->records->isStronger(kType, "another", Evidence::kUnknown));
  EXPECT_FALSE(state_->records->isStronger("other", "app", Evidence::kUnknown));
  succeed(put(true, Evidence::kSandbox));
  for (const Evidence weaker : {Evidence::kScope, Evidence::kRegistered, Evidence::kUnknown}) {
    const auto refused = put(false, weaker);
    ASSERT_FALSE(refused);
    EXPECT_EQ(refused.failure().kind, base::FailureKind::kRefused);
  }
  for (int round = 0; round < 2; ++round) {
    EXPECT_TRUE(state_->records->find(kType, "app")->granted);
    EXPECT_EQ(state_->records->find(kType, "app")->evidence, Evidence::kSandbox);
    reopen();
  }
  succeed(put(false, Evidence::kSandbox));
  EXPECT_FALSE(state_->records->find(kType, "app")->granted);
}

TEST_F(StoredRecords, KeepTheirEvidenceWhereTheUserChangesThem) {
  using clients::Evidence;
  succeed(state_->records->put({kType, "app", true, {}, {}, {}, Evidence::kScope}));
  succeed(state_->records->putForUser({kType, "app", false, {}, {}, {}, Evidence::kUnknown}));
  succeed(state_->records->putForUser({kType, "new", true, {}, {}, {}, Evidence::kSandbox}));
  for (int round = 0; round < 2; ++round) {
    EXPECT_FALSE(state_->records->find(kType, "app")->granted);
    EXPECT_EQ(state_->records->find(kType, "app")->evidence, Evidence::kScope);
    EXPECT_EQ(state_->records->find(kType, "new")->evidence, Evidence::kUnknown);
    reopen();
  }
}

TEST_F(StoredRecords, LetARefusalBeForgottenAndAGrantNot) {
  state_->put("refused", false);
  state_->put("granted", true);
  succeed(state_->records->forgetRefusal(kType, "refused"));
  EXPECT_EQ(state_->records->forgetRefusal(kType, "granted").failure().kind, base::FailureKind::kRefused);
  EXPECT_EQ(state_->records->forgetRefusal(kType, "nobody").failure().kind, base::FailureKind::kNotFound);
  EXPECT_EQ(state_->records->forgetRefusal("other", "granted").failure().kind, base::FailureKind::kNotFound);
  EXPECT_THAT(clients(), ElementsAre("granted"));
  reopen();
  EXPECT_THAT(clients(), ElementsAre("granted"));
}

TEST_F(StoredRecords, StandUnchangedWhereTheDiskIsFull) {
  const std::string account = state_->addAccount();
  state_->put("app", true);
  ASSERT_FALSE(state_->storeCredential("app", "kept"));
  struct rlimit before {};
  ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &before), 0);
  const auto handler = std::signal(SIGXFSZ, SIG_IGN);
  const struct rlimit full = {0, before.rlim_max};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &full), 0);
  const auto put = state_->records->put({kType, "app", false, {}, {}, {}});
  const auto removed = state_->records->removeAll(kType);
  const auto added = state_->accounts->add(kType, "another");
  const auto credential = state_->storeCredential("app", "new");
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &before), 0);
  std::signal(SIGXFSZ, handler);
  EXPECT_FALSE(put);
  EXPECT_FALSE(removed);
  EXPECT_FALSE(added);
  EXPECT_TRUE(credential);
  for (int round = 0; round < 2; ++round) {
    EXPECT_THAT(clients(true), ElementsAre("app"));
    EXPECT_EQ(state_->accounts->list().size(), 1U);
    EXPECT_EQ(state_->keychain->credentialForClient(account, "app", clients::Evidence::kRegistered)
                  ->oauthToken()
                  .reveal(),
              "kept");
    reopen();
  }
  state_->put("app", false);
  EXPECT_THAT(clients(true), IsEmpty());
}

TEST_F(StoredRecords, AreGoneFromTheDiskWhenTheyWereRemoved) {
  const std::string account = state_->addAccount("a-master-token");
  state_->put("org.example.Unmistakable", true);
  ASSERT_TRUE(isOnDisk("org.example.Unmistakable"));
  EXPECT_FALSE(isOnDisk("a-master-token"));
  succeed(state_->records->removeAll(kType));
  EXPECT_FALSE(isOnDisk("org.example.Unmistakable"));
  ASSERT_TRUE(isOnDisk(account));
  succeed(state_->accounts->remove(account));
  EXPECT_FALSE(isOnDisk(account));
}

TEST_F(StoredRecords, CanBeWrittenAndReadFromManyThreads) {
  state_->addAccount();
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&, t] {
      const std::string id = "app" + std::to_string(t);
      for (int i = 0; i < 10; ++i) {
        state_->put(id, i % 2 == 1);
        EXPECT_EQ(state_->records->find(kType, id)->granted, i % 2 == 1);
        EXPECT_FALSE(state_->storeCredential(id, std::to_string(i)));
        state_->accessLog.RVDLogAccessRequest(kType, id, true, true, 0);
        EXPECT_LE(state_->records->list(kType).size(), 4U);
        EXPECT_TRUE(state_->accessLog.newest(5));
        if (i % 2 == 1) {
          const auto credential = state_->keychain->credentialForClient(
              state_->accounts->list().at(0).identifier, id, clients::Evidence::kRegistered);
          EXPECT_EQ(credential->oauthToken().reveal(), std::to_string(i));
        }
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(clients(true).size(), 4U);
  EXPECT_EQ(valueOf(state_->accessLog.newest(1000)).size(), 40U);
  reopen();
  EXPECT_EQ(clients(true).size(), 4U);
}

class StoredAccounts : public StoredRecords {
 protected:
  std::string add(const std::string& type, const std::string& username) {
    const std::string id = valueOf(state_->accounts->add(type, username)).identifier;
    succeed(state_->keychain->setMasterCredential(id, RVSecret("master")));
    succeed(state_->accounts->finishSetUp(id));
    return id;
  }
};

TEST_F(StoredAccounts, ThatWereNotSetUpToTheEndAreGoneAtTheNextStart) {
  const std::string whole = add(kType, "whole");
  const std::string half = valueOf(state_->accounts->add(kType, "half")).identifier;
  succeed(state_->keychain->setMasterCredential(half, RVSecret("a token makes it no whole one")));
  reopen();
  ASSERT_EQ(state_->accounts->list().size(), 1U);
  EXPECT_EQ(state_->accounts->list().at(0).identifier, whole);
  EXPECT_FALSE(isOnDisk(half));
}

TEST_F(StoredAccounts, AreNotThereBeforeTheyAreSetUp) {
  const std::string id = valueOf(state_->accounts->add(kType, "me")).identifier;
  EXPECT_THAT(state_->accounts->list(), IsEmpty());
  EXPECT_THAT(state_->accounts->listOfType(kType), IsEmpty());
  EXPECT_FALSE(state_->accounts->find(id));
  EXPECT_EQ(state_->accounts->retire(id).failure().kind, base::FailureKind::kNotFound);
  succeed(state_->accounts->finishSetUp(id));
  EXPECT_TRUE(state_->accounts->find(id));
  EXPECT_EQ(state_->accounts->finishSetUp(id).failure().kind, base::FailureKind::kNotFound);
}

TEST_F(StoredAccounts, ThatAreBeingSetUpCanBeRemoved) {
  const std::string id = valueOf(state_->accounts->add(kType, "me")).identifier;
  succeed(state_->accounts->remove(id));
  EXPECT_EQ(state_->accounts->finishSetUp(id).failure().kind, base::FailureKind::kNotFound);
}

TEST_F(StoredAccounts, ThatAreRetiredKeepTheirOwnCredentialAlone) {
  const std::string id = state_->addAccount("master");
  const auto carrier = state_->account();
  ASSERT_FALSE(state_->storeCredential("app", "token"));
  state_->put("app", true);
  succeed(state_->accounts->retire(id));
  for (int round = 0; round < 2; ++round) {
    EXPECT_THAT(state_->accounts->list(), IsEmpty());
    EXPECT_FALSE(state_->accounts->find(id));
    const auto retired = valueOf(state_->accounts->retired());
    ASSERT_EQ(retired.size(), 1U);
    EXPECT_EQ(retired.at(0).identifier, id);
    EXPECT_EQ(retired.at(0).accountType, kType);
    EXPECT_EQ(state_->keychain->credentialForAccount(*carrier, std::nullopt)->oauthToken().reveal(),
              "master");
    EXPECT_EQ(state_->keychain->credentialForClient(id, "app", clients::Evidence::kRegistered), nullptr);
    reopen();
  }
  EXPECT_EQ(state_->accounts->retire(id).failure().kind, base::FailureKind::kNotFound);
  EXPECT_EQ(state_->accounts->finishSetUp(id).failure().kind, base::FailureKind::kNotFound);
  succeed(state_->accounts->remove(id));
  EXPECT_THAT(valueOf(state_->accounts->retired()), IsEmpty());
  EXPECT_FALSE(isOnDisk(id));
}

TEST_F(StoredAccounts, StayWhereTheKeyOfTheirCredentialsIsLost) {
  add(kType, "me");
  std::filesystem::remove(path_ + "/credentials.key");
  reopen();
  EXPECT_EQ(state_->accounts->list().size(), 1U);
}

TEST_F(StoredAccounts, KeepTheirOrderAndTheirNames) {
  using std::string_literals::operator""s;
  std::vector<std::string> added;
  std::set<std::string> unique;
  for (const std::string& username : {"zoe"s, "adam"s, "zoe"s, ""s, "\xff\0"s}) {
    added.push_back(username);
    unique.insert(add(kType, username));
  }
  EXPECT_EQ(unique.size(), added.size());
  succeed(state_->accounts->remove(state_->accounts->list().at(1).identifier));
  added.erase(added.begin() + 1);
  added.push_back("last");
  add("other", "last");
  for (int round = 0; round < 2; ++round) {
    std::vector<std::string> listed;
    for (const auto& account : state_->accounts->list()) {
      listed.push_back(account.username);
      EXPECT_EQ(state_->accounts->find(account.identifier)->username, account.username);
    }
    EXPECT_EQ(listed, added);
    EXPECT_EQ(state_->accounts->listOfType(kType).size(), 4U);
    reopen();
  }
}

TEST_F(StoredAccounts, TakeTheirCredentialsWithThemWhenTheyGo) {
  const std::string first = state_->addAccount("first master");
  ASSERT_FALSE(state_->storeCredential("app", "token"));
  const std::string second = state_->addAccount("second master");
  const auto carrier = state_->account();
  succeed(state_->accounts->remove(first));
  EXPECT_EQ(state_->keychain->credentialForAccount(*carrier, "app"), nullptr);
  EXPECT_EQ(state_->keychain->credentialForAccount(*carrier, std::nullopt), nullptr);
  EXPECT_EQ(state_->accounts->remove(first).failure().kind, base::FailureKind::kNotFound);
  EXPECT_FALSE(state_->accounts->find(first));
  EXPECT_NE(state_->keychain->credentialForAccount(*state_->account(), std::nullopt), nullptr);
  EXPECT_EQ(state_->accounts->list().at(0).identifier, second);
}

class TheStoredAccessLog : public StoredRecords {};

TEST_F(TheStoredAccessLog, ShowsTheNewestFirstUpToTheLimit) {
  EXPECT_TRUE(valueOf(state_->accessLog.newest(10)).empty());
  for (int i = 0; i < 5; ++i)
    state_->accessLog.RVDLogAccessRequest(kType, std::to_string(i), i % 2 == 0, true, 0);
  reopen();
  EXPECT_TRUE(valueOf(state_->accessLog.newest(0)).empty());
  const auto entries = valueOf(state_->accessLog.newest(3));
  ASSERT_EQ(entries.size(), 3U);
  EXPECT_EQ(entries[0].clientId, "4");
  EXPECT_TRUE(entries[0].granted);
  EXPECT_EQ(entries[2].clientId, "2");
  EXPECT_EQ(entries[0].time, support::StoredState::clock());
  EXPECT_EQ(valueOf(state_->accessLog.newest(0xffffffff)).size(), 5U);
}

TEST_F(TheStoredAccessLog, KeepsHowTheClientWasKnown) {
  const auto log = [&] { state_->accessLog.RVDLogAccessRequest(kType, "app", true, true, 0); };
  log();
  for (const auto evidence : {clients::Evidence::kRegistered, clients::Evidence::kSandbox}) {
    const requests::RequestContext::Scope scope(support::newRequest(evidence));
    log();
  }
  reopen();
  const auto entries = valueOf(state_->accessLog.newest(3));
  EXPECT_EQ(entries[0].evidence, clients::Evidence::kSandbox);
  EXPECT_EQ(entries[1].evidence, clients::Evidence::kRegistered);
  EXPECT_EQ(entries[2].evidence, clients::Evidence::kUnknown);
}

TEST_F(TheStoredAccessLog, LosesWhatIsTooOldAsNewEntriesCome) {
  const auto log = [&](const std::string& client) {
    state_->accessLog.RVDLogAccessRequest(kType, client, true, true, 0);
  };
  const auto begin = state_->now;
  log("old");
  state_->now += std::chrono::days(1);
  log("young");
  state_->now = begin + support::StoredState::kKeepAccessLog;
  log("just not too old");
  EXPECT_EQ(valueOf(state_->accessLog.newest(10)).size(), 3U);
  state_->now += std::chrono::seconds(1);
  log("new");
  const auto entries = valueOf(state_->accessLog.newest(10));
  ASSERT_EQ(entries.size(), 3U);
  EXPECT_EQ(entries.back().clientId, "young");
}

TEST_F(TheStoredAccessLog, LosesWhatIsTooOldWhenItIsPruned) {
  state_->accessLog.RVDLogAccessRequest(kType, "org.example.Pruned", true, true, 0);
  succeed(state_->accessLog.prune());
  EXPECT_EQ(valueOf(state_->accessLog.newest(10)).size(), 1U);
  state_->now += support::StoredState::kKeepAccessLog + std::chrono::seconds(1);
  succeed(state_->accessLog.prune());
  EXPECT_TRUE(valueOf(state_->accessLog.newest(10)).empty());
  EXPECT_FALSE(isOnDisk("org.example.Pruned"));
}

TEST_F(TheStoredAccessLog, OutlivesTheRecord) {
  state_->put("app", true);
  state_->accessLog.RVDLogAccessRequest(kType, "app", true, true, 0);
  succeed(state_->records->removeAll(kType));
  reopen();
  EXPECT_EQ(valueOf(state_->accessLog.newest(10)).size(), 1U);
}

TEST_F(TheStoredAccessLog, KeepsNoMoreThanItsLimit) {
  succeed(state_->database->write([this](records::Connection& connection) {
    return connection.run(
        "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < ?1) "
        "INSERT INTO access_log SELECT i, ?2, 't', NULL, 0, 0, 0 FROM n",
        records::kAccessLogEntries,
        std::int64_t{state_->now.time_since_epoch().count()});
  }));
  for (int i = 0; i < 3; ++i) state_->accessLog.RVDLogAccessRequest(kType, "new", true, true, 0);
  const auto entries = valueOf(state_->accessLog.newest(0xffffffff));
  EXPECT_EQ(entries.size(), static_cast<std::size_t>(records::kAccessLogEntries));
  EXPECT_EQ(entries[2].clientId, "new");
  EXPECT_EQ(entries[3].clientId, std::nullopt);
}

class InterruptedWork : public StoredRecords {
 protected:
  void SetUp() override {
    StoredRecords::SetUp();
    account_ = state_->addAccount();
    for (const char* id : {"one", "two"}) {
      state_->put(id, true);
      ASSERT_FALSE(state_->storeCredential(id, id));
    }
  }
  // What the next start does.
  void restart() {
    reopen();
    state_->reconcile();
  }
  bool holdsCredential(const std::string& id) {
    return state_->keychain->credentialForAccount(*state_->account(), id) != nullptr;
  }

  std::vector<std::string> owedApps() {
    std::vector<std::string> apps;
    for (const auto& owed : valueOf(state_->outbox.list())) apps.push_back(owed.appId);
    return apps;
  }

  std::string account_;
};

TEST_F(InterruptedWork, ThatWasFinishedIsNotDoneAgain) {
  const auto number = valueOf(state_->intents.begin({records::Intent::Kind::kRevokeClient, kType, "one"}));
  succeed(state_->intents.finish(number));
  restart();
  EXPECT_THAT(clients(true), ElementsAre("one", "two"));
  EXPECT_TRUE(holdsCredential("one"));
  EXPECT_TRUE(state_->log.lines().empty());
}

TEST_F(InterruptedWork, RevokesTheClientAndLeavesTheOthersAlone) {
  succeed(state_->records->put({kType,
                                "one",
                                true,
                                RVPermissionSet{"email"},
                                RVDictionary{{"app_id", "1"}},
                                {},
                                clients::Evidence::kSandbox}));
  valueOf(state_->intents.begin({records::Intent::Kind::kRevokeClient, kType, "one"}));
  restart();
  const auto record = state_->records->find(kType, "one");
  ASSERT_TRUE(record);
  EXPECT_FALSE(record->granted);
  EXPECT_FALSE(record->permissions);
  EXPECT_TRUE(record->options == RVDictionary({{"app_id", "1"}}));
  EXPECT_EQ(record->evidence, clients::Evidence::kSandbox);
  EXPECT_FALSE(holdsCredential("one"));
  EXPECT_TRUE(holdsCredential("two"));
  EXPECT_THAT(state_->log.texts(), Contains(HasSubstr("access of one to " + kType + " was interrupted")));
  restart();
  EXPECT_TRUE(state_->log.lines().empty());
}

TEST_F(InterruptedWork, MakesNoRefusalOfAClientWithoutARecord) {
  valueOf(state_->intents.begin({records::Intent::Kind::kRevokeClient, kType, "three"}));
  restart();
  EXPECT_FALSE(state_->records->find(kType, "three"));
}

TEST_F(InterruptedWork, RevokesAll) {
  valueOf(state_->intents.begin({records::Intent::Kind::kRevokeAll, kType, ""}));
  restart();
  EXPECT_THAT(clients(), IsEmpty());
  EXPECT_FALSE(holdsCredential("one"));
  EXPECT_FALSE(holdsCredential("two"));
  EXPECT_NE(state_->keychain->credentialForAccount(*state_->account(), std::nullopt), nullptr);
}

TEST_F(InterruptedWork, OwesTheServerWhatItsPlugInHadNotComeTo) {
  state_->put("one", true, RVDictionary{{"app_id", "1"}});
  state_->put("two", false, RVDictionary{{"app_id", "2"}});
  valueOf(state_->intents.begin({records::Intent::Kind::kRevokeClient, kType, "one"}));
  restart();
  EXPECT_THAT(owedApps(), ElementsAre("1"));
  EXPECT_THAT(valueOf(state_->outbox.list()).at(0).clientIds, ElementsAre("one"));
  valueOf(state_->intents.begin({records::Intent::Kind::kRevokeAll, kType, ""}));
  restart();
  EXPECT_THAT(owedApps(), ElementsAre("1", "2"));
  restart();
  EXPECT_THAT(owedApps(), ElementsAre("1", "2"));
}

TEST_F(InterruptedWork, KeepsTheTokenOfARemovedAccountForWhatIsOwed) {
  state_->put("one", true, RVDictionary{{"app_id", "1"}});
  valueOf(state_->intents.begin({records::Intent::Kind::kRemoveAccount, kType, account_}));
  restart();
  EXPECT_TRUE(state_->accounts->list().empty());
  ASSERT_EQ(valueOf(state_->accounts->retired()).size(), 1u);
  const auto owed = valueOf(state_->outbox.list());
  ASSERT_EQ(owed.size(), 1u);
  EXPECT_EQ(owed[0].account, account_);
  EXPECT_FALSE(state_->accounts->remove(account_)) << "what is owed could not be signed any more";
  succeed(state_->outbox.remove(owed[0]));
  restart();
  EXPECT_TRUE(valueOf(state_->accounts->retired()).empty());
  EXPECT_THAT(state_->log.texts(), Contains(HasSubstr("it is erased now")));
}

TEST_F(InterruptedWork, RemovesTheAccount) {
  valueOf(state_->intents.begin({records::Intent::Kind::kRemoveAccount, kType, account_}));
  restart();
  EXPECT_THAT(clients(), IsEmpty());
  EXPECT_TRUE(state_->accounts->list().empty());
  // Also where the account had gone already.
  valueOf(state_->intents.begin({records::Intent::Kind::kRemoveAccount, kType, account_}));
  restart();
  restart();
  EXPECT_TRUE(state_->log.lines().empty());
}

}  // namespace
