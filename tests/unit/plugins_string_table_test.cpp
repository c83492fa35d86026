#include <gtest/gtest.h>

#include <thread>

#include "daemon/plugins/StringTable.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/MessageCatalogues.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using plugins::StringTable;
using support::messageCatalogue;

class AStringTable : public testing::Test {
 protected:
  AStringTable() {
    put("Localizable/en.mo", {{"A\4", "a in English"}, {"B\4", "b in English"}, {"C\4", "c in English"}});
    put("Localizable/de.mo", {{"A\4", "a auf Deutsch"}, {"B\4", "b auf Deutsch"}});
    put("Localizable/de_AT.mo", {{"A\4", "a in Österreich"}});
    put("Other/en.mo", {{"A\4", "another table's a"}});
  }
  void put(const std::string& file, const std::map<std::string, std::string>& messages) {
    resources_.write(file, messageCatalogue(messages, false));
  }
  std::optional<std::string> lookUp(const std::vector<std::string>& languages,
                                    std::string_view key,
                                    std::string_view value = "",
                                    std::string_view table = "Localizable") {
    return StringTable(resources_.path(), languages, log_).textForKey(key, value, table);
  }

  support::TemporaryDirectory resources_;
  fakes::FakeLog log_;
};

TEST_F(AStringTable, AsksEachLanguageOfTheChainAndThenEnglish) {
  const std::vector<std::string> chain{"de_AT", "de"};
  EXPECT_EQ(lookUp(chain, "A"), "a in Österreich");
  EXPECT_EQ(lookUp(chain, "B"), "b auf Deutsch");
  EXPECT_EQ(lookUp(chain, "C"), "c in English");
  EXPECT_EQ(lookUp({}, "A"), "a in English");
  EXPECT_EQ(lookUp({"fr"}, "A"), "a in English");
  EXPECT_EQ(lookUp({"en", "de"}, "A"), "a in English");
  EXPECT_TRUE(log_.lines().empty());
}

TEST_F(AStringTable, HasTheDefaultOrTheKeyForWhatItDoesNotHave) {
  EXPECT_EQ(lookUp({}, "D"), "D");
  EXPECT_EQ(lookUp({}, "D", "default"), "default");
  EXPECT_EQ(lookUp({}, "a"), "a");
  EXPECT_EQ(lookUp({}, ""), "");
  EXPECT_EQ(lookUp({}, "A", "", "None"), "A");
  EXPECT_EQ(lookUp({}, "A", "default", "../resources/Localizable"), "default");
}

TEST_F(AStringTable, KeepsItsTablesApart) {
  EXPECT_EQ(lookUp({}, "A", "", "Other"), "another table's a");
  EXPECT_EQ(lookUp({}, "B", "", "Other"), "B");
}

TEST_F(AStringTable, IsLeftWithoutABrokenFileAndSaysSo) {
  resources_.write("Localizable/de.mo", "no catalogue");
  EXPECT_EQ(lookUp({"de"}, "A"), "a in English");
  ASSERT_EQ(log_.lines().size(), 1u);
  EXPECT_EQ(
      log_.texts()[0],
      "A string table is left out: " + resources_.path("Localizable/de.mo") + ": is no message catalogue.");
  EXPECT_EQ(log_.lines()[0].level, kRVLogLevelError);
}

TEST_F(AStringTable, MayHaveNoFilesAtAll) {
  EXPECT_EQ(StringTable(resources_.path("none"), {}, log_).textForKey("A", "", "Localizable"), "A");
  EXPECT_TRUE(log_.lines().empty());
}

TEST_F(AStringTable, DoesNotChangeOnceItIsMade) {
  StringTable table(resources_.path(), {}, log_);
  put("Localizable/en.mo", {{"A\4", "changed"}});
  EXPECT_EQ(table.textForKey("A", "", "Localizable"), "a in English");
}

TEST_F(AStringTable, ServesManyThreads) {
  StringTable table(resources_.path(), {"de"}, log_);
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i)
    threads.emplace_back([&table] {
      for (int round = 0; round < 1000; ++round) {
        EXPECT_EQ(table.textForKey("A", "", "Localizable"), "a auf Deutsch");
        EXPECT_EQ(table.stringWithFormat("%2$@ %1$@", {"x", "y"}), "y x");
      }
    });
  for (std::thread& thread : threads) thread.join();
}

}  // namespace
