// Reading a token that somebody hands over by a file descriptor.
#pragma once

#include <cstddef>
#include <functional>
#include <optional>

#include "base/Result.h"
#include "host/RVDKeychainManager.h"

namespace bus {

inline constexpr std::size_t kLongestToken = 64 * 1024;  // bytes, the newline included

// Reads to the end of the descriptor and drops one trailing newline. Waits for what has not been written
// yet, and asks now and then whether to go on. kInvalid for an empty, an overlong and an unreadable token,
// and for one with control characters.
base::Result<RVSecret> readToken(int descriptor, const std::function<bool()>& mayGoOn);

}  // namespace bus
