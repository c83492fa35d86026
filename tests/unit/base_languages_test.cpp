#include <gtest/gtest.h>

#include "base/Languages.h"

namespace {

using Chain = std::vector<std::string>;
using base::languageChain;

TEST(TheLanguageChain, GoesFromTheCountryToTheLanguage) {
  EXPECT_EQ(languageChain({.lang = "de_AT.UTF-8"}), (Chain{"de_AT", "de"}));
  EXPECT_EQ(languageChain({.lang = "fr"}), (Chain{"fr"}));
  EXPECT_EQ(languageChain({.lang = "ca_ES.UTF-8@valencia"}),
            (Chain{"ca_ES@valencia", "ca_ES", "ca@valencia", "ca"}));
}

TEST(TheLanguageChain, TakesTheFirstLocaleThatIsSet) {
  EXPECT_EQ(languageChain({.lcAll = "it", .lcMessages = "fr", .lang = "de"}), (Chain{"it"}));
  EXPECT_EQ(languageChain({.lcMessages = "fr", .lang = "de"}), (Chain{"fr"}));
}

TEST(TheLanguageChain, PutsTheListOfLanguagesFirst) {
  EXPECT_EQ(languageChain({.language = "pt_BR:de::pt", .lang = "fr_FR.UTF-8"}),
            (Chain{"pt_BR", "pt", "de", "fr_FR", "fr"}));
  EXPECT_EQ(languageChain({.language = "de", .lang = "C.UTF-8"}), (Chain{"de"}));
}

TEST(TheLanguageChain, IsEmptyWhereUntranslatedTextsAreAskedFor) {
  EXPECT_EQ(languageChain({}), Chain{});
  EXPECT_EQ(languageChain({.language = "de", .lang = "C"}), Chain{});
  EXPECT_EQ(languageChain({.language = "de", .lcAll = "POSIX", .lang = "de"}), Chain{});
  EXPECT_EQ(languageChain({.lang = "C.UTF-8"}), Chain{});
}

TEST(TheLanguageChain, HoldsNoPaths) {
  EXPECT_EQ(languageChain({.language = "../../etc:/tmp/x:de", .lang = "a/b"}), (Chain{"de"}));
}

TEST(TheLanguageChain, OfOneLanguageTakesALocaleAndATag) {
  EXPECT_EQ(base::chainOfLanguage("de"), (Chain{"de"}));
  EXPECT_EQ(base::chainOfLanguage("pt-BR"), (Chain{"pt_BR", "pt"}));
  EXPECT_EQ(base::chainOfLanguage("sr_RS.UTF-8@latin"), (Chain{"sr_RS@latin", "sr_RS", "sr@latin", "sr"}));
  for (const char* none : {"", "C", "POSIX", "../etc", "d e", "de\n"})
    EXPECT_EQ(base::chainOfLanguage(none), Chain{}) << none;
}

}  // namespace
