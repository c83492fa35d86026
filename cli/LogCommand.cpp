// rvctl log
#include <nlohmann/json.hpp>

#include "cli/Commands.h"

namespace cli {

ExitStatus showAccessLog(Session& session, std::uint32_t limit) {
  const auto entries = session.service.accessLog(limit);
  if (!entries) return session.output.failed(entries.failure());
  if (session.output.wantsJSON()) {
    session.output.print(Json::object({{"entries", *entries}}));
    return ExitStatus::kDone;
  }
  if (entries->empty()) {
    session.output.print(std::string("Nothing has been asked for yet.\n"));
    return ExitStatus::kDone;
  }
  std::vector<std::vector<std::string>> rows;
  for (const Json& entry : *entries)
    rows.push_back({timeText(entry.value("time", 0LL)),
                    entry.value("granted", false) ? "granted" : "not granted",
                    entry.value("requested", false) ? "request" : "direct",
                    entry.value("client_id", "-"),
                    entry.value("evidence", "-"),
                    entry.value("account_type", "")});
  session.output.print(tableOf({"TIME", "RESULT", "HOW", "CLIENT", "EVIDENCE", "ACCOUNT TYPE"}, rows));
  return ExitStatus::kDone;
}

}  // namespace cli
