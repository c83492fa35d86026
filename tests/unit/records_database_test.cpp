#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <fstream>
#include <stdexcept>

#include "daemon/records/Database.h"
#include "daemon/records/Schema.h"
#include "tests/support/StoredState.h"

namespace {

using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::Not;

class ADatabase : public ::testing::Test {
 protected:
  void write(const std::string& name, const std::string& content, mode_t mode = 0600) {
    temporary_.write("rvd/" + name, content, mode);
  }
  bool exists(const std::string& name) { return std::filesystem::exists(path_ + "/" + name); }
  std::string content(const std::string& name) { return support::contentOf(path_ + "/" + name); }

  base::Result<std::unique_ptr<records::Database>> open() {
    return records::Database::open(*directory_, log_);
  }

  // Runs SQL on the file behind the daemon's back.
  void change(const std::string& sql) {
    auto connection = support::valueOf(records::Connection::open(path_ + "/accounts.db"));
    support::succeed(connection.execute(sql));
  }

  static std::string answer(records::Database& database, const char* sql) {
    std::string text;
    support::succeed(database.read([&](records::Connection& connection) -> base::Result<void> {
      auto statement = connection.prepare(sql);
      if (!statement) return statement.failure();
      if (auto row = (*statement)->step(); !row) return row.failure();
      text = (*statement)->text(0);
      return {};
    }));
    return text;
  }

  void expectSetAside(const std::string& before) {
    const auto opened = open();
    ASSERT_TRUE(opened);
    EXPECT_EQ(answer(**opened, "SELECT count(*) FROM accounts"), "0");
    EXPECT_EQ(content("accounts.db.damaged-1"), before);
    EXPECT_THAT(log_.texts(), Contains(HasSubstr("accounts.db.damaged-1")));
    EXPECT_EQ(log_.lines().at(0).level, kRVLogLevelError);
  }

