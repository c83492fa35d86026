#include "daemon/bus/AccountsService.h"

#include <sdbus-c++/sdbus-c++.h>

#include <utility>

#include "daemon/bus/Answers.h"
#include "daemon/bus/Names.h"
#include "daemon/bus/RequestOptions.h"
#include "daemon/bus/Values.h"
#include "host/Constants.h"
#include "interfaces/Accounts1Methods.h"

namespace bus {
namespace {

constexpr std::uint32_t kVersion = 1;

// What an alert tells about the client, by the keys of Agent1's description.
RVDictionary detailsOf(const clients::Client& client) {
  RVDictionary details;
  if (const auto id = client.bundleID()) details.emplace("client_id", *id);
  if (!client.icon().empty()) details.emplace("icon", client.icon());
  details.emplace("evidence", clients::evidenceText(client.evidence()));
  return details;
}

// Writes a secret as a variant; no copy of it stays behind but the message, which the library frees.
void writeSecret(sdbus::Message& message, const RVSecret& secret) {
  std::string text(secret.reveal());
  message.openVariant("s");
  try {
    message << text;
  } catch (...) {
    RVSecret::wipe(text.data(), text.size());
    throw;
  }
  RVSecret::wipe(text.data(), text.size());
  message.closeVariant();
}

void writeCredential(sdbus::Message& message, const RVAccountCredential& credential) {
  message.openContainer("{sv}");
  const auto entry = [&](const char* key, const auto& writeValue) {
    message.openDictEntry("sv");
    message << key;
    writeValue();
    message.closeDictEntry();
  };
  entry("oauth_token", [&] { writeSecret(message, credential.oauthToken()); });
  entry("refresh_token", [&] { writeSecret(message, credential.refreshToken()); });
  if (credential.expiryDate() != kRVDistantFuture)
    entry("expiry_date",
          [&] { writeVariant(message, std::int64_t{credential.expiryDate().time_since_epoch().count()}); });
  message.closeContainer();
}

}  // namespace

AccountsService::AccountsService(sdbus::IObject& object, Dispatcher& dispatcher, BusLoop& loop, Parts parts)
    : object_(object),
      dispatcher_(dispatcher),
      loop_(loop),
      parts_(std::move(parts)) {
  using SharedCall = const std::shared_ptr<Call>&;
  dispatcher.serve(interfaces::kAccounts1,
                   Callers::kAll,
                   interfaces::methodsOfAccounts1(),
                   {{"Register", [this](SharedCall call) { registerCaller(call); }},
                    {"RequestAccess", [this](SharedCall call) { requestAccess(call); }},
                    {"GetAccess", [this](SharedCall call) { getAccess(call); }},
                    {"GetCredential", [this](SharedCall call) { getCredential(call); }}});
  object.registerSignal("AccessChanged")
      .onInterface(interfaces::kAccounts1)
      .withParameters<std::string>("account_type");
  object.registerProperty("AccountTypes").onInterface(interfaces::kAccounts1).withGetter([this] {
    std::vector<std::string> types;
    const std::string facebook(RVAccountTypeIdentifierFacebook);
    for (const auto& module : parts_.plugins)
      if (types.empty() && module->supportsAccountType(facebook)) types.push_back(facebook);
    return types;
  });
  object.registerProperty("Version").onInterface(interfaces::kAccounts1).withGetter([] { return kVersion; });
}

void AccountsService::registerCaller(const std::shared_ptr<Call>& call) {
  SizeLimit limit{parts_.settings.messageBytes};
  const std::string id = readString(call->message(), limit);
  switch (parts_.identities.registerAs(call->sender(), id)) {
    case clients::Registration::kRegistered:
      break;
    case clients::Registration::kNotPossible:
      throw sdbus::Error(kAccessDenied, "Only programs that are known to run in no sandbox may register");
    case clients::Registration::kAlreadyIdentified:
      throw sdbus::Error(kAlreadyIdentified, "It is known which application this connection is");
    case clients::Registration::kUnknownApplication:
      throw sdbus::Error(kUnknownApplication, "No installed application has this ID");
    case clients::Registration::kSandboxed:
      throw sdbus::Error(kUnknownApplication,
                         "The application that has this ID runs in a sandbox, which says so itself");
  }
  call->reply();
}

void AccountsService::checkRate(const std::string& uniqueName) const {
  const auto identity = parts_.identities.identityOf(uniqueName);
  const std::string clientKey = identity.application ? clientKeyOfID(identity.application->id) : uniqueName;
  if (!parts_.rate.take(requests::shareKeyOf(clientKey, identity.evidence)))
    throw sdbus::Error(kLimitsExceeded, "The client calls too often");
}

void AccountsService::requestAccess(const std::shared_ptr<Call>& call) {
  SizeLimit limit{parts_.settings.messageBytes};
  std::string accountType = readString(call->message(), limit);
  auto options =
      std::make_shared<const RVDictionary>(readRequestOptions(call->message(), limit, parts_.settings));
  const bool allowUserInteraction = readBoolean(call->message(), limit);
  checkRate(call->sender());
  auto& plugin = pluginForAccountType(parts_, accountType);
  const auto client = clientOfConnection(parts_, call->sender(), accountType);
  const auto id = client->bundleID();

  auto work = [this,
               &plugin,
               client,
               options,
               allowUserInteraction,
               type = std::make_shared<const RVAccountType>(accountType)](RVDAccessCompletion completion) {
    plugin.handleAccessRequestToAccountsOfType(
        type,
        client,
        *options,
        makeStore(parts_),
        allowUserInteraction,
        [options, completion = std::move(completion)](bool granted, const std::optional<RVError>& error) {
          completion(granted, error);
        });
  };
  parts_.requests.submit(
      requests::RequestKey::forOptions(
          id ? clientKeyOfID(*id) : call->sender(), client->evidence(), std::move(accountType), *options),
      {call->sender(), [call](const auto& outcome) { answerOutcome(*call, outcome); }},
      parts_.limits,
      detailsOf(*client),
      std::move(work));
}

void AccountsService::getAccess(const std::shared_ptr<Call>& call) {
  SizeLimit limit{parts_.settings.messageBytes};
  const std::string accountType = readString(call->message(), limit);
  pluginForAccountType(parts_, accountType);
  const auto application = identityOfConnection(parts_, call->sender(), accountType).application;
  const auto record = application ? parts_.records.find(accountType, application->id) : std::nullopt;
  call->reply([&](sdbus::MethodReply& reply) {
    reply << (!record ? "none" : record->granted ? "granted" : "refused");
    writeNames(reply, record ? record->permissions.value_or(RVPermissionSet()) : RVPermissionSet());
    writeDictionary(reply, record ? record->options.value_or(RVDictionary()) : RVDictionary());
  });
}

void AccountsService::getCredential(const std::shared_ptr<Call>& call) {
  SizeLimit limit{parts_.settings.messageBytes};
  const std::string accountType = readString(call->message(), limit);
  pluginForAccountType(parts_, accountType);
  const auto identity = identityOfConnection(parts_, call->sender(), accountType);
  if (!identity.application) throw sdbus::Error(kNoAccess, "The caller holds no access");
  checkRate(call->sender());
  dispatcher_.onPool(call, [this, call, accountType, identity] {
    const auto accounts = parts_.accounts.listOfType(accountType);
    const auto credential =
        accounts.empty() ? nullptr
                         : parts_.keychain.credentialForClient(
                               accounts.front().identifier, identity.application->id, identity.evidence);
    if (credential == nullptr) throw sdbus::Error(kNoAccess, "The caller holds no access");
    call->reply([&](sdbus::MethodReply& reply) { writeCredential(reply, *credential); });
  });
}

void AccountsService::accessChanged(const std::string& accountType,
                                    const std::vector<std::string>& clientIDs) {
  for (const std::string& id : clientIDs) {
    for (const std::string& receiver : parts_.identities.connectionsOf(id)) {
      try {
        auto signal = object_.createSignal(interfaces::kAccounts1, "AccessChanged");
        signal.setDestination(receiver);
        signal << accountType;
        object_.emitSignal(signal);
        loop_.sendRest();
      } catch (const sdbus::Error&) {  // The bus is gone, and the receiver with it.
      }
    }
  }
}

}  // namespace bus
