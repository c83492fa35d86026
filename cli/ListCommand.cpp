// rvctl list
#include <nlohmann/json.hpp>

#include "cli/Commands.h"

namespace cli {
namespace {

std::string optionsText(const Json& options) {
  std::string line;
  for (const auto& [key, value] : options.items())
    line += (line.empty() ? "" : ", ") + key + "=" + valueText(value);
  return line.empty() ? "-" : line;
}

}  // namespace

ExitStatus listAuthorizations(Session& session) {
  const auto authorizations = session.service.authorizations();
  if (!authorizations) return session.output.failed(authorizations.failure());
  if (session.output.wantsJSON()) {
    session.output.print(Json::object({{"authorizations", *authorizations}}));
    return ExitStatus::kDone;
  }
  if (authorizations->empty()) {
    session.output.print(std::string("No application has been granted or refused access.\n"));
    return ExitStatus::kDone;
  }
  std::vector<std::vector<std::string>> rows;
  for (const Json& record : *authorizations)
    rows.push_back({record.value("client_id", ""),
                    record.value("name", ""),
                    record.value("granted", false) ? "granted" : "refused",
                    listText(record.value("permissions", Json::array()), "-"),
                    optionsText(record.value("options", Json::object())),
                    record.value("evidence", "-"),
                    timeText(record.value("changed", 0LL))});
  session.output.print(
      tableOf({"CLIENT", "NAME", "ACCESS", "PERMISSIONS", "OPTIONS", "EVIDENCE", "CHANGED"}, rows));
  return ExitStatus::kDone;
}

ExitStatus listPendingRevocations(Session& session) {
  const auto pending = session.service.pendingRevocations();
  if (!pending) return session.output.failed(pending.failure());
  if (session.output.wantsJSON()) {
    session.output.print(Json::object({{"pending", *pending}}));
    return ExitStatus::kDone;
  }
  if (pending->empty()) {
    session.output.print(std::string("The server has been told of everything.\n"));
    return ExitStatus::kDone;
  }
  std::vector<std::vector<std::string>> rows;
  for (const Json& owed : *pending)
    rows.push_back({listText(owed.value("client_ids", Json::array()), "-"),
                    owed.value("app_id", ""),
                    timeText(owed.value("since", 0LL)),
                    std::to_string(owed.value("attempts", 0LL)),
                    owed.value("failure", "-")});
  session.output.print(tableOf({"CLIENTS", "APP ID", "REVOKED", "ATTEMPTS", "LAST FAILURE"}, rows));
  return ExitStatus::kDone;
}

}  // namespace cli
