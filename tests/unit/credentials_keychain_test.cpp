#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>

#include "tests/support/StoredState.h"

namespace {

using support::succeed;
using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

const std::string kType(RVAccountTypeIdentifierFacebook);

class ASealedKeychain : public ::testing::Test {
 protected:
  void SetUp() override {
    open();
    account_ = state_->addAccount("the-master-token");
  }
  void open() {
    state_.reset();
    state_ = std::make_unique<support::StoredState>(path_);
  }
  std::string token(const std::optional<std::string>& clientId) {
    const auto found = state_->keychain->credentialForAccount(*state_->account(), clientId);
    return found != nullptr ? std::string(found->oauthToken().reveal()) : "(absent)";
  }
  std::string sealed(const std::string& clientId) {
    std::string bytes;
    succeed(state_->database->read([&](records::Connection& connection) -> base::Result<void> {
      auto statement =
          support::valueOf(connection.prepare("SELECT sealed FROM credentials WHERE client_id = ?1"));
      statement->bind(clientId);
      if (support::valueOf(statement->step())) bytes = statement->blob(0);
      return {};
    }));
    return bytes;
  }
  void change(const char* sql) {
    succeed(state_->database->write([&](records::Connection& connection) { return connection.run(sql); }));
  }
  bool isOnDisk(const std::string& bytes) {
    for (const auto& entry : std::filesystem::directory_iterator(path_))
      if (support::contentOf(entry.path()).find(bytes) != std::string::npos) return true;
    return false;
  }

