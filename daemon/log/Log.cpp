#include "daemon/log/Log.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <utility>

#include "base/Text.h"
#include "daemon/log/Format.h"

// The lines carry the places that the callers name; the journal's macros would put this file there.
#define SD_JOURNAL_SUPPRESS_LOCATION
#include <systemd/sd-journal.h>

namespace logging {
namespace {

constexpr std::string_view kIdentifier = "rvd";
constexpr std::string_view kDaemonFacilityNumber = "3";  // syslog's number of the facility "daemon"
constexpr std::size_t kMaximalPlace = 512;               // bytes of a file's or a function's name

std::string_view levelText(int level) {
  if (level <= kRVLogLevelError) return "error";
  if (level <= kRVLogLevelNotice) return "notice";
  return "debug";
}

std::vector<std::optional<RVValue>> maskedArguments(const std::vector<std::optional<RVValue>>& arguments) {
  std::vector<std::optional<RVValue>> result;
  result.reserve(arguments.size());
  for (const auto& argument : arguments)
    result.push_back(argument ? std::optional(masked(*argument)) : std::nullopt);
  return result;
}

void logLine(RVLogService& log,
             int level,
             std::string_view format,
             const std::vector<std::optional<RVValue>>& arguments,
             const Place& place) {
  log.RVLog(level, kRVLogFacilityDaemon, place.file, place.function, place.line, format, arguments);
}

}  // namespace

std::string lineOf(const Entry& entry) {
  return std::string(levelText(entry.level)) + ": " + entry.message + " [" + entry.sourceFile + ":" +
         std::to_string(entry.line) + " " + entry.functionName + "]";
}

JournalSink::JournalSink(std::string identifier)
    : identifier_(std::move(identifier)) {
}

std::vector<std::string> JournalSink::fields(const Entry& entry) const {
  std::vector<std::string> result{
      "MESSAGE=" + entry.message,
      "PRIORITY=" + std::to_string(entry.level),
      "CODE_FILE=" + entry.sourceFile,
      "CODE_FUNC=" + entry.functionName,
      "CODE_LINE=" + std::to_string(entry.line),
      "SYSLOG_IDENTIFIER=" + identifier_,
  };
  if (entry.facility == kRVLogFacilityDaemon)
    result.push_back("SYSLOG_FACILITY=" + std::string(kDaemonFacilityNumber));
  return result;
}

void JournalSink::write(const Entry& entry) {
  std::vector<std::string> texts = fields(entry);
  std::vector<iovec> pieces;
  for (std::string& text : texts) pieces.push_back({text.data(), text.size()});
  sd_journal_sendv(pieces.data(), static_cast<int>(pieces.size()));
}

DescriptorSink::DescriptorSink(int descriptor)
    : descriptor_(descriptor) {
}

void DescriptorSink::write(const Entry& entry) {
  const std::string text = lineOf(entry) + "\n";
  std::string_view rest = text;
  while (!rest.empty()) {
    const ssize_t written = ::write(descriptor_, rest.data(), rest.size());
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return;
    rest.remove_prefix(static_cast<std::size_t>(written));
  }
}

bool isJournalStream(std::string_view journalStream, int descriptor) {
  struct stat status {};
  if (::fstat(descriptor, &status) != 0) return false;
  return journalStream == std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino);
}

std::unique_ptr<LogSink> makeDefaultSink() {
  const char* journalStream = std::getenv("JOURNAL_STREAM");
  if (journalStream != nullptr && isJournalStream(journalStream, STDERR_FILENO))
    return std::make_unique<JournalSink>(std::string(kIdentifier));
  return std::make_unique<DescriptorSink>(STDERR_FILENO);
}

Log::Log(LogSink& sink)
    : sink_(sink) {
}

void Log::RVLog(int level,
                std::string_view facility,
                std::string_view sourceFile,
                std::string_view functionName,
                int line,
                std::string_view format,
                const std::vector<std::optional<RVValue>>& arguments) {
  try {
    const std::string message = stringWithFormat(format, maskedArguments(arguments));
    sink_.write({level,
                 base::shortened(base::visible(facility), kMaximalPlace),
                 base::shortened(base::visible(sourceFile), kMaximalPlace),
                 base::shortened(base::visible(functionName), kMaximalPlace),
                 line,
                 base::shortened(base::visible(message), kMaximalMessage)});
  } catch (...) {  // A line that is lost, for want of memory for example, must not stop what is logged about.
  }
}

void error(RVLogService& log,
           std::string_view format,
           const std::vector<std::optional<RVValue>>& arguments,
           const Place& place) {
  logLine(log, kRVLogLevelError, format, arguments, place);
}

void notice(RVLogService& log,
            std::string_view format,
            const std::vector<std::optional<RVValue>>& arguments,
            const Place& place) {
  logLine(log, kRVLogLevelNotice, format, arguments, place);
}

void debug(RVLogService& log,
           std::string_view format,
           const std::vector<std::optional<RVValue>>& arguments,
           const Place& place) {
  logLine(log, kRVLogLevelDebug, format, arguments, place);
}

}  // namespace logging
