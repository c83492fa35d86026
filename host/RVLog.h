// The daemon's log, and the record of access decisions.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/Values.h"

// Called from any thread. Never throws, never waits long.
class RVLogService {
 public:
  virtual ~RVLogService() = default;

  // Writes one line. level: see Constants.h. sourceFile, functionName, line: where the line comes from.
  // format and arguments: as RVStringTable::stringWithFormat. The values of dictionary members named
  // "access_token" are masked in what is written.
  virtual void RVLog(int level,
                     std::string_view facility,
                     std::string_view sourceFile,
                     std::string_view functionName,
                     int line,
                     std::string_view format,
                     const std::vector<std::optional<RVValue>>& arguments) = 0;
};

class RVDAccessLog {
 public:
  virtual ~RVDAccessLog() = default;

  // Keeps one access decision. clientID: absent where the client has none. requested: true for the
  // answer to an access request, false for a direct authorize or revoke. elapsed: seconds. Called on
  // the thread that decides; a failure is logged by the host.
  virtual void RVDLogAccessRequest(std::string_view accountTypeIdentifier,
                                   const std::optional<std::string>& clientID,
                                   bool granted,
                                   bool requested,
                                   double elapsed) = 0;
};
