#include "daemon/config/IniFile.h"

#include <algorithm>
#include <set>
#include <utility>

#include "base/Text.h"

namespace config {
namespace {

using base::Failure;
using base::FailureKind;

std::string_view trimmed(std::string_view text) {
  constexpr std::string_view kBlanks = " \t\r";
  const std::size_t begin = text.find_first_not_of(kBlanks);
  if (begin == std::string_view::npos) return {};
  return text.substr(begin, text.find_last_not_of(kBlanks) - begin + 1);
}

std::string unescaped(std::string_view value) {
  std::string result;
  for (std::size_t i = 0; i < value.size(); ++i) {
    constexpr std::string_view kLetters = "sntr\\";
    constexpr std::string_view kMeanings = " \n\t\r\\";
    const std::size_t letter =
        value[i] == '\\' && i + 1 < value.size() ? kLetters.find(value[i + 1]) : std::string_view::npos;
    result += letter == std::string_view::npos ? value[i] : kMeanings[letter];
    if (letter != std::string_view::npos) ++i;
  }
  return result;
}

class Parser {
 public:
  explicit Parser(IniFlavour flavour)
      : isStrict_(flavour == IniFlavour::kSettings) {}

  // What is wrong with the line; nothing where nothing is.
  std::optional<std::string> takeLine(std::string_view line) {
    ++line_;
    line = trimmed(line);
    if (line.empty() || line.front() == '#' || (isStrict_ && line.front() == ';')) return std::nullopt;
    if (line.front() == '[') return takeSection(line);
    return takeEntry(line);
  }

  int line() const { return line_; }
  IniFile& file() { return file_; }

 private:
  std::optional<std::string> fault(std::string text) const {
    return isStrict_ ? std::optional(std::move(text)) : std::nullopt;
  }

  std::optional<std::string> takeSection(std::string_view line) {
    // What follows a section that cannot be taken must not count as part of the one before it.
    current_ = nullptr;
    const std::string name(line.substr(1, line.size() - 1 - (line.back() == ']' ? 1 : 0)));
    if (line.back() != ']' || line.size() < 3) return fault("a section is written [name]");
    if (!sectionsSeen_.insert(name).second) return fault("section [" + name + "] stands there twice");
    file_.sections.push_back({name, line_, {}});
    current_ = &file_.sections.back();
    keysSeen_.clear();
    return std::nullopt;
  }

  std::optional<std::string> takeEntry(std::string_view line) {
    const std::size_t equals = line.find('=');
    if (equals == std::string_view::npos || equals == 0) return fault("a line is written key=value");
    const std::string_view value = trimmed(line.substr(equals + 1));
    IniEntry entry{std::string(trimmed(line.substr(0, equals))), "", std::string(value), line_};
    if (!isStrict_) {
      splitLocale(entry);
      entry.value = unescaped(value);
    }
    if (current_ == nullptr) return fault("key \"" + entry.key + "\" stands in no section");
    if (!keysSeen_.emplace(entry.key, entry.locale).second)
      return fault("key \"" + entry.key + "\" stands there twice");
    current_->entries.push_back(std::move(entry));
    return std::nullopt;
  }

  static void splitLocale(IniEntry& entry) {
    const std::size_t bracket = entry.key.find('[');
    if (bracket == std::string::npos || entry.key.back() != ']') return;
    entry.locale = entry.key.substr(bracket + 1, entry.key.size() - bracket - 2);
    entry.key.resize(bracket);
  }

  const bool isStrict_;
  int line_ = 0;
  IniFile file_;
  IniSection* current_ = nullptr;  // the last of file_.sections, or none
  std::set<std::string> sectionsSeen_;
  std::set<std::pair<std::string, std::string>> keysSeen_;  // of the current section, with their locales
};

}  // namespace

const std::string* IniSection::value(std::string_view key) const {
  return value(key, {});
}

const std::string* IniSection::value(std::string_view key, const std::vector<std::string>& languages) const {
  const auto find = [this, key](const std::string& locale) -> const std::string* {
    for (const IniEntry& entry : entries)
      if (entry.key == key && entry.locale == locale) return &entry.value;
    return nullptr;
  };
  for (const std::string& language : languages)
    if (const std::string* text = find(language)) return text;
  return find("");
}

const IniSection* IniFile::section(std::string_view name) const {
  for (const IniSection& section : sections)
    if (section.name == name) return &section;
  return nullptr;
}

base::Result<IniFile> parseIni(std::string_view text, const std::string& name, IniFlavour flavour) {
  if (flavour == IniFlavour::kSettings && (!base::isUTF8(text) || text.find('\0') != std::string_view::npos))
    return Failure{FailureKind::kInvalid, name + ": is no UTF-8 text"};
  Parser parser(flavour);
  while (!text.empty()) {
    const std::size_t end = std::min(text.find('\n'), text.size());
    if (const auto fault = parser.takeLine(text.substr(0, end)))
      return Failure{FailureKind::kInvalid, name + ":" + std::to_string(parser.line()) + ": " + *fault};
    text.remove_prefix(std::min(end + 1, text.size()));
  }
  return std::move(parser.file());
}

}  // namespace config
