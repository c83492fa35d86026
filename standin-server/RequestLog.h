// What the stand-in server was asked, one JSON object a line.
#pragma once

#include <fstream>
#include <mutex>
#include <string>

#include "standin-server/Exchanges.h"

namespace standin {

// Each line has the members "exchange", "method", "path", "parameters", "accept_language", "token" (its hash,
// null where none came), "status" and "issued" (the hash of the token in the answer, absent where there is
// none). Tokens that stand where they do not belong are replaced by their hashes too. Thread-safe.
class RequestLog {
 public:
  // Appends to the file. An empty path: nothing is logged. Throws std::runtime_error where the file cannot
  // be written.
  explicit RequestLog(const std::string& path);

  // Returns once the line has been handed to the system. status: 0 where the connection was dropped without
  // one.
  void write(const std::string& method,
             const std::string& path,
             const Question& question,
             const Answer& answer,
             const Exchanges& exchanges);

 private:
  std::mutex mutex_;
  std::ofstream file_;
};

}  // namespace standin
