#include "cli/SessionBus.h"

#include <sdbus-c++/sdbus-c++.h>

#include <utility>

namespace cli {

base::Result<std::unique_ptr<sdbus::IConnection>> connectToSessionBus() {
  try {
    return sdbus::createSessionBusConnection();
  } catch (const sdbus::Error&) {
    return base::Failure{base::FailureKind::kFailed,
                         "There is no session bus here. Run rvctl within the user's session, or give the bus "
                         "in DBUS_SESSION_BUS_ADDRESS"};
  }
}

}  // namespace cli
