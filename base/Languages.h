// Which languages the user reads, best first.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace base {

// The values of the environment's variables of these names; empty where one is not set.
struct LanguageVariables {
  std::string LANGUAGE;
  std::string LC_ALL;
  std::string LC_MESSAGES;
  std::string LANG;
};

// The user's languages as names of translations: "de_AT.UTF-8@euro" gives de_AT@euro, de_AT, de@euro and
// de. LANGUAGE is a list and goes before the others, unless the locale is "C" or "POSIX" or none, which
// asks for untranslated texts: the chain is then empty. No language is named twice; a name that is no
// locale's (a path, say) is left out.
std::vector<std::string> languageChain(const LanguageVariables& variables);

}  // namespace base
