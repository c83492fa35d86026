#include "cli/Output.h"

#include <uniwidth.h>

#include <algorithm>
#include <array>
#include <ctime>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/Text.h"

namespace cli {
namespace {

// In places on a terminal.
std::size_t widthOf(const std::string& text) {
  const auto* bytes = reinterpret_cast<const std::uint8_t*>(text.data());
  return static_cast<std::size_t>(std::max(0, u8_width(bytes, text.size(), "UTF-8")));
}

// Never throws for what is no UTF-8, and holds nothing that a terminal could take for a command.
std::string asciiText(const Json& document, int indent) {
  return document.dump(indent, ' ', true, Json::error_handler_t::replace);
}

std::string lineOf(const std::vector<std::string>& cells, const std::vector<std::size_t>& widths) {
  std::string line;
  for (std::size_t column = 0; column < cells.size(); ++column) {
    line += cells[column];
    if (column + 1 < cells.size()) line.append(widths[column] - widthOf(cells[column]) + 2, ' ');
  }
  return line.substr(0, line.find_last_not_of(' ') + 1) + "\n";
}

}  // namespace

std::string tableOf(const std::vector<std::string>& headings,
                    const std::vector<std::vector<std::string>>& rows) {
  std::vector<std::vector<std::string>> lines{headings};
  for (const auto& row : rows) {
    auto& cells = lines.emplace_back();
    for (const std::string& cell : row) cells.push_back(base::visible(cell));
  }
  std::vector<std::size_t> widths(headings.size());
  for (const auto& cells : lines)
    for (std::size_t column = 0; column < cells.size(); ++column)
      widths[column] = std::max(widths[column], widthOf(cells[column]));
  std::string text;
  for (const auto& cells : lines) text += lineOf(cells, widths);
  return text;
}

std::string timeText(long long secondsSince1970) {
  const std::time_t moment = secondsSince1970;
  std::tm parts{};
  std::array<char, 64> text{};
  if (::localtime_r(&moment, &parts) == nullptr ||
      std::strftime(text.data(), text.size(), "%Y-%m-%d %H:%M:%S", &parts) == 0)
    return std::to_string(secondsSince1970);
  return text.data();
}

std::string valueText(const Json& value) {
  return value.is_string() ? base::visible(value.get<std::string>()) : asciiText(value, -1);
}

std::string listText(const Json& list, const char* whenEmpty) {
  std::string line;
  for (const Json& value : list) line += (line.empty() ? "" : ", ") + valueText(value);
  return line.empty() ? whenEmpty : line;
}

void Output::print(const Json& document) {
  out_ << asciiText(document, 2) << '\n';
}

void Output::printLine(const Json& document) {
  out_ << asciiText(document, -1) << '\n';
}

void Output::print(const std::string& text) {
  out_ << text;
}

ExitStatus Output::failed(const base::Failure& failure) {
  if (wantsJSON_) print(Json::object({{"failure", failure.message}}));
  err_ << "rvctl: " << base::visible(failure.message) << ".\n";
  switch (failure.kind) {
    case base::FailureKind::kRefused:
      return ExitStatus::kRefused;
    case base::FailureKind::kInvalid:
      return ExitStatus::kWrongUse;
    default:
      return ExitStatus::kImpossible;
  }
}

bool Output::flush() {
  out_.flush();
  return out_.good();
}

}  // namespace cli
