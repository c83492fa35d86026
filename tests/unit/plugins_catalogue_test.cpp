#include <gtest/gtest.h>

#include <random>

#include "daemon/plugins/MessageCatalogue.h"
#include "tests/support/MessageCatalogues.h"

namespace {

using plugins::readMessageCatalogue;
using support::messageCatalogue;
using Texts = std::map<std::string, std::string, std::less<>>;

const std::map<std::string, std::string> kMessages{
    {"", "Content-Type: text/plain; charset=UTF-8\n"},
    {"ALLOW\4Allow", "Erlauben"},
    {"DENY\4Deny", "Nicht erlauben"},
    {"EMPTY\4Empty", ""},
    {"WORDS\4\xc3\xbc", "\xc3\xbc %1$@"},
    {"no context", "kein Kontext"},
};
const Texts kTexts{{"ALLOW", "Erlauben"}, {"DENY", "Nicht erlauben"}, {"WORDS", "\xc3\xbc %1$@"}};

class AMessageCatalogue : public testing::TestWithParam<bool> {
 protected:
  const std::string bytes_ = messageCatalogue(kMessages, GetParam());
};

INSTANTIATE_TEST_SUITE_P(OfEachByteOrder, AMessageCatalogue, testing::Bool());

TEST_P(AMessageCatalogue, HasItsTranslationsByTheirContexts) {
  const auto texts = readMessageCatalogue(bytes_);
  ASSERT_TRUE(texts) << texts.failure().message;
  EXPECT_EQ(*texts, kTexts);
}

TEST_P(AMessageCatalogue, TakesTheFirstOfPluralForms) {
  const auto texts = readMessageCatalogue(
      messageCatalogue({{std::string("K\4one\0many", 10), std::string("eins\0viele", 10)}}, GetParam()));
  ASSERT_TRUE(texts);
  EXPECT_EQ(*texts, (Texts{{"K", "eins"}}));
}

TEST_P(AMessageCatalogue, ThatIsCutAnywhereIsRefusedOrWholeInWhatItHas) {
  for (std::size_t size = 0; size < bytes_.size(); ++size) {
    // A copy of its own, so that a byte read beyond its end is noticed.
    const std::vector<char> cut(bytes_.begin(), bytes_.begin() + static_cast<std::ptrdiff_t>(size));
    const auto texts = readMessageCatalogue({cut.data(), cut.size()});
    // The NUL behind the last text is the one byte that nothing needs.
    if (size + 1 < bytes_.size()) {
      EXPECT_FALSE(texts) << size;
    } else {
      ASSERT_TRUE(texts);
      EXPECT_EQ(*texts, kTexts);
    }
  }
}

TEST_P(AMessageCatalogue, WithAnyByteChangedIsReadOrRefusedWithoutHarm) {
  for (std::size_t at = 0; at < bytes_.size(); ++at) {
    for (const char value : {'\0', '\1', '\4', '\x7f', '\x80', '\xff'}) {
      std::vector<char> changed(bytes_.begin(), bytes_.end());
      changed[at] = value;
      const auto texts = readMessageCatalogue({changed.data(), changed.size()});
      if (texts) {
        EXPECT_LE(texts->size(), kMessages.size());
      }
    }
  }
}

TEST_P(AMessageCatalogue, OfAnotherRevisionIsRefused) {
  std::string bytes = bytes_;
  bytes[GetParam() ? 5 : 6] = 2;
  EXPECT_FALSE(readMessageCatalogue(bytes));
}

TEST_P(AMessageCatalogue, ThatIsNotUTF8IsRefused) {
  EXPECT_FALSE(readMessageCatalogue(messageCatalogue({{"K\4k", "\xfc"}}, GetParam())));
  EXPECT_FALSE(readMessageCatalogue(messageCatalogue({{"\xfc\4k", "x"}}, GetParam())));
}

TEST(RandomBytes, AreNoMessageCatalogue) {
  const auto seed = std::random_device{}();
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937 random(seed);
  for (int round = 0; round < 20000; ++round) {
    std::vector<char> bytes(random() % 200);
    for (char& byte : bytes) byte = static_cast<char>(random() % 7 == 0 ? random() : random() % 64);
    if (bytes.size() >= 4 && round % 2 == 0) {
      const std::string magic = messageCatalogue({}, round % 4 == 0).substr(0, 4);
      std::copy(magic.begin(), magic.end(), bytes.begin());
    }
    const auto texts = readMessageCatalogue({bytes.data(), bytes.size()});
    if (texts) {
      EXPECT_LE(texts->size(), bytes.size() / 8);
    }
  }
}

}  // namespace