  support::TemporaryDirectory temporary_;
  const std::string path_ = temporary_.path("rvd");
  std::unique_ptr<support::StoredState> state_;
  std::string account_;
};

TEST_F(ASealedKeychain, KeepsCredentialsOverARestart) {
  ASSERT_FALSE(state_->storeCredential("app", "the-clients-token"));
  open();
  EXPECT_EQ(token("app"), "the-clients-token");
  EXPECT_EQ(token(std::nullopt), "the-master-token");
  EXPECT_THAT(state_->log.lines(), IsEmpty());
}

TEST_F(ASealedKeychain, WritesNoTokenInTheClear) {
  ASSERT_FALSE(state_->storeCredential("app", "the-clients-token"));
  EXPECT_FALSE(isOnDisk("the-clients-token"));
  EXPECT_FALSE(isOnDisk("the-master-token"));
}

TEST_F(ASealedKeychain, LeavesNothingOfACredentialThatIsRemovedOrReplaced) {
  ASSERT_FALSE(state_->storeCredential("app", "old"));
  const std::string old = sealed("app");
  ASSERT_TRUE(isOnDisk(old));
  ASSERT_FALSE(state_->storeCredential("app", "new"));
  EXPECT_FALSE(isOnDisk(old));
  const std::string current = sealed("app");
  ASSERT_TRUE(isOnDisk(current));
  ASSERT_FALSE(state_->keychain->removeCredentialForAccount(*state_->account(), "app"));
  EXPECT_FALSE(isOnDisk(current));
}

TEST_F(ASealedKeychain, OpensNoCredentialInThePlaceOfAnother) {
  ASSERT_FALSE(state_->storeCredential("one", "1"));
  ASSERT_FALSE(state_->storeCredential("two", "2"));
  change(
      "UPDATE credentials SET sealed = (SELECT c.sealed FROM credentials c WHERE c.client_id = 'two') "
      "WHERE client_id = 'one'");
  EXPECT_EQ(token("one"), "(absent)");
  EXPECT_EQ(token("two"), "2");
  EXPECT_THAT(state_->log.texts(), Contains(HasSubstr("of the client one, cannot be read")));
  change(
      "UPDATE credentials SET sealed = (SELECT c.sealed FROM credentials c WHERE c.client_id IS NULL) "
      "WHERE client_id = 'one'");
  EXPECT_EQ(token("one"), "(absent)");
  change("UPDATE credentials SET sealed = x'' WHERE client_id = 'one'");
  EXPECT_EQ(token("one"), "(absent)");
}

TEST_F(ASealedKeychain, OpensNoCredentialOfAnotherAccount) {
  ASSERT_FALSE(state_->storeCredential("app", "token"));
  const std::string second = state_->addAccount("second");
  change(
      "UPDATE credentials SET account = (SELECT identifier FROM accounts ORDER BY number DESC LIMIT 1) "
      "WHERE client_id = 'app'");
  state_->put("app", true);
  EXPECT_EQ(state_->keychain->credentialForClient(second, "app", clients::Evidence::kRegistered), nullptr);
}

TEST_F(ASealedKeychain, CountsCredentialsAsAbsentWhenTheKeyIsLost) {
  ASSERT_FALSE(state_->storeCredential("app", "token"));
  std::filesystem::remove(path_ + "/credentials.key");
  open();
  EXPECT_THAT(state_->log.texts(), Contains(HasSubstr("key of the stored credentials is gone")));
  EXPECT_EQ(state_->log.lines().at(0).level, kRVLogLevelError);
  EXPECT_EQ(token("app"), "(absent)");
  EXPECT_EQ(token(std::nullopt), "(absent)");
  succeed(state_->keychain->setMasterCredential(account_, RVSecret("again")));
  EXPECT_EQ(token(std::nullopt), "again");
  open();
  EXPECT_THAT(state_->log.lines(), IsEmpty());
  EXPECT_EQ(token(std::nullopt), "again");
}

TEST_F(ASealedKeychain, MakesItsFirstKeyWithoutAWord) {
  EXPECT_THAT(state_->log.lines(), IsEmpty());
  EXPECT_TRUE(std::filesystem::exists(path_ + "/credentials.key"));
}

TEST_F(ASealedKeychain, StoresNothingForAnAccountThatIsGone) {
  const auto account = state_->account();
  account->setCredential(
      std::make_shared<const RVAccountCredential>(RVSecret("token"), RVSecret(), kRVDistantFuture));
  succeed(state_->accounts->remove(account_));
  EXPECT_TRUE(state_->keychain->setCredentialForAccount(*account, "app"));
  EXPECT_EQ(sealed("app"), "");
  const auto master = state_->keychain->setMasterCredential(account_, RVSecret("token"));
  ASSERT_FALSE(master);
  EXPECT_EQ(master.failure().kind, base::FailureKind::kNotFound);
}

TEST_F(ASealedKeychain, HandsAClientItsCredentialOnlyAsLongAsItHoldsAGrant) {
  ASSERT_FALSE(state_->storeCredential("app", "token"));
  const auto handedOut = [&] {
    return state_->keychain->credentialForClient(account_, "app", clients::Evidence::kRegistered) != nullptr;
  };
  EXPECT_FALSE(handedOut());
  state_->put("app", true);
  EXPECT_TRUE(handedOut());
  state_->put("app", false);
  EXPECT_FALSE(handedOut());
  state_->put("app", true);
  succeed(state_->records->removeAll(kType));
  EXPECT_FALSE(handedOut());
  succeed(state_->records->put({"another type", "app", true, {}, {}, {}}));
  EXPECT_FALSE(handedOut());
  EXPECT_EQ(state_->keychain->credentialForClient(account_, "", clients::Evidence::kRegistered), nullptr);
}

TEST_F(ASealedKeychain, DeletesAtStartWhatNoGrantStandsFor) {
  for (const char* id : {"granted", "refused", "unknown", "elsewhere"})
    ASSERT_FALSE(state_->storeCredential(id, id));
  state_->put("granted", true);
  state_->put("refused", false);
  succeed(state_->records->put({"another type", "elsewhere", true, {}, {}, {}}));
  succeed(state_->keychain->reconcile());
  EXPECT_EQ(token("granted"), "granted");
  EXPECT_EQ(token(std::nullopt), "the-master-token");
  for (const char* id : {"refused", "unknown", "elsewhere"}) {
    EXPECT_EQ(token(id), "(absent)");
    EXPECT_THAT(state_->log.texts(), Contains(HasSubstr(std::string("stored for ") + id)));
  }
  EXPECT_EQ(state_->log.lines().size(), 3U);
}

TEST_F(ASealedKeychain, WritesNoTokenToTheLog) {
  ASSERT_FALSE(state_->storeCredential("app", "the-clients-token"));
  change("UPDATE credentials SET sealed = zeroblob(100)");
  EXPECT_EQ(token("app"), "(absent)");
  EXPECT_EQ(token(std::nullopt), "(absent)");
  succeed(state_->keychain->reconcile());
  for (const std::string& line : state_->log.texts())
    EXPECT_EQ(line.find("-token"), std::string::npos) << line;
  EXPECT_EQ(state_->log.lines().size(), 3U);
}

}  // namespace
