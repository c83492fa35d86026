// rvctl revoke
#include "cli/Decisions.h"
#include "cli/ServerAnswer.h"

namespace cli {
namespace {

// server: begun before the revocation.
ExitStatus print(Session& session, const base::Result<Decision>& decision, ServerAnswer& server) {
  if (!decision) return session.output.failed(decision.failure());
  constexpr const char* kNotDone = "Access not revoked.";
  if (!decision->granted) return printDecision(session.output, *decision, "succeeded", "", kNotDone);
  const auto [word, text] = server.wait();
  return printDecision(session.output,
                       *decision,
                       "succeeded",
                       "Access revoked on this device.\n" + text,
                       kNotDone,
                       {{"server", word}});
}

}  // namespace

ExitStatus revoke(Session& session, const std::string& clientID) {
  ServerAnswer server(session.service, clientID);
  return print(session, session.service.revoke(clientID), server);
}

ExitStatus revokeAll(Session& session) {
  ServerAnswer server(session.service, std::nullopt);
  return print(session, session.service.revokeAll(), server);
}

}  // namespace cli
