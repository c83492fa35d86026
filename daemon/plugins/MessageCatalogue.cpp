// The format, all numbers of 32 bits in one byte order:
//
//   magic 0x950412de, revision (major in the upper half), number of messages,
//   offset of the table of messages, offset of the table of translations, …
//
// A table has for each message the length and the offset of its text, which a NUL follows. A message's text
// is its context, the byte 4 and its untranslated words.
#include "daemon/plugins/MessageCatalogue.h"

#include <cstddef>
#include <cstdint>
#include <optional>

#include "base/Text.h"

namespace plugins {
namespace {

using base::Failure;
using base::FailureKind;

constexpr std::uint32_t kMagic = 0x950412de;
constexpr std::size_t kHeaderSize = 20;
constexpr std::size_t kTableEntrySize = 8;
constexpr std::uint32_t kGreatestMajorRevision = 1;
constexpr char kContextEnd = '\4';

class Bytes {
 public:
  explicit Bytes(std::string_view bytes)
      : bytes_(bytes) {}

  // Whether the bytes begin as a catalogue does, in either byte order.
  bool findByteOrder() {
    if (bytes_.size() < kHeaderSize) return false;
    isBigEndian_ = false;
    if (number(0) == kMagic) return true;
    isBigEndian_ = true;
    return number(0) == kMagic;
  }

  // Only within the bytes.
  std::uint32_t number(std::size_t at) const {
    std::uint32_t result = 0;
    for (std::size_t i = 0; i < 4; ++i) {
      const std::size_t shift = 8 * (isBigEndian_ ? 3 - i : i);
      result |= std::uint32_t{static_cast<unsigned char>(bytes_[at + i])} << shift;
    }
    return result;
  }

  bool holdsTable(std::size_t offset, std::size_t entries) const {
    return offset <= bytes_.size() && entries <= (bytes_.size() - offset) / kTableEntrySize;
  }

  // A text by its entry in a table. Absent where it reaches outside.
  std::optional<std::string_view> text(std::size_t entry) const {
    const std::size_t length = number(entry);
    const std::size_t offset = number(entry + 4);
    if (offset > bytes_.size() || length > bytes_.size() - offset) return std::nullopt;
    return bytes_.substr(offset, length);
  }

 private:
  const std::string_view bytes_;
  bool isBigEndian_ = false;
};

}  // namespace

base::Result<std::map<std::string, std::string, std::less<>>> readMessageCatalogue(std::string_view bytes) {
  Bytes catalogue(bytes);
  if (!catalogue.findByteOrder()) return Failure{FailureKind::kInvalid, "is no message catalogue"};
  if (catalogue.number(4) >> 16 > kGreatestMajorRevision)
    return Failure{FailureKind::kInvalid, "is a message catalogue of an unknown revision"};
  const std::size_t count = catalogue.number(8);
  const std::size_t messages = catalogue.number(12);
  const std::size_t translations = catalogue.number(16);
  const Failure truncated{FailureKind::kInvalid, "is a message catalogue that reaches beyond its end"};
  if (!catalogue.holdsTable(messages, count) || !catalogue.holdsTable(translations, count)) return truncated;

  std::map<std::string, std::string, std::less<>> result;
  for (std::size_t i = 0; i < count; ++i) {
    const auto message = catalogue.text(messages + i * kTableEntrySize);
    auto translation = catalogue.text(translations + i * kTableEntrySize);
    if (!message || !translation) return truncated;
    const std::size_t keyEnd = message->find(kContextEnd);
    // Plural forms stand one after the other, with a NUL between; the first stands for all of them.
    translation = translation->substr(0, translation->find('\0'));
    if (keyEnd == std::string_view::npos || translation->empty()) continue;
    if (!base::isUTF8(*message) || !base::isUTF8(*translation))
      return Failure{FailureKind::kInvalid, "is a message catalogue that is not UTF-8"};
    result.emplace(message->substr(0, keyEnd), *translation);
  }
  return result;
}

}  // namespace plugins
