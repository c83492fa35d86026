// The names under which the daemon is found, and those of the errors that it answers with.
#pragma once

#include "base/BusNames.h"

namespace bus {

using base::kAccessDenied;
using base::kAlreadyIdentified;
using base::kFailed;
using base::kInvalidArgs;
using base::kLimitsExceeded;
using base::kNoAccess;
using base::kObjectPath;
using base::kServiceName;
using base::kUnknownApplication;
using base::kUnsupportedAccountType;

}  // namespace bus
