// The terminal agent: shows the daemon's alerts on a screen and takes answers from typed lines.
#pragma once

#include "agents/terminal/Screen.h"
#include "base/Result.h"

namespace sdbus {
class IConnection;
}

namespace terminal {

// Registers with the daemon and shows its alerts until the input ends or `stop` becomes readable; it then
// unregisters, and an alert that is open is left unanswered for another agent. Stays when the daemon leaves
// the bus, and registers again with the next one. Uses the calling thread alone.
//
// connection: nobody else's while this runs, and without an event loop of its own. screen, input, stop:
// stay the caller's; stop is not read. Failures, for a person: the daemon does not run or does not take the
// agent, the bus is gone, the screen cannot be written to.
base::Result<void> serveAlerts(sdbus::IConnection& connection, Screen& screen, int input, int stop);

}  // namespace terminal
