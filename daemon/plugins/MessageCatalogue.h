// Compiled translations: the files that msgfmt makes.
#pragma once

#include <functional>
#include <map>
#include <string>
#include <string_view>

#include "base/Result.h"

namespace plugins {

// Reads a catalogue of either byte order: for each message its context (the key) and its translation.
// Messages without a context and without a translation are left out. Anything that reaches outside the
// bytes, is no catalogue or is not UTF-8 makes the whole of it unreadable (kInvalid).
base::Result<std::map<std::string, std::string, std::less<>>> readMessageCatalogue(std::string_view bytes);

}  // namespace plugins
