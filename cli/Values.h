// Values between the bus and JSON.
#pragma once

#include <map>
#include <string>

#include "base/Result.h"
#include "cli/Json.h"

namespace sdbus {
class Variant;
}

namespace cli {

// Integers, reals, booleans, strings, and arrays and dictionaries of these; what the daemon never sends
// shows as null.
Json jsonFrom(const sdbus::Variant& value);
Json jsonFrom(const std::map<std::string, sdbus::Variant>& dictionary);

// kInvalid for what the bus cannot carry or the daemon cannot keep: null, integers of more than 64 bits with
// sign, a NUL in a string, more than 16 levels.
base::Result<sdbus::Variant> variantFrom(const Json& value);

}  // namespace cli
