// Values as the JSON text in which they are stored.
#pragma once

#include <string>
#include <string_view>

#include "base/Result.h"
#include "host/Values.h"

namespace state {

// The value as JSON, always the same text for the same value. Every string comes back from
// valueFromText byte for byte, also one that is not UTF-8 (docs/storage.md says how it is written). A real
// number that is not finite becomes null.
std::string textFromValue(const RVValue& value);

// Reads what textFromValue made; kDamaged where it is no such text. The message does not quote it. Integers
// and reals stay what they were.
base::Result<RVValue> valueFromText(std::string_view text);

}  // namespace state
