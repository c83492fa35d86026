#include "tests/fakes/FakeTexts.h"

#include <utility>

#include "daemon/log/Format.h"

namespace fakes {

FakeStringTable::FakeStringTable()
    : Fake("stringTable") {
}

std::optional<std::string> FakeStringTable::textForKey(std::string_view key,
                                                       std::string_view value,
                                                       std::string_view table) {
  begin("textForKey");
  const std::lock_guard lock(mutex_);
  lookups_.push_back({std::string(key), std::string(value), std::string(table)});
  if (unavailable_) return std::nullopt;
  const auto found = texts_.find(key);
  if (found != texts_.end()) return found->second;
  return std::string(value.empty() ? key : value);
}

std::string FakeStringTable::stringWithFormat(std::string_view format,
                                              const std::vector<std::optional<RVValue>>& arguments) const {
  begin("stringWithFormat");
  return logging::stringWithFormat(format, arguments);
}

void FakeStringTable::put(std::string_view key, std::string_view text) {
  const std::lock_guard lock(mutex_);
  texts_.insert_or_assign(std::string(key), std::string(text));
}

void FakeStringTable::setUnavailable(bool unavailable) {
  const std::lock_guard lock(mutex_);
  unavailable_ = unavailable;
}

std::vector<FakeStringTable::Lookup> FakeStringTable::lookups() const {
  const std::lock_guard lock(mutex_);
  return lookups_;
}

FakeLog::FakeLog()
    : Fake("log") {
}

void FakeLog::RVLog(int level,
                    std::string_view facility,
                    std::string_view sourceFile,
                    std::string_view functionName,
                    int line,
                    std::string_view format,
                    const std::vector<std::optional<RVValue>>& arguments) {
  begin("RVLog");
  const std::lock_guard lock(mutex_);
  if (silent_) return;
  std::vector<std::optional<RVValue>> shown;
  for (const auto& argument : arguments)
    shown.push_back(argument ? std::optional(logging::masked(*argument)) : std::nullopt);
  lines_.push_back({level,
                    std::string(facility),
                    std::string(sourceFile),
                    std::string(functionName),
                    line,
                    std::string(format),
                    arguments,
                    logging::stringWithFormat(format, shown)});
}

void FakeLog::setSilent(bool silent) {
  const std::lock_guard lock(mutex_);
  silent_ = silent;
}

std::vector<FakeLog::Line> FakeLog::lines() const {
  const std::lock_guard lock(mutex_);
  return lines_;
}

std::vector<std::string> FakeLog::texts() const {
  std::vector<std::string> texts;
  for (const Line& line : lines()) texts.push_back(line.text);
  return texts;
}

void FakeLog::clear() {
  const std::lock_guard lock(mutex_);
  lines_.clear();
}

FakeAccessLog::FakeAccessLog()
    : Fake("accessLog") {
}

void FakeAccessLog::RVDLogAccessRequest(std::string_view accountTypeIdentifier,
                                        const std::optional<std::string>& clientID,
                                        bool granted,
                                        bool requested,
                                        double elapsed) {
  begin("RVDLogAccessRequest");
  const std::lock_guard lock(mutex_);
  entries_.push_back({std::string(accountTypeIdentifier), clientID, granted, requested, elapsed});
}

std::vector<FakeAccessLog::Entry> FakeAccessLog::entries() const {
  const std::lock_guard lock(mutex_);
  return entries_;
}

}  // namespace fakes
