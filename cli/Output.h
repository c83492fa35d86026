// What rvctl prints.
#pragma once

#include <iosfwd>
#include <optional>
#include <string>
#include <vector>

#include "base/Result.h"
#include "cli/ExitStatus.h"
#include "cli/Json.h"

namespace cli {

// Lines under headings, each column as wide as its widest cell. The cells are shown with nothing hidden in
// them; the last line ends with a newline.
std::string tableOf(const std::vector<std::string>& headings,
                    const std::vector<std::vector<std::string>>& rows);

// A moment in the local time zone: "2024-05-01 12:30:00".
std::string timeText(long long secondsSince1970);

// A value on one line: a text as it is, everything else as JSON.
std::string valueText(const Json& value);

// A list's values on one line: "a, b"; `whenEmpty` where there is none.
std::string listText(const Json& list, const char* whenEmpty);

// Text, or one JSON document, to standard output; what went wrong to standard error.
class Output {
 public:
  // The streams outlive this object.
  Output(std::ostream& out, std::ostream& err)
      : out_(out),
        err_(err) {}

  void useJSON() { wantsJSON_ = true; }
  bool wantsJSON() const { return wantsJSON_; }

  // In pure ASCII, with everything else escaped.
  void print(const Json& document);
  void printLine(const Json& document);  // on one line
  // Text that is fit to be seen already.
  void print(const std::string& text);

  // Says what went wrong, and returns the status for it: kInvalid is wrong use of the command.
  ExitStatus failed(const base::Failure& failure);

  // Whether everything could be written.
  bool flush();

 private:
  std::ostream& out_;
  std::ostream& err_;
  bool wantsJSON_ = false;
};

}  // namespace cli
