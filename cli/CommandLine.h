// The command line of rvctl.
#pragma once

#include "cli/Commands.h"

namespace cli {

// Reads the command line, runs its sub-command and returns what rvctl ends with. Help goes to the output
// stream; what is wrong with the command line goes to standard error, without repeating what was typed, for
// it could be a secret in the wrong place. Throws nothing.
ExitStatus run(int argc, const char* const* argv, Session& session);

}  // namespace cli
