#include "daemon/bus/ManagementService.h"

#include <sdbus-c++/sdbus-c++.h>

#include <map>
#include <optional>
#include <set>
#include <utility>

#include "daemon/bus/Answers.h"
#include "daemon/bus/Names.h"
#include "daemon/bus/Values.h"
#include "daemon/log/Log.h"
#include "interfaces/Management1Methods.h"

namespace bus {
namespace {

std::string readClientID(Call& call) {
  std::string id;
  call.message() >> id;
  checkClientID(id);
  return id;
}

// One a{sv}: the values, and one member more, a list of names; null: it is left out.
void writeEntry(sdbus::MethodReply& reply,
                const RVDictionary& values,
                const char* listKey,
                const std::set<std::string, std::less<>>* list) {
  reply.openContainer("{sv}");
  for (const auto& [key, value] : values) {
    reply.openDictEntry("sv");
    reply << key;
    writeVariant(reply, value);
    reply.closeDictEntry();
  }
  if (list != nullptr) {
    reply.openDictEntry("sv");
    reply << listKey;
    reply.openVariant("as");
    writeNames(reply, *list);
    reply.closeVariant();
    reply.closeDictEntry();
  }
  reply.closeContainer();
}

}  // namespace

void checkClientID(const std::string& id) {
  if (id.empty()) throw sdbus::Error(kInvalidArgs, "The client ID is empty");
}

void throwFailure(const base::Failure& failure) {
  const bool isCallersMistake =
      failure.kind == base::FailureKind::kInvalid || failure.kind == base::FailureKind::kNotFound;
  throw sdbus::Error(isCallersMistake ? kInvalidArgs : kFailed, failure.message);
}

ManagementService::ManagementService(sdbus::IObject& object,
                                     Dispatcher& dispatcher,
                                     BusLoop& loop,
                                     AccountsService& accountsService,
                                     Parts parts)
    : object_(object),
      dispatcher_(dispatcher),
      loop_(loop),
      accountsService_(accountsService),
      parts_(std::move(parts)) {
  const auto handler = [this](void (ManagementService::*handle)(SharedCall)) {
    return [this, handle](SharedCall call) { (this->*handle)(call); };
  };
  using Self = ManagementService;
  dispatcher.serve(interfaces::kManagement1,
                   Callers::kUnconfined,
                   interfaces::methodsOfManagement1(),
                   {{"AddAccount", handler(&Self::addAccount)},
                    {"RemoveAccount", handler(&Self::removeAccount)},
                    {"ListAccounts", handler(&Self::listAccounts)},
                    {"ListAuthorizations", handler(&Self::listAuthorizations)},
                    {"AuthorizeAccess", handler(&Self::authorizeAccess)},
                    {"RevokeAccess", handler(&Self::revokeAccess)},
                    {"RevokeAllAccess", handler(&Self::revokeAllAccess)},
                    {"ListPendingRevocations", handler(&Self::listPendingRevocations)},
                    {"ForgetRefusal", handler(&Self::forgetRefusal)},
                    {"ListAccessLog", handler(&Self::listAccessLog)},
                    {"ExplainAccess", handler(&Self::explainAccess)},
                    {"GetPreference", handler(&Self::getPreference)},
                    {"SetPreference", handler(&Self::setPreference)},
                    {"ResetPreference", handler(&Self::resetPreference)},
                    {"PostNotification", handler(&Self::postNotification)}});
  object.registerSignal("AccountsChanged").onInterface(interfaces::kManagement1);
  object.registerSignal("AuthorizationsChanged")
      .onInterface(interfaces::kManagement1)
      .withParameters<std::string>("account_type");
  const auto announce = [this](const std::string& accountType) { announceAuthorizations(accountType); };
  parts_.records.onChange(announce);
  parts_.revocations.onChange(announce);
}

void ManagementService::listAuthorizations(SharedCall call) {
  std::string accountType;
  call->message() >> accountType;
  pluginForAccountType(parts_, accountType);
  dispatcher_.onPool(call, [this, call, accountType] {
    call->reply([&](sdbus::MethodReply& reply) {
      reply.openContainer("a{sv}");
      for (const auto& record : parts_.records.list(accountType)) {
        const RVDictionary entry{{"client_id", record.clientId},
                                 {"name", parts_.clients.clientForID(record.clientId)->name()},
                                 {"granted", record.granted},
                                 {"options", record.options.value_or(RVDictionary())},
                                 {"evidence", clients::evidenceText(record.evidence)},
                                 {"changed", std::int64_t{record.changed.time_since_epoch().count()}}};
        writeEntry(reply, entry, "permissions", record.permissions ? &*record.permissions : nullptr);
      }
      reply.closeContainer();
    });
  });
}

void ManagementService::authorizeAccess(SharedCall call) {
  std::string accountType;
  call->message() >> accountType;
  const std::string clientID = readClientID(*call);
  auto& plugin = pluginForAccountType(parts_, accountType);
  auto work = [this, &plugin, accountType, clientID](RVDAccessCompletion completion) {
    plugin.authorizeAccessToAccountsOfType(std::make_shared<const RVAccountType>(accountType),
                                           parts_.clients.clientForID(clientID),
                                           makeStore(parts_),
                                           std::move(completion));
  };
  // Goes on when the tool that asked for it leaves: its caller has no name.
  parts_.requests.submitAlone({clientKeyOfID(clientID), accountType, {}, {}, {}, {}},
                              {"",
                               [this, call, accountType, clientID](const requests::Outcome& outcome) {
                                 answerOutcome(*call, outcome);
                                 if (outcome.granted) accountsService_.accessChanged(accountType, {clientID});
                               }},
                              parts_.noLimits,
                              std::move(work));
}

void ManagementService::revokeAccess(SharedCall call) {
  std::string accountType;
  call->message() >> accountType;
  const std::string clientID = readClientID(*call);
  auto& plugin = pluginForAccountType(parts_, accountType);
  dispatcher_.onPool(call, [this, call, &plugin, accountType, clientID] {
    auto barrier = parts_.requests.makeVoid(
        requests::VoidReason::kClientRevoked,
        [accountType, clientKey = clientKeyOfID(clientID)](const requests::RequestKey& key) {
          return key.accountType == accountType && key.clientKey == clientKey;
        });
    const bool hadRecord = parts_.records.find(accountType, clientID).has_value();
    revoke(
        *call,
        {records::Intent::Kind::kRevokeClient, accountType, clientID},
        [&](RVDAccessCompletion completion) {
          plugin.revokeAccessToAccountsOfType(std::make_shared<const RVAccountType>(accountType),
                                              parts_.clients.clientForID(clientID),
                                              makeStore(parts_),
                                              std::move(completion));
        },
        [&] {
          const auto record = parts_.records.find(accountType, clientID);
          return !record || !record->granted;
        },
        std::move(barrier));
    if (hadRecord) accountsService_.accessChanged(accountType, {clientID});
  });
}

void ManagementService::revokeAllAccess(SharedCall call) {
  std::string accountType;
  call->message() >> accountType;
  auto& plugin = pluginForAccountType(parts_, accountType);
  dispatcher_.onPool(call, [this, call, &plugin, accountType] {
    auto barrier = parts_.requests.makeVoid(
        requests::VoidReason::kClientRevoked,
        [accountType](const requests::RequestKey& key) { return key.accountType == accountType; });
    const auto clientIDs = clientsWithRecord(accountType);
    revoke(
        *call,
        {records::Intent::Kind::kRevokeAll, accountType, ""},
        [&](RVDAccessCompletion completion) {
          plugin.revokeAllAccessToAccountsOfType(
              std::make_shared<const RVAccountType>(accountType), makeStore(parts_), std::move(completion));
        },
        [&] { return parts_.records.list(accountType).empty(); },
        std::move(barrier));
    accountsService_.accessChanged(accountType, clientIDs);
  });
}

// Runs the revocation under an intent, and answers the call with what it came to. Plug-ins do not look at
// what becomes of the records that they write, so that is looked at here: isDone. Without an account
// plug-ins leave the records alone.
void ManagementService::revoke(Call& call,
                               const records::Intent& intent,
                               const Revocation& revocation,
                               const std::function<bool()>& isDone,
                               std::optional<requests::RequestTable::Barrier> barrier) {
  const auto begun = parts_.intents.begin(intent);
  if (!begun) throwFailure(begun.failure());
  std::optional<std::pair<bool, std::optional<RVError>>> decision;
  try {
    revocation([&](bool succeeded, const std::optional<RVError>& error) { decision = {succeeded, error}; });
  } catch (...) {
    finish(*begun);
    throw;
  }
  const auto erased = isDone() ? eraseCredentials(intent) : base::Result<void>();
  // One that failed is crossed out as well: its caller hears of it, and what is granted from then on must
  // not be undone by the next start.
  finish(*begun);
  if (!erased) throwFailure(erased.failure());
  if (!parts_.accounts.listOfType(intent.accountType).empty() && !isDone())
    throw sdbus::Error(kFailed, "The revocation could not be written down; try again");
  barrier.reset();  // whoever is answered may ask again at once
  if (decision) answerDecision(call, decision->first, decision->second);
}

// Plug-ins delete the credentials of those that they find records of. A request that became void may have
// stored one that no record stands for.
base::Result<void> ManagementService::eraseCredentials(const records::Intent& intent) {
  std::optional<std::string> clientID;
  if (intent.kind == records::Intent::Kind::kRevokeClient) clientID = intent.subject;
  for (const auto& account : parts_.accounts.listOfType(intent.accountType)) {
    auto erased = parts_.keychain.eraseClients(account.identifier, clientID);
    if (!erased) return erased;
  }
  return {};
}

void ManagementService::finish(std::int64_t intent) {
  if (const auto finished = parts_.intents.finish(intent); !finished)
    logging::error(parts_.log, "What was begun stays noted as begun: %@", {finished.failure().message});
}

void ManagementService::listPendingRevocations(SharedCall call) {
  std::string accountType;
  call->message() >> accountType;
  pluginForAccountType(parts_, accountType);
  dispatcher_.onPool(call, [this, call, accountType] {
    call->reply([&](sdbus::MethodReply& reply) {
      reply.openContainer("a{sv}");
      for (const auto& owed : parts_.revocations.list(accountType)) {
        RVDictionary entry{{"app_id", owed.appId},
                           {"since", std::int64_t{owed.since.time_since_epoch().count()}},
                           {"attempts", owed.attempts}};
        if (owed.failure) entry.emplace("failure", *owed.failure);
        writeEntry(reply, entry, "client_ids", &owed.clientIds);
      }
      reply.closeContainer();
    });
  });
}

void ManagementService::forgetRefusal(SharedCall call) {
  std::string accountType;
  call->message() >> accountType;
  const std::string clientID = readClientID(*call);
  pluginForAccountType(parts_, accountType);
  dispatcher_.onPool(call, [this, call, accountType, clientID] {
    if (const auto forgotten = parts_.records.forgetRefusal(accountType, clientID); !forgotten)
      throw sdbus::Error(kFailed, forgotten.failure().message);
    call->reply();
    accountsService_.accessChanged(accountType, {clientID});
  });
}

void ManagementService::listAccessLog(SharedCall call) {
  std::uint32_t limit = 0;
  call->message() >> limit;
  dispatcher_.onPool(call, [this, call, limit] {
    const auto entries = parts_.accessLog.newest(limit);
    if (!entries) throwFailure(entries.failure());
    call->reply([&](sdbus::MethodReply& reply) {
      reply.openContainer("a{sv}");
      for (const auto& entry : *entries) {
        RVDictionary fields{{"time", std::int64_t{entry.time.time_since_epoch().count()}},
                            {"account_type", entry.accountType},
                            {"granted", entry.granted},
                            {"requested", entry.requested},
                            {"evidence", clients::evidenceText(entry.evidence)}};
        if (entry.clientId) fields.emplace("client_id", *entry.clientId);
        writeDictionary(reply, fields);
      }
      reply.closeContainer();
    });
  });
}

std::vector<std::string> ManagementService::clientsWithRecord(const std::string& accountType) const {
  std::vector<std::string> clientIDs;
  for (const auto& record : parts_.records.list(accountType)) clientIDs.push_back(record.clientId);
  return clientIDs;
}

// Signals are sent from the bus thread: whoever writes a record holds locks at that moment.

void ManagementService::announceAccounts() {
  loop_.post([this] {
    try {
      object_.emitSignal("AccountsChanged").onInterface(interfaces::kManagement1);
    } catch (const sdbus::Error&) {  // The bus is gone.
    }
  });
}

void ManagementService::announceAuthorizations(const std::string& accountType) {
  loop_.post([this, accountType] {
    try {
      object_.emitSignal("AuthorizationsChanged")
          .onInterface(interfaces::kManagement1)
          .withArguments(accountType);
    } catch (const sdbus::Error&) {  // The bus is gone.
    }
  });
}

}  // namespace bus
