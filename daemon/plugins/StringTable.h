// The string tables of one bundle, in the user's language.
#pragma once

#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "host/RVLog.h"
#include "host/RVStringTable.h"

namespace plugins {

// Reads "<resources>/<table>/<language>.mo" for every language of the chain and for English, which is the
// last one asked. A file that is not there is passed over, a broken one is left out with a line in the log.
// Immutable once it is made; does not look at the process's locale.
class StringTable final : public RVStringTable {
 public:
  // languages: see base::languageChain.
  StringTable(const std::string& resources, const std::vector<std::string>& languages, RVLogService& log);

  std::optional<std::string> textForKey(std::string_view key,
                                        std::string_view value,
                                        std::string_view table) override;
  std::string stringWithFormat(std::string_view format,
                               const std::vector<std::optional<RVValue>>& arguments) const override;

  // Whether any table has texts in the language, which is one of the chain or English.
  bool hasLanguage(const std::string& language) const { return languages_.contains(language); }

 private:
  using Texts = std::map<std::string, std::string, std::less<>>;
  std::set<std::string> languages_;
  std::map<std::string, Texts, std::less<>> tables_;  // each key with its text in the best language
};

}  // namespace plugins
