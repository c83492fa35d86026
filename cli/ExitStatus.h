// What rvctl ends with.
#pragma once

namespace cli {

enum class ExitStatus {
  kDone = 0,        // granted or done
  kRefused = 1,     // asked for access and not granted
  kWrongUse = 2,    // the command line makes no sense
  kImpossible = 3,  // it could not be done
};

}  // namespace cli
