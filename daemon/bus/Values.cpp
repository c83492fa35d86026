#include "daemon/bus/Values.h"

#include <sdbus-c++/sdbus-c++.h>

#include <cstdint>
#include <limits>
#include <utility>

#include "daemon/bus/Names.h"

namespace bus {
namespace {

constexpr int kDeepestLevel = 16;

// Walks over the values of a message.
class ValueReader {
 public:
  ValueReader(sdbus::Message& message, SizeLimit& limit)
      : message_(message),
        limit_(limit) {}

  void count(std::size_t bytes) {
    if (bytes > limit_.bytesLeft) throw sdbus::Error(kLimitsExceeded, "The message is too large");
    limit_.bytesLeft -= bytes;
  }

  // level: that of a container found here.
  RVValue read(int level) {
    switch (const char type = peek(); type) {
      case 'y':
        return integer<std::uint8_t>();
      case 'n':
        return integer<std::int16_t>();
      case 'q':
        return integer<std::uint16_t>();
      case 'i':
        return integer<std::int32_t>();
      case 'u':
        return integer<std::uint32_t>();
      case 'x':
        return integer<std::int64_t>();
      case 't':
        return integer<std::uint64_t>();
      case 'b':
        return basic<bool>(4);
      case 'd':
        return basic<double>(8);
      case 's':
      case 'o':
      case 'g':
        return text(type);
      case 'v':
        return variant(level);
      case 'a':
        return contents_.front() == '{' ? dictionary(level) : array(level);
      case 'r':
        return structure(level);
      default:
        throw sdbus::Error(kInvalidArgs, "A value of this type cannot be handed on");
    }
  }

  // Passes over one value of any type.
  void skip() {
    switch (const char type = peek(); type) {
      case 'y':
        return skipBasic<std::uint8_t>();
      case 'n':
        return skipBasic<std::int16_t>();
      case 'q':
        return skipBasic<std::uint16_t>();
      case 'i':
        return skipBasic<std::int32_t>();
      case 'u':
        return skipBasic<std::uint32_t>();
      case 'x':
        return skipBasic<std::int64_t>();
      case 't':
        return skipBasic<std::uint64_t>();
      case 'b':
        return skipBasic<bool>();
      case 'd':
        return skipBasic<double>();
      case 'h':
        return skipBasic<sdbus::UnixFd>();
      case 's':
      case 'o':
      case 'g':
        static_cast<void>(text(type));
        return;
      default:
        break;
    }
    const std::string contents = contents_;
    switch (type_) {
      case 'v':
        message_.enterVariant(contents);
        break;
      case 'a':
        message_.enterContainer(contents);
        break;
      case 'e':
        message_.enterDictEntry(contents);
        break;
      default:
        message_.enterStruct(contents);
        break;
    }
    count(4);
    const char entered = type_;
    while (!isAtEnd()) skip();
    leave(entered);
  }

  std::string text(char type) {
    std::string result;
    if (type == 'o') {
      sdbus::ObjectPath path;
      message_ >> path;
      result = std::move(path);
    } else if (type == 'g') {
      sdbus::Signature signature;
      message_ >> signature;
      result = std::move(signature);
    } else {
      char* start = nullptr;
      message_ >> start;
      const std::string_view view(start);
      count(view.size() + 5);
      return std::string(view);
    }
    count(result.size() + 5);
    return result;
  }

  bool isAtEnd() { return peek() == '\0'; }

 private:
  // The type of what comes next, NUL where the container ends. A container's contents are then in
  // contents_.
  char peek() {
    std::string type;
    message_.peekType(type, contents_);
    type_ = type.empty() ? '\0' : type.front();
    return type_;
  }

  void enter(int level) {
    if (level > kDeepestLevel) throw sdbus::Error(kInvalidArgs, "A value is nested too deeply");
    count(4);
  }

  void leave(char type) {
    message_.clearFlags();
    switch (type) {
      case 'v':
        message_.exitVariant();
        break;
      case 'a':
        message_.exitContainer();
        break;
      case 'e':
        message_.exitDictEntry();
        break;
      default:
        message_.exitStruct();
        break;
    }
  }

  template <typename T>
  T basic(std::size_t bytes) {
    T value{};
    message_ >> value;
    count(bytes);
    return value;
  }

  template <typename T>
  RVValue integer() {
    const T value = basic<T>(sizeof(T));
    if constexpr (std::is_same_v<T, std::uint64_t>) {
      if (value > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()))
        throw sdbus::Error(kInvalidArgs, "An integer is too large");
    }
    return static_cast<std::int64_t>(value);
  }

  template <typename T>
  void skipBasic() {
    static_cast<void>(basic<T>(4));
  }

  RVValue variant(int level) {
    message_.enterVariant(std::string(contents_));
    count(4);
    RVValue value = read(level);
    leave('v');
    return value;
  }

  RVValue array(int level) {
    enter(level);
    message_.enterContainer(std::string(contents_));
    RVArray elements;
    while (!isAtEnd()) elements.push_back(read(level + 1));
    leave('a');
    return elements;
  }

