// Decisions of the daemon, printed.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "cli/Commands.h"

namespace cli {

// Prints a decision, as {key: granted, "error": …} or in words: `done` where it was granted, otherwise
// `notDone` and the reason. others: members for the former. Returns kImpossible where the server could not be
// asked, which is no refusal.
ExitStatus printDecision(Output& output,
                         const Decision& decision,
                         const char* key,
                         const std::string& done,
                         const char* notDone,
                         const std::vector<std::pair<std::string, std::string>>& others = {});

}  // namespace cli
