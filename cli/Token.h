// A token on its way from whoever has it to the daemon.
#pragma once

#include "base/File.h"
#include "base/Result.h"

namespace cli {

// Reads a token to the end of the descriptor, into a file in memory that the daemon can be handed: its
// descriptor. From a terminal one line is read without being shown, after a question on standard error.
// The token is never in this process's strings. kInvalid: the descriptor cannot be read, or what comes is
// empty or longer than 64 KiB.
base::Result<base::FileDescriptor> tokenFrom(int descriptor);

}  // namespace cli