  RVValue structure(int level) {
    enter(level);
    message_.enterStruct(std::string(contents_));
    RVArray members;
    while (!isAtEnd()) members.push_back(read(level + 1));
    leave('r');
    return members;
  }

  RVValue dictionary(int level) {
    enter(level);
    const std::string contents = contents_;
    if (contents[1] != 's') throw sdbus::Error(kInvalidArgs, "The keys of a dictionary must be strings");
    message_.enterContainer(contents);
    RVDictionary entries;
    while (!isAtEnd()) {
      message_.enterDictEntry(std::string(contents_));
      std::string key = text('s');
      entries.try_emplace(std::move(key), read(level + 1));
      leave('e');
    }
    leave('a');
    return entries;
  }

  sdbus::Message& message_;
  SizeLimit& limit_;
  char type_ = '\0';
  std::string contents_;
};

// How many bytes the character has that begins at the front, 0 where there is none. As the bus counts:
// shortest forms only, no surrogates, nothing beyond U+10FFFF.
std::size_t characterLength(std::string_view text) {
  const auto byte = [&](std::size_t i) { return i < text.size() ? static_cast<unsigned char>(text[i]) : 0U; };
  const auto isTail = [&](std::size_t i) { return (byte(i) & 0xC0U) == 0x80U; };
  const unsigned first = byte(0);
  if (first == 0) return 0;
  if (first < 0x80) return 1;
  if (first >= 0xC2 && first < 0xE0) return isTail(1) ? 2 : 0;
  if (first >= 0xE0 && first < 0xF0) {
    const bool isShortest = first != 0xE0 || byte(1) >= 0xA0;
    const bool isSurrogate = first == 0xED && byte(1) >= 0xA0;
    return isTail(1) && isTail(2) && isShortest && !isSurrogate ? 3 : 0;
  }
  if (first >= 0xF0 && first < 0xF5) {
    const bool isInRange = (first != 0xF0 || byte(1) >= 0x90) && (first != 0xF4 || byte(1) < 0x90);
    return isTail(1) && isTail(2) && isTail(3) && isInRange ? 4 : 0;
  }
  return 0;
}

}  // namespace

std::string readString(sdbus::Message& message, SizeLimit& limit) {
  return ValueReader(message, limit).text('s');
}

bool readBoolean(sdbus::Message& message, SizeLimit& limit) {
  ValueReader(message, limit).count(4);
  bool value = false;
  message >> value;
  return value;
}

RVValue readVariant(sdbus::Message& message, SizeLimit& limit) {
  return ValueReader(message, limit).read(1);
}

RVDictionary readOptions(sdbus::Message& message, SizeLimit& limit, const std::set<std::string_view>& keys) {
  ValueReader reader(message, limit);
  RVDictionary options;
  message.enterContainer("{sv}");
  while (!reader.isAtEnd()) {
    message.enterDictEntry("sv");
    std::string key = reader.text('s');
    if (keys.contains(key))
      options.try_emplace(std::move(key), reader.read(1));
    else
      reader.skip();
    message.exitDictEntry();
  }
  message.clearFlags();
  message.exitContainer();
  return options;
}

std::string busText(std::string_view text) {
  std::string result;
  result.reserve(text.size());
  while (!text.empty()) {
    const std::size_t length = characterLength(text);
    result += length > 0 ? text.substr(0, length) : std::string_view("\xEF\xBF\xBD");
    text.remove_prefix(length > 0 ? length : 1);
  }
  return result;
}

void writeVariant(sdbus::Message& message, const RVValue& value) {
  const auto write = [&](const char* signature, const auto& content) {
    message.openVariant(signature);
    message << content;
    message.closeVariant();
  };
  if (const auto* text = value.string()) return write("s", busText(*text));
  if (const auto* integer = value.integer()) return write("x", *integer);
  if (const auto* real = value.real()) return write("d", *real);
  if (const auto* boolean = value.boolean()) return write("b", *boolean);
  if (const auto* dictionary = value.dictionary()) {
    message.openVariant("a{sv}");
    writeDictionary(message, *dictionary);
    message.closeVariant();
    return;
  }
  message.openVariant("av");  // a list; null, which the bus does not know, is the empty one
  message.openContainer("v");
  if (const auto* array = value.array())
    for (const RVValue& element : *array) writeVariant(message, element);
  message.closeContainer();
  message.closeVariant();
}

void writeDictionary(sdbus::Message& message, const RVDictionary& dictionary) {
  message.openContainer("{sv}");
  for (const auto& [key, value] : dictionary) {
    message.openDictEntry("sv");
    message << busText(key);
    writeVariant(message, value);
    message.closeDictEntry();
  }
  message.closeContainer();
}

void writeNames(sdbus::Message& message, const RVPermissionSet& names) {
  message.openContainer("s");
  for (const std::string& name : names) message << busText(name);
  message.closeContainer();
}

}  // namespace bus
