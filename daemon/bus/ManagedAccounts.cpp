#include <sdbus-c++/sdbus-c++.h>

#include <utility>

#include "daemon/bus/ManagementService.h"
#include "daemon/bus/Names.h"
#include "daemon/bus/Token.h"
#include "daemon/bus/Values.h"
#include "daemon/log/Log.h"

namespace bus {

void ManagementService::addAccount(SharedCall call) {
  std::string accountType;
  std::string username;
  sdbus::UnixFd token;
  call->message() >> accountType >> username >> token;
  pluginForAccountType(parts_, accountType);
  // A request of its own, because the token may be long in coming: it ends when its caller leaves.
  auto work = [this, call, accountType, username, token](const RVDAccessCompletion& completion) {
    dispatcher_.guarded(*call, [&] { addAccountWithToken(*call, accountType, username, token.get()); });
    completion(true, std::nullopt);
  };
  parts_.requests.submitAlone(
      {call->sender(), "", {}, {}, {}, {}},
      {call->sender(), [call](const auto&) { call->fail(kFailed, "The account was not added"); }},
      parts_.noLimits,
      std::move(work));
}

void ManagementService::addAccountWithToken(Call& call,
                                            const std::string& accountType,
                                            const std::string& username,
                                            int descriptor) {
  const auto request = requests::RequestContext::current();
  auto token = [&] {
    const auto waiting = request->beginWaiting();
    return readToken(descriptor, [&] { return !request->isVoid(); });
  }();
  if (!token) throwFailure(token.failure());
  const auto account = parts_.accounts.add(accountType, username);
  if (!account) throwFailure(account.failure());
  // No request finds the account before its token is stored: without it, it could sign nothing.
  auto isSetUp = parts_.keychain.setMasterCredential(account->identifier, *std::move(token));
  if (isSetUp) isSetUp = parts_.accounts.finishSetUp(account->identifier);
  if (!isSetUp) {
    if (const auto removed = parts_.accounts.remove(account->identifier); !removed)
      logging::error(parts_.log,
                     "An account that could not be set up is left until the next start: %@",
                     {removed.failure().message});
    parts_.keychain.eraseAccount(account->identifier);
    throwFailure(isSetUp.failure());
  }
  call.reply([&](sdbus::MethodReply& reply) { reply << account->identifier; });
  announceAccounts();
}

void ManagementService::removeAccount(SharedCall call) {
  std::string accountID;
  call->message() >> accountID;
  dispatcher_.onPool(call, [this, call, accountID] {
    const auto account = parts_.accounts.find(accountID);
    if (!account) throw sdbus::Error(kInvalidArgs, "There is no such account");
    const std::string& accountType = account->accountType;
    const auto begun = parts_.intents.begin({records::Intent::Kind::kRemoveAccount, accountType, accountID});
    if (!begun) throwFailure(begun.failure());
    std::optional barrier(parts_.requests.makeVoid(
        requests::VoidReason::kAccountRemoved,
        [accountType](const requests::RequestKey& key) { return key.accountType == accountType; }));
    const auto clientIDs = clientsWithRecord(accountType);
    auto& plugin = pluginForAccountType(parts_, accountType);
    try {
      plugin.revokeAllAccessToAccountsOfType(std::make_shared<const RVAccountType>(accountType),
                                             makeStore(parts_),
                                             [](bool, const std::optional<RVError>&) {});
    } catch (...) {
      finish(*begun);
      throw;
    }
    // A record that outlived the account would be a grant for the next one.
    const bool isRevoked = parts_.records.list(accountType).empty();
    auto removed =
        isRevoked
            ? parts_.accounts.retire(accountID)
            : base::Failure{base::FailureKind::kFailed,
                            "Its clients' access could not be revoked, so the account stays; try again"};
    // Gone for everybody but the server, which may be owed revocations that its token signs.
    if (removed) parts_.revocations.accountWasRetired(accountID);
    finish(*begun);
    if (!removed) throwFailure(removed.failure());
    barrier.reset();  // whoever is answered may ask again at once
    call->reply();
    accountsService_.accessChanged(accountType, clientIDs);
    announceAccounts();
  });
}

void ManagementService::listAccounts(SharedCall call) {
  call->reply([&](sdbus::MethodReply& reply) {
    reply.openContainer("a{sv}");
    for (const auto& account : parts_.accounts.list())
      writeDictionary(reply,
                      {{"id", account.identifier},
                       {"account_type", account.accountType},
                       {"username", account.username}});
    reply.closeContainer();
  });
}

}  // namespace bus
