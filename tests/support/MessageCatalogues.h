// Compiled translations for tests.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

namespace support {

// The bytes of a catalogue with these messages (context and untranslated words as one text) and their
// translations, laid out as msgfmt does.
inline std::string messageCatalogue(const std::map<std::string, std::string>& messages, bool isBigEndian) {
  const auto number = [isBigEndian](std::size_t value) {
    std::string bytes;
    for (int i = 0; i < 4; ++i)
      bytes += static_cast<char>(static_cast<std::uint32_t>(value) >> (8 * (isBigEndian ? 3 - i : i)));
    return bytes;
  };
  constexpr std::size_t kHeaderSize = 28;
  const std::size_t tableSize = 8 * messages.size();
  std::string texts;
  const auto entriesOf = [&](const std::vector<std::string>& list) {
    std::string table;
    for (const std::string& text : list) {
      table += number(text.size()) + number(kHeaderSize + 2 * tableSize + texts.size());
      texts += text + '\0';
    }
    return table;
  };
  std::vector<std::string> keys;
  std::vector<std::string> translations;
  for (const auto& [key, translation] : messages) {
    keys.push_back(key);
    translations.push_back(translation);
  }
  const std::string tables = entriesOf(keys) + entriesOf(translations);
  return number(0x950412de) + number(0) + number(messages.size()) + number(kHeaderSize) +
         number(kHeaderSize + tableSize) + number(0) + number(kHeaderSize + 2 * tableSize) + tables + texts;
}

}  // namespace support
