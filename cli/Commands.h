// The sub-commands of rvctl. Each asks the daemon, prints, and returns what rvctl ends with.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "cli/ExitStatus.h"
#include "cli/Output.h"
#include "cli/Service.h"

namespace cli {

struct Session {
  Service& service;
  Output& output;
};

// account. tokenDescriptor: where the token is read from.
ExitStatus addAccount(Session& session, const std::string& username, int tokenDescriptor);
ExitStatus listAccounts(Session& session);
ExitStatus removeAccount(Session& session, const std::string& accountID);

// request, access. as: the application that the program says it is; absent: none.
ExitStatus requestAccess(Session& session,
                         const std::optional<std::string>& as,
                         const RequestOptions& options);
// credentialDescriptor: where the credential is written to; absent: it is not asked for.
ExitStatus showAccess(Session& session,
                      const std::optional<std::string>& as,
                      std::optional<int> credentialDescriptor);

// list, authorize, revoke, forget, log
ExitStatus listAuthorizations(Session& session);
ExitStatus listPendingRevocations(Session& session);
ExitStatus authorize(Session& session, const std::string& clientID);
ExitStatus revoke(Session& session, const std::string& clientID);
ExitStatus revokeAll(Session& session);
ExitStatus forgetRefusal(Session& session, const std::string& clientID);
// The newest entries of those that the filter lets through.
struct LogFilter {
  std::uint32_t limit = 0;
  std::optional<std::string> client;
  std::optional<long long> since;  // seconds since 1970, both included
  std::optional<long long> until;
};
ExitStatus showAccessLog(Session& session, const LogFilter& filter);

// explain. Refused where the request would be refused at once.
ExitStatus explainAccess(Session& session, const std::string& clientID, const ExplainOptions& options);

// preference. valueText: JSON, or a text that is no JSON as it is.
ExitStatus getPreference(Session& session, const std::string& applicationID, const std::string& key);
ExitStatus setPreference(Session& session,
                         const std::string& applicationID,
                         const std::string& key,
                         const std::string& valueText);
ExitStatus resetPreference(Session& session, const std::string& applicationID, const std::string& key);

// agent. Runs until standard input ends, or SIGINT, SIGTERM or SIGHUP comes.
ExitStatus runAgent(Output& output);

}  // namespace cli
