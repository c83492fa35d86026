// Values on their way between the bus and the rest of the daemon.
#pragma once

#include <cstddef>
#include <set>
#include <string>
#include <string_view>

#include "host/Values.h"

namespace sdbus {
class Message;
}

namespace bus {

// What of a message's size limit is left, in bytes of its body.
struct SizeLimit {
  std::size_t bytesLeft;
};

// All read on from where the message stands, and throw sdbus::Error: InvalidArgs for what no value can
// hold (the comment of Accounts1 lists it), LimitsExceeded as soon as more was read than the limit lets.

std::string readString(sdbus::Message& message, SizeLimit& limit);
bool readBoolean(sdbus::Message& message, SizeLimit& limit);

// The content of a variant.
RVValue readVariant(sdbus::Message& message, SizeLimit& limit);

// An a{sv}. Keys other than these are passed over: their values are counted, and not looked at. The first
// of several entries of one key counts.
RVDictionary readOptions(sdbus::Message& message, SizeLimit& limit, const std::set<std::string_view>& keys);

// A text as the bus can carry it: what is no UTF-8, and NUL, is replaced by U+FFFD.
std::string busText(std::string_view text);

// Write a variant, an a{sv} and an as.
void writeVariant(sdbus::Message& message, const RVValue& value);
void writeDictionary(sdbus::Message& message, const RVDictionary& dictionary);
void writeNames(sdbus::Message& message, const RVPermissionSet& names);

}  // namespace bus