  support::TemporaryDirectory temporary_;
  const std::string path_ = temporary_.path("rvd");
  std::unique_ptr<state::Directory> directory_ = support::valueOf(state::Directory::open(path_));
  fakes::FakeLog log_;
};

TEST_F(ADatabase, IsMadeEmptyForItsOwnerAlone) {
  const mode_t before = ::umask(0);
  const auto opened = open();
  ::umask(before);
  ASSERT_TRUE(opened);
  struct stat status {};
  ASSERT_EQ(::stat((path_ + "/accounts.db").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600U);
  EXPECT_FALSE(exists("accounts.db.new"));
  EXPECT_TRUE(log_.lines().empty());
}

TEST_F(ADatabase, IsSetUpToLoseNothingAndToKeepNothingThatWasDeleted) {
  const auto database = support::valueOf(open());
  EXPECT_EQ(answer(*database, "PRAGMA journal_mode"), "delete");
  EXPECT_EQ(answer(*database, "PRAGMA synchronous"), "3");
  EXPECT_EQ(answer(*database, "PRAGMA secure_delete"), "1");
  EXPECT_EQ(answer(*database, "PRAGMA foreign_keys"), "1");
  EXPECT_EQ(answer(*database, "PRAGMA user_version"), std::to_string(records::kSchemaVersion));
}

TEST_F(ADatabase, ThatOthersCouldHaveTouchedIsRefused) {
  ASSERT_TRUE(open());
  const std::string before = content("accounts.db");
  ASSERT_EQ(::chmod((path_ + "/accounts.db").c_str(), 0644), 0);
  const auto opened = open();
  ASSERT_FALSE(opened);
  EXPECT_EQ(opened.failure().kind, base::FailureKind::kRefused);
  EXPECT_THAT(opened.failure().message, HasSubstr("chmod 600"));
  EXPECT_EQ(content("accounts.db"), before);
}

TEST_F(ADatabase, ThatIsASymbolicLinkIsRefused) {
  const std::string outside = temporary_.write("outside", "", 0600);
  std::filesystem::create_symlink(outside, path_ + "/accounts.db");
  EXPECT_FALSE(open());
  EXPECT_EQ(support::contentOf(outside), "");
}

TEST_F(ADatabase, OfANewerVersionIsRefusedAndLeftAlone) {
  ASSERT_TRUE(open());
  change("PRAGMA user_version = " + std::to_string(records::kSchemaVersion + 1));
  const std::string before = content("accounts.db");
  const auto opened = open();
  ASSERT_FALSE(opened);
  EXPECT_EQ(opened.failure().kind, base::FailureKind::kRefused);
  EXPECT_THAT(opened.failure().message, HasSubstr("newer version"));
  EXPECT_EQ(content("accounts.db"), before);
  EXPECT_FALSE(exists("accounts.db.damaged-1"));
}

// What version 1 of the tables held: a whole account and one without a token, a grant, and a decision.
const std::string kOfVersion1 =
    "INSERT INTO accounts VALUES (1, 'half', 'type', 'h'), (2, 'whole', 'type', 'w');"
    "INSERT INTO credentials VALUES ('whole', NULL, x'00'), ('half', 'app', x'00');"
    "INSERT INTO authorizations VALUES ('type', 'app', 1, '[\"email\"]', '{\"app_id\":\"1\"}', 1700000000,"
    " x'34069a2d2fc7276a6e56229f075498e2');"
    "INSERT INTO access_log VALUES (1, 1700000000, 'type', 'app', 1, 1);";

TEST_F(ADatabase, OfAnOlderVersionKeepsWhatItHolds) {
  write("credentials.key", std::string(32, 'k'));
  write("accounts.db", "");
  {
    auto connection = support::valueOf(records::Connection::open(path_ + "/accounts.db"));
    support::succeed(records::migrate(connection, 0, 1));
    support::succeed(connection.execute(kOfVersion1));
  }
  directory_.reset();  // a directory has one user
  for (int start = 0; start < 2; ++start) {
    const support::StoredState state(path_);
    EXPECT_TRUE(state.log.lines().empty());
    const auto accounts = state.accounts->list();
    ASSERT_EQ(accounts.size(), 1U);
    EXPECT_EQ(accounts.at(0).username, "w");
    const auto record = state.records->find("type", "app");
    ASSERT_TRUE(record);
    EXPECT_TRUE(record->granted);
    EXPECT_TRUE(record->permissions == RVPermissionSet{"email"});
    EXPECT_EQ(record->evidence, clients::Evidence::kUnknown);
    EXPECT_EQ(support::valueOf(state.accessLog.newest(10)).size(), 1U);
    EXPECT_EQ(answer(*state.database, "SELECT count(*) FROM credentials"), "1");
  }
}

TEST_F(ADatabase, OfAnOlderVersionThatIsDamagedIsSetAsideAsItWas) {
  write("accounts.db", "");
  {
    auto connection = support::valueOf(records::Connection::open(path_ + "/accounts.db"));
    support::succeed(records::migrate(connection, 0, 1));
    support::succeed(connection.execute("CREATE TABLE another (x)"));
  }
  expectSetAside(content("accounts.db"));
}

TEST_F(ADatabase, ThatIsNoDatabaseIsSetAside) {
  write("accounts.db", "this is no database, and it never was one");
  expectSetAside("this is no database, and it never was one");
}

TEST_F(ADatabase, ThatWasEmptiedIsSetAside) {
  write("accounts.db", "");
  expectSetAside("");
}

TEST_F(ADatabase, WithOtherTablesIsSetAside) {
  ASSERT_TRUE(open());
  change("DROP TABLE access_log");
  expectSetAside(content("accounts.db"));
}

TEST_F(ADatabase, WithATriggerIsSetAside) {
  ASSERT_TRUE(open());
  change("CREATE TRIGGER t AFTER INSERT ON authorizations BEGIN UPDATE authorizations SET granted = 1; END");
  expectSetAside(content("accounts.db"));
}

TEST_F(ADatabase, WithoutAVersionIsSetAside) {
  ASSERT_TRUE(open());
  change("PRAGMA user_version = 0");
  expectSetAside(content("accounts.db"));
}

TEST_F(ADatabase, WithACredentialOfNoAccountIsSetAside) {
  ASSERT_TRUE(open());
  change("PRAGMA foreign_keys = OFF; INSERT INTO credentials VALUES ('nobody', NULL, x'00')");
  expectSetAside(content("accounts.db"));
}

TEST_F(ADatabase, ThatIsSetAsideLeavesNoJournalToItsSuccessor) {
  write("accounts.db", "no database");
  write("accounts.db-journal", "its journal");
  ASSERT_TRUE(open());
  EXPECT_FALSE(exists("accounts.db-journal"));
}

TEST_F(ADatabase, ThatIsDamagedAgainAndAgainIsKeptEachTime) {
  for (const std::string number : {"1", "2", "3"}) {
    write("accounts.db", "damage " + number);
    ASSERT_TRUE(open());
    EXPECT_EQ(content("accounts.db.damaged-" + number), "damage " + number);
  }
}

TEST_F(ADatabase, ThatIsNewIsNotMadeFromTheJournalOfAnotherThatIsGone) {
  write("accounts.db-journal", "what a killed daemon left behind");
  const auto database = support::valueOf(open());
  EXPECT_FALSE(exists("accounts.db-journal"));
  EXPECT_EQ(answer(*database, "SELECT count(*) FROM accounts"), "0");
}

TEST_F(ADatabase, ThatWasBegunAndNotFinishedIsBegunAnew) {
  write("accounts.db.new", "half of it");
  write("accounts.db.new-journal", "half of that");
  ASSERT_TRUE(open());
  EXPECT_FALSE(exists("accounts.db.new"));
  EXPECT_FALSE(exists("accounts.db.new-journal"));
  EXPECT_TRUE(log_.lines().empty());
}

TEST_F(ADatabase, KeepsNothingOfAWriteThatFails) {
  const auto database = support::valueOf(open());
  const char* insert = "INSERT INTO accounts (identifier, account_type, username) VALUES (?1, 't', 'u')";
  const auto failing = database->write([&](records::Connection& connection) -> base::Result<void> {
    support::succeed(connection.run(insert, std::string("one")));
    return base::Failure{base::FailureKind::kInvalid, "changed its mind"};
  });
  ASSERT_FALSE(failing);
  EXPECT_EQ(failing.failure().message, "changed its mind");
  EXPECT_THROW((void)database->write([&](records::Connection& connection) -> base::Result<void> {
    support::succeed(connection.run(insert, std::string("two")));
    throw std::bad_alloc();
  }),
               std::bad_alloc);
  EXPECT_EQ(answer(*database, "SELECT count(*) FROM accounts"), "0");
  EXPECT_TRUE(database->write(
      [&](records::Connection& connection) { return connection.run(insert, std::string("three")); }));
  EXPECT_EQ(answer(*database, "SELECT identifier FROM accounts"), "three");
}

TEST_F(ADatabase, KeepsEmptyTextsAndNothingApart) {
  const auto database = support::valueOf(open());
  using std::string_literals::operator""s;
  support::succeed(database->write([&](records::Connection& connection) {
    return connection.run("INSERT INTO access_log VALUES (1, 0, ?1, ?2, 0, 0, 0), (2, 0, ?3, ?4, 0, 0, 0)",
                          std::string_view(),
                          std::optional<std::string>(),
                          "a\0b\xff"s,
                          std::optional<std::string>(""));
  }));
  support::succeed(database->read([&](records::Connection& connection) -> base::Result<void> {
    auto statement = support::valueOf(
        connection.prepare("SELECT account_type, client_id FROM access_log ORDER BY number"));
    EXPECT_TRUE(support::valueOf(statement->step()));
    EXPECT_EQ(statement->optionalText(0), "");
    EXPECT_EQ(statement->optionalText(1), std::nullopt);
    EXPECT_TRUE(support::valueOf(statement->step()));
    EXPECT_EQ(statement->text(0), "a\0b\xff"s);
    EXPECT_EQ(statement->optionalText(1), "");
    EXPECT_FALSE(support::valueOf(statement->step()));
    return {};
  }));
}

TEST_F(ADatabase, NeverShowsAnythingOfTheFileInAProblem) {
  const auto database = support::valueOf(open());
  const auto failing = database->write([&](records::Connection& connection) {
    return connection.run("INSERT INTO accounts (identifier, account_type) VALUES (?1, ?1)",
                          std::string("a-secret-name"));
  });
  ASSERT_FALSE(failing);
  EXPECT_THAT(failing.failure().message, Not(HasSubstr("a-secret-name")));
}

}  // namespace
