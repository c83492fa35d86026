// rvctl revoke
#include "cli/Decisions.h"

namespace cli {
namespace {

ExitStatus print(Session& session, const base::Result<Decision>& decision) {
  if (!decision) return session.output.failed(decision.failure());
  return printDecision(session.output, *decision, "succeeded", "Access revoked.", "Access not revoked.");
}

}  // namespace

ExitStatus revoke(Session& session, const std::string& clientID) {
  return print(session, session.service.revoke(clientID));
}

ExitStatus revokeAll(Session& session) {
  return print(session, session.service.revokeAll());
}

}  // namespace cli
