// Moments that are typed.
#pragma once

#include <string>

#include "base/Result.h"

namespace cli {

// The seconds since 1970 from the first to the last one that is meant.
struct Period {
  long long first = 0;
  long long last = 0;
};

// An ISO 8601 date, which means the whole day, or a date and a time of day to the minute or the second, with
// 'T' or a space between: "2024-05-01", "2024-05-01T12:30", "2024-05-01 12:30:00". In the local time zone,
// where a time does not end with 'Z' or an offset ("+02:00"). kInvalid for everything else.
base::Result<Period> periodFrom(const std::string& text);

}  // namespace cli
