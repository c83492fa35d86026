// Which languages the user reads, best first.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace base {

// The values of the environment's variables LANGUAGE, LC_ALL, LC_MESSAGES and LANG; empty where one is not
// set.
struct LanguageVariables {
  std::string language = {};
  std::string lcAll = {};
  std::string lcMessages = {};
  std::string lang = {};
};

// The user's languages as names of translations: "de_AT.UTF-8@euro" gives de_AT@euro, de_AT, de@euro and
// de. LANGUAGE is a list and goes before the others, unless the locale is "C" or "POSIX" or none, which
// asks for untranslated texts: the chain is then empty. No language is named twice; a name that is no
// locale's (a path, say) is left out.
std::vector<std::string> languageChain(const LanguageVariables& variables);

// The chain of one language, given as a locale or a tag ("de", "de_AT.UTF-8", "pt-BR"). Empty for what names
// none.
std::vector<std::string> chainOfLanguage(std::string_view language);

}  // namespace base
