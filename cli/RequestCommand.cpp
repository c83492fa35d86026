// rvctl request
#include "cli/Decisions.h"

namespace cli {

ExitStatus requestAccess(Session& session,
                         const std::optional<std::string>& as,
                         const RequestOptions& options) {
  if (as) {
    const auto registered = session.service.registerAs(*as);
    if (!registered) return session.output.failed(registered.failure());
  }
  const auto decision = session.service.requestAccess(options);
  if (!decision) return session.output.failed(decision.failure());
  return printDecision(session.output, *decision, "granted", "Access granted.", "Access not granted.");
}

}  // namespace cli
