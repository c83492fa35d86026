#include "daemon/plugins/StringTable.h"

#include <algorithm>
#include <filesystem>
#include <system_error>

#include "base/File.h"
#include "daemon/log/Format.h"
#include "daemon/log/Log.h"
#include "daemon/plugins/MessageCatalogue.h"

namespace plugins {
namespace {

constexpr std::size_t kMaximalCatalogueSize = 4 * 1024 * 1024;
constexpr const char* kLastLanguage = "en";

std::vector<std::string> subdirectories(const std::string& directory) {
  std::vector<std::string> names;
  std::error_code error;
  for (std::filesystem::directory_iterator entry(directory, error), end; !error && entry != end;
       entry.increment(error))
    if (std::error_code ignored; entry->is_directory(ignored)) names.push_back(entry->path().filename());
  return names;
}

}  // namespace

StringTable::StringTable(const std::string& resources,
                         const std::vector<std::string>& languages,
                         RVLogService& log) {
  std::vector<std::string> chain = languages;
  if (std::find(chain.begin(), chain.end(), kLastLanguage) == chain.end()) chain.emplace_back(kLastLanguage);
  for (const std::string& table : subdirectories(resources)) {
    Texts& texts = tables_[table];
    for (const std::string& language : chain) {
      const std::string path = resources + "/" + table + "/" + language + ".mo";
      const auto bytes = base::readFile(path, kMaximalCatalogueSize);
      if (!bytes && bytes.failure().kind == base::FailureKind::kNotFound) continue;
      auto catalogue = bytes ? readMessageCatalogue(*bytes) : bytes.failure();
      if (!catalogue) {
        const std::string reason = (bytes ? path + ": " : "") + catalogue.failure().message;
        logging::error(log, "A string table is left out: %@.", {reason});
        continue;
      }
      languages_.insert(language);
      texts.merge(*catalogue);  // what a better language has stays
    }
  }
}

std::optional<std::string> StringTable::textForKey(std::string_view key,
                                                   std::string_view value,
                                                   std::string_view table) {
  const std::string fallback(value.empty() ? key : value);
  const auto texts = tables_.find(table);
  if (texts == tables_.end()) return fallback;
  const auto text = texts->second.find(key);
  return text != texts->second.end() ? text->second : fallback;
}

std::string StringTable::stringWithFormat(std::string_view format,
                                          const std::vector<std::optional<RVValue>>& arguments) const {
  return logging::stringWithFormat(format, arguments);
}

}  // namespace plugins
