// The words for the user, and formats.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/Values.h"

// The string tables of a plug-in's resource bundle, in the user's language. Called from any thread.
class RVStringTable {
 public:
  virtual ~RVStringTable() = default;

  // The table's text for the key. Where no table of the language chain has the key: `value`, or where
  // that is empty, the key itself. Absent only when a host cannot look anything up at all.
  virtual std::optional<std::string> textForKey(std::string_view key,
                                                std::string_view value,
                                                std::string_view table) = 0;

  // Fills a format: "%@" and "%d" take the arguments in order, "%1$@" names one by its position, "%%" is a
  // percent sign. An argument is put in as it is and never scanned for placeholders; an absent one
  // shows as kRVAbsentValueText, and so does a placeholder without an argument.
  virtual std::string stringWithFormat(std::string_view format,
                                       const std::vector<std::optional<RVValue>>& arguments) const = 0;
};
