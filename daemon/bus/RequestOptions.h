// The options of an access request, as they come over the bus.
#pragma once

#include <set>
#include <string_view>

#include "daemon/bus/Values.h"
#include "daemon/config/Settings.h"
#include "host/Values.h"

namespace bus {

// Reads an a{sv} (see readOptions) and leaves nothing in it but the keys that plug-ins know and `others`.
// Throws sdbus::Error (LimitsExceeded) where it has more permissions than the settings let, or a longer name.
RVDictionary readRequestOptions(sdbus::Message& message,
                                SizeLimit& limit,
                                const config::Settings& settings,
                                const std::set<std::string_view>& others = {});

}  // namespace bus
