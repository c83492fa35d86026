// rvctl authorize
#include "cli/Decisions.h"

namespace cli {

ExitStatus authorize(Session& session, const std::string& clientID) {
  const auto decision = session.service.authorize(clientID);
  if (!decision) return session.output.failed(decision.failure());
  return printDecision(session.output, *decision, "succeeded", "Access granted.", "Access not granted.");
}

}  // namespace cli
