// Files of sections and "key=value" lines: settings, entitlements, desktop entries.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/Result.h"

namespace config {

// kSettings: strict. A line that is neither blank, a comment ("#" or ";"), a section nor an entry is a
// fault, and so are a repeated section, a repeated key, and a text that is not UTF-8. Blanks around keys
// and values do not count.
// kDesktopEntry: entries may be localized ("Name[de]=…"), values have the escapes \s \n \t \r \\, comments
// begin with "#". Lines that mean nothing are skipped; of what is repeated the first counts.
enum class IniFlavour { kSettings, kDesktopEntry };

struct IniEntry {
  std::string key;
  std::string locale;  // empty where the key has none
  std::string value;
  int line = 0;  // counted from 1
};

struct IniSection {
  std::string name;
  int line = 0;
  std::vector<IniEntry> entries;

  // The value of the key without a locale, a null pointer where there is none. Lives as long as the section.
  const std::string* value(std::string_view key) const;

  // The value in the first of the languages that the key has, otherwise without a locale.
  const std::string* value(std::string_view key, const std::vector<std::string>& languages) const;
};

struct IniFile {
  std::vector<IniSection> sections;  // in the file's order

  // A null pointer where there is none.
  const IniSection* section(std::string_view name) const;
};

// `name` is what the failure's message calls the file ("name:line: what is wrong").
base::Result<IniFile> parseIni(std::string_view text, const std::string& name, IniFlavour flavour);

}  // namespace config
