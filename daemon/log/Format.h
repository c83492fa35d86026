// Texts made from formats and values, for the log and for the user.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/Values.h"

namespace logging {

// Fills a format as RVStringTable::stringWithFormat describes. "%1$d" is read like "%1$@". What is no
// placeholder ("%x", "%0$@", a lone percent sign at the end) is left as it stands. Called from any thread.
std::string stringWithFormat(std::string_view format, const std::vector<std::optional<RVValue>>& arguments);

// The value as text: a string is itself, null is kRVAbsentValueText, an array `(1, "b")`, a dictionary
// `{"key" = value; …}` in byte order of its keys. Strings inside a container are quoted, so that none can
// pass for more than one member. The same value always gives the same text.
std::string describe(const RVValue& value);

// The value with "<masked>" in place of the value of every dictionary member named "access_token", at any
// depth.
RVValue masked(const RVValue& value);

}  // namespace logging
