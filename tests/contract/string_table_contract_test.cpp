// What every string table must do, held against the daemon's own and the one that the tests use in its place.
#include <gtest/gtest.h>

#include <functional>
#include <memory>

#include "daemon/plugins/StringTable.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/MessageCatalogues.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

constexpr std::string_view kTable = "Localizable";

using Texts = std::map<std::string, std::string>;

std::unique_ptr<RVStringTable> makeFake(const Texts& texts) {
  auto table = std::make_unique<fakes::FakeStringTable>();
  for (const auto& [key, text] : texts) table->put(key, text);
  return table;
}

std::unique_ptr<RVStringTable> makeReal(const Texts& texts) {
  const support::TemporaryDirectory resources;
  fakes::FakeLog log;
  Texts messages;
  for (const auto& [key, text] : texts) messages[key + "\4words"] = text;
  resources.write(std::string(kTable) + "/en.mo", support::messageCatalogue(messages, false));
  return std::make_unique<plugins::StringTable>(resources.path(), std::vector<std::string>{}, log);
}

struct Kind {
  std::string name;
  std::function<std::unique_ptr<RVStringTable>(const Texts&)> make;
};

class EveryStringTable : public testing::TestWithParam<Kind> {
 protected:
  std::unique_ptr<RVStringTable> table_ =
      GetParam().make({{"ALLOW", "Erlauben"}, {"FORMAT", "%2$@ %1$@"}, {"ÜBER %@", "über"}});
};

INSTANTIATE_TEST_SUITE_P(OfBothKinds,
                         EveryStringTable,
                         testing::Values(Kind{"Fake", makeFake}, Kind{"Daemon", makeReal}),
                         [](const auto& kind) { return kind.param.name; });

TEST_P(EveryStringTable, HasItsTextsByTheirKeys) {
  EXPECT_EQ(table_->textForKey("ALLOW", "", kTable), "Erlauben");
  EXPECT_EQ(table_->textForKey("ALLOW", "default", kTable), "Erlauben");
  EXPECT_EQ(table_->textForKey("ÜBER %@", "", kTable), "über");
}

TEST_P(EveryStringTable, ShowsAMissingEntryAsTheDefaultOrAsItsKey) {
  EXPECT_EQ(table_->textForKey("NONE", "default", kTable), "default");
  EXPECT_EQ(table_->textForKey("NONE", "", kTable), "NONE");
  EXPECT_EQ(table_->textForKey("allow", "", kTable), "allow");
  EXPECT_EQ(table_->textForKey("", "", kTable), "");
}

TEST_P(EveryStringTable, FillsFormatsWithoutScanningTheArguments) {
  const auto format = table_->textForKey("FORMAT", "", kTable);
  ASSERT_TRUE(format);
  EXPECT_EQ(table_->stringWithFormat(*format, {"%2$@", "b"}), "b %2$@");
  EXPECT_EQ(table_->stringWithFormat("%@ %d%% %@ %@", {"a", 5, std::nullopt}), "a 5% (null) (null)");
}

}  // namespace
