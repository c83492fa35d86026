// rvctl log
#include <limits>
#include <nlohmann/json.hpp>

#include "cli/Commands.h"

namespace cli {

namespace {

bool isWanted(const Json& entry, const LogFilter& filter) {
  const long long time = entry.value("time", 0LL);
  if (filter.since && time < *filter.since) return false;
  if (filter.until && time > *filter.until) return false;
  return !filter.client || (entry.contains("client_id") && entry["client_id"] == *filter.client);
}

}  // namespace

ExitStatus showAccessLog(Session& session, const LogFilter& filter) {
  const bool isFiltered = filter.client || filter.since || filter.until;
  auto entries =
      session.service.accessLog(isFiltered ? std::numeric_limits<std::uint32_t>::max() : filter.limit);
  if (entries && isFiltered) {
    Json wanted = Json::array();
    for (Json& entry : *entries)
      if (wanted.size() < filter.limit && isWanted(entry, filter)) wanted.push_back(std::move(entry));
    *entries = std::move(wanted);
  }
  if (!entries) return session.output.failed(entries.failure());
  if (session.output.wantsJSON()) {
    session.output.print(Json::object({{"entries", *entries}}));
    return ExitStatus::kDone;
  }
  if (entries->empty()) {
    session.output.print(
        std::string(isFiltered ? "There is no such entry.\n" : "Nothing has been asked for yet.\n"));
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
