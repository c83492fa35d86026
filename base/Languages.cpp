#include "base/Languages.h"

#include <algorithm>

namespace base {
namespace {

bool isUntranslated(std::string_view locale) {
  return locale.empty() || locale == "C" || locale == "POSIX";
}

bool isLocaleCharacter(char character) {
  return (character >= 'a' && character <= 'z') || (character >= 'A' && character <= 'Z') ||
         (character >= '0' && character <= '9') || character == '_' || character == '-' || character == '@';
}

void append(std::vector<std::string>& chain, const std::string& name) {
  const bool isName = !name.empty() && std::all_of(name.begin(), name.end(), isLocaleCharacter);
  if (isName && std::find(chain.begin(), chain.end(), name) == chain.end()) chain.push_back(name);
}

// language[_country][.encoding][@modifier], from the most special name to the most general one.
void appendLocale(std::vector<std::string>& chain, std::string_view locale) {
  const std::string modifier(locale.substr(std::min(locale.find('@'), locale.size())));
  locale = locale.substr(0, locale.find('@'));
  const std::string withCountry(locale.substr(0, locale.find('.')));
  const std::string language = withCountry.substr(0, withCountry.find('_'));
  if (isUntranslated(withCountry)) return;
  append(chain, withCountry + modifier);
  append(chain, withCountry);
  append(chain, language + modifier);
  append(chain, language);
}

}  // namespace

std::vector<std::string> languageChain(const LanguageVariables& variables) {
  const std::string& locale = !variables.lcAll.empty()        ? variables.lcAll
                              : !variables.lcMessages.empty() ? variables.lcMessages
                                                              : variables.lang;
  std::vector<std::string> chain;
  if (isUntranslated(locale)) return chain;
  std::string_view list = variables.language;
  while (!list.empty()) {
    const std::size_t colon = std::min(list.find(':'), list.size());
    appendLocale(chain, list.substr(0, colon));
    list.remove_prefix(std::min(colon + 1, list.size()));
  }
  appendLocale(chain, locale);
  return chain;
}

std::vector<std::string> chainOfLanguage(std::string_view language) {
  std::string locale(language);
  std::replace(locale.begin(), locale.end(), '-', '_');
  std::vector<std::string> chain;
  appendLocale(chain, locale);
  return chain;
}

}  // namespace base
