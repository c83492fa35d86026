// Decisions of the daemon, printed.
#pragma once

#include <string>

#include "cli/Commands.h"

namespace cli {

// Prints a decision, as {key: granted, "error": …} or in words: `done` where it was granted, otherwise
// `notDone` and the reason. Returns kImpossible where the server could not be asked, which is no refusal.
ExitStatus printDecision(Output& output,
                         const Decision& decision,
                         const char* key,
                         const char* done,
                         const char* notDone);

}  // namespace cli
