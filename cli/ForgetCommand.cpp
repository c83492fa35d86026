// rvctl forget
#include <nlohmann/json.hpp>

#include "cli/Commands.h"

namespace cli {

ExitStatus forgetRefusal(Session& session, const std::string& clientID) {
  const auto forgotten = session.service.forgetRefusal(clientID);
  if (!forgotten) return session.output.failed(forgotten.failure());
  if (session.output.wantsJSON())
    session.output.print(Json::object({{"forgotten", clientID}}));
  else
    session.output.print(std::string("Refusal forgotten: the next request asks again.\n"));
  return ExitStatus::kDone;
}

}  // namespace cli
