#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <random>

#include "tests/support/StoredState.h"

namespace {

const std::string kType(RVAccountTypeIdentifierFacebook);

// A state directory with a bit of everything in it, and copies of it that are damaged.
class ADamagedDatabase : public ::testing::Test {
 protected:
  void SetUp() override {
    support::StoredState state(path_);
    account_ = state.addAccount("master");
    const RVDictionary options = {{"app_id", "1234"}, {"audience", "friends"}};
    for (int i = 0; i < 20; ++i) {
      const std::string id = "org.example.App" + std::to_string(i);
      const bool granted = i % 2 == 0;
      const auto evidence = static_cast<clients::Evidence>(i % 4);
      support::succeed(
          state.records->put({kType, id, granted, RVPermissionSet{"email", id}, options, {}, evidence}));
      if (granted) {
        ASSERT_FALSE(state.storeCredential(id, "token of " + id));
      }
      state.accessLog.RVDLogAccessRequest(kType, id, granted, true, 0);
    }
    before_ = state.records->list(kType);
    content_ = support::contentOf(path_ + "/accounts.db");
  }

  // Whatever was done to the file: nothing is believed that was not written, and what is missing is reported.
  void expectNothingForged(const std::string& damaged, const std::string& what) {
    for (const auto& entry : std::filesystem::directory_iterator(path_))
      if (entry.path().filename().string().starts_with("accounts.db")) std::filesystem::remove(entry.path());
    temporary_.write("rvd/accounts.db", damaged, 0600);
    std::unique_ptr<support::StoredState> state;
    try {
      state = std::make_unique<support::StoredState>(path_);
    } catch (const std::runtime_error&) {
      ++refused_;
      EXPECT_EQ(support::contentOf(path_ + "/accounts.db"), damaged) << what;
      return;
    }
    const auto after = state->records->list(kType);
    for (const auto& record : after)
      EXPECT_THAT(before_, ::testing::Contains(record)) << what << ": " << record.clientId;
    bool isWhole = after.size() == before_.size();
    for (const auto& record : before_) {
      const auto credential =
          state->keychain->credentialForClient(account_, record.clientId, clients::Evidence::kSandbox);
      isWhole = isWhole && record.granted == (credential != nullptr);
      if (credential == nullptr) continue;
      EXPECT_TRUE(record.granted) << what;
      EXPECT_EQ(credential->oauthToken().reveal(), "token of " + record.clientId) << what;
    }
    EXPECT_TRUE(isWhole || !state->log.lines().empty()) << what;
    const bool isAside = std::filesystem::exists(path_ + "/accounts.db.damaged-1");
    if (isAside) {
      EXPECT_EQ(support::contentOf(path_ + "/accounts.db.damaged-1"), damaged) << what;
    }
    ++(isAside ? setAside_ : survived_);
  }

  support::TemporaryDirectory temporary_;
  const std::string path_ = temporary_.path("rvd");
  std::string account_;
  std::string content_;
  std::vector<records::AuthorizationRecord> before_;
  int refused_ = 0;
  int setAside_ = 0;
  int survived_ = 0;
};

TEST_F(ADamagedDatabase, WithAFlippedBitForgesNothing) {
  std::mt19937 generator(1);
  for (int i = 0; i < 400; ++i) {
    // Every fourth in the header and the tables' definitions, where a bit does the most.
    const std::size_t offset = generator() % (i % 4 == 0 ? 200 : content_.size());
    std::string damaged = content_;
    damaged[offset] = static_cast<char>(damaged[offset] ^ (1 << generator() % 8));
    expectNothingForged(damaged, "a bit at " + std::to_string(offset));
  }
  EXPECT_GT(setAside_, 0);
  EXPECT_GT(survived_, 0);
}

TEST_F(ADamagedDatabase, WithAFlippedBitInARecordForgesNothing) {
  std::mt19937 generator(2);
  int hits = 0;
  for (std::size_t at = content_.find("org.example.App"); at != std::string::npos && hits < 100;
       at = content_.find("org.example.App", at + 1), ++hits) {
    std::string damaged = content_;
    const std::size_t offset = at - 40 + generator() % 120;
    damaged[offset] = static_cast<char>(damaged[offset] ^ (1 << generator() % 8));
    expectNothingForged(damaged, "a bit at " + std::to_string(offset));
  }
  EXPECT_GE(hits, 40);
}

TEST_F(ADamagedDatabase, ThatIsCutShortForgesNothing) {
  for (std::size_t size = 0; size < content_.size(); size += content_.size() / 60)
    expectNothingForged(content_.substr(0, size), "cut at " + std::to_string(size));
  // The last page is an empty table's: nothing is lost with it.
  EXPECT_GE(setAside_, 45);
}

TEST_F(ADamagedDatabase, WithAPageOfZeroesForgesNothing) {
  for (std::size_t page = 0; page < content_.size(); page += 4096) {
    std::string damaged = content_;
    damaged.replace(page, 4096, 4096, '\0');
    expectNothingForged(damaged, "a page of zeroes at " + std::to_string(page));
  }
}

TEST_F(ADamagedDatabase, WhoseEvidenceWasMadeWeakerIsNotBelieved) {
  for (const std::string evidence : {"0", "1", "2", "3"}) {
    auto connection = support::valueOf(records::Connection::open(path_ + "/accounts.db"));
    support::succeed(connection.execute("UPDATE authorizations SET evidence = " + evidence));
    for (const auto& record : support::StoredState(path_).records->list(kType))
      EXPECT_THAT(before_, ::testing::Contains(record));
    temporary_.write("rvd/accounts.db", content_, 0600);
  }
}

TEST_F(ADamagedDatabase, WhoseRefusalWasMadeAGrantIsNotBelieved) {
  {
    auto connection = support::valueOf(records::Connection::open(path_ + "/accounts.db"));
    support::succeed(connection.execute("UPDATE authorizations SET granted = 1"));
  }
  {
    const support::StoredState state(path_);
    EXPECT_EQ(state.records->list(kType).size(), 10U);  // those that were granted before
    EXPECT_EQ(state.log.lines().size(), 10U);
  }
  const support::StoredState again(path_);
  EXPECT_EQ(again.records->list(kType).size(), 10U);
  EXPECT_TRUE(again.log.lines().empty()) << "what cannot be believed is gone for good";
}

}  // namespace
