// The way to the user's session bus.
#pragma once

#include <memory>

#include "base/Result.h"

namespace sdbus {
class IConnection;
}

namespace cli {

// A connection without an event loop. The failure says what to do.
base::Result<std::unique_ptr<sdbus::IConnection>> connectToSessionBus();

}  // namespace cli
