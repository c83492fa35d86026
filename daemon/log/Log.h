// The daemon's log.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/RVLog.h"

namespace logging {

// One line of the log. Every text is one line of UTF-8 with nothing hidden in it.
struct Entry {
  int level;             // the journal's priority
  std::string facility;  // "daemon"
  std::string sourceFile;
  std::string functionName;
  int line;
  std::string message;
};

// The entry as one line, without its end: "error: message [file:line function]".
std::string lineOf(const Entry& entry);

// Where the lines go. Called from any thread.
class LogSink {
 public:
  virtual ~LogSink() = default;
  // Writes one line. What cannot be written is lost: there is nobody to tell.
  virtual void write(const Entry& entry) = 0;
};

// Writes to the system's journal: MESSAGE, PRIORITY, CODE_FILE, CODE_FUNC, CODE_LINE, SYSLOG_FACILITY and
// SYSLOG_IDENTIFIER.
class JournalSink final : public LogSink {
 public:
  explicit JournalSink(std::string identifier);
  void write(const Entry& entry) override;

  // The fields of an entry, as the journal takes them ("NAME=value").
  std::vector<std::string> fields(const Entry& entry) const;

 private:
  const std::string identifier_;
};

// Writes one line an entry to a file descriptor, in one piece, so that the lines of several threads do not
// mix. The descriptor stays the caller's and must outlive the sink.
class DescriptorSink final : public LogSink {
 public:
  explicit DescriptorSink(int descriptor);
  void write(const Entry& entry) override;

 private:
  const int descriptor_;
};

// Whether the descriptor is the stream to the journal that a service's JOURNAL_STREAM ("device:inode")
// names.
bool isJournalStream(std::string_view journalStream, int descriptor);

// The journal where standard error is connected to it, otherwise standard error. For main() alone: looks at
// the environment.
std::unique_ptr<LogSink> makeDefaultSink();

// Hands each line to the sink: the format filled, access tokens masked, control characters made visible so
// that no argument can forge a line, and a message of more than kMaximalMessage bytes cut. Nothing that
// goes wrong reaches the caller.
class Log final : public RVLogService {
 public:
  static constexpr std::size_t kMaximalMessage = 8 * 1024;

  // The sink must outlive the log.
  explicit Log(LogSink& sink);

  void RVLog(int level,
             std::string_view facility,
             std::string_view sourceFile,
             std::string_view functionName,
             int line,
             std::string_view format,
             const std::vector<std::optional<RVValue>>& arguments) override;

 private:
  LogSink& sink_;
};

// Where a line of the daemon's own comes from: as a default argument, the place of the call. (The standard
// library's class of this kind is not there for every compiler that builds the daemon.)
struct Place {
  const char* file;
  const char* function;
  int line;
  static Place ofCall(const char* file = __builtin_FILE(),
                      const char* function = __builtin_FUNCTION(),
                      int line = __builtin_LINE()) {
    return {file, function, line};
  }
};

// The daemon's own lines: facility "daemon", and the place of the call as their source.
void error(RVLogService& log,
           std::string_view format,
           const std::vector<std::optional<RVValue>>& arguments = {},
           const Place& place = Place::ofCall());
void notice(RVLogService& log,
            std::string_view format,
            const std::vector<std::optional<RVValue>>& arguments = {},
            const Place& place = Place::ofCall());
void debug(RVLogService& log,
           std::string_view format,
           const std::vector<std::optional<RVValue>>& arguments = {},
           const Place& place = Place::ofCall());

}  // namespace logging
