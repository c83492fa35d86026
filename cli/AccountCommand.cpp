// rvctl account
#include <nlohmann/json.hpp>

#include "base/Text.h"
#include "cli/Commands.h"
#include "cli/ServerAnswer.h"
#include "cli/Token.h"

namespace cli {

ExitStatus addAccount(Session& session, const std::string& username, int tokenDescriptor) {
  const auto token = tokenFrom(tokenDescriptor);
  if (!token) return session.output.failed(token.failure());
  const auto accountID = session.service.addAccount(username, token->get());
  if (!accountID) return session.output.failed(accountID.failure());
  if (session.output.wantsJSON())
    session.output.print(Json::object({{"account_id", *accountID}}));
  else
    session.output.print("Added the account " + base::visible(*accountID) + ".\n");
  return ExitStatus::kDone;
}

ExitStatus listAccounts(Session& session) {
  const auto accounts = session.service.accounts();
  if (!accounts) return session.output.failed(accounts.failure());
  if (session.output.wantsJSON()) {
    session.output.print(Json::object({{"accounts", *accounts}}));
  } else if (accounts->empty()) {
    session.output.print(std::string("No account is set up.\n"));
  } else {
    std::vector<std::vector<std::string>> rows;
    for (const Json& account : *accounts)
      rows.push_back(
          {account.value("id", ""), account.value("account_type", ""), account.value("username", "")});
    session.output.print(tableOf({"ID", "TYPE", "USER NAME"}, rows));
  }
  return ExitStatus::kDone;
}

ExitStatus removeAccount(Session& session, const std::string& accountID) {
  ServerAnswer server(session.service, std::nullopt);
  const auto removed = session.service.removeAccount(accountID);
  if (!removed) return session.output.failed(removed.failure());
  const auto [word, text] = server.wait();
  if (session.output.wantsJSON())
    session.output.print(Json::object({{"removed", accountID}, {"server", word}}));
  else
    session.output.print("Removed the account " + base::visible(accountID) + " from this device.\n" + text +
                         "\n");
  return ExitStatus::kDone;
}

}  // namespace cli
