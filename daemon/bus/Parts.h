// What the services on the bus work with.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "daemon/clients/Client.h"
#include "daemon/clients/Identities.h"
#include "daemon/config/Settings.h"
#include "daemon/credentials/Keychain.h"
#include "daemon/http/Revocations.h"
#include "daemon/plugins/PluginModule.h"
#include "daemon/preferences/NotificationCenter.h"
#include "daemon/preferences/PreferencesStore.h"
#include "daemon/records/AccessLog.h"
#include "daemon/records/Accounts.h"
#include "daemon/records/AuthorizationRecords.h"
#include "daemon/records/Intents.h"
#include "daemon/records/RequestStore.h"
#include "daemon/rehearsal/Rehearsal.h"
#include "daemon/requests/RateLimit.h"
#include "daemon/requests/RequestPool.h"
#include "daemon/requests/RequestTable.h"
#include "daemon/requests/WaitingLimits.h"
#include "host/RVLog.h"

namespace bus {

// What requests are rehearsed with, in whatever languages. The functions are called from any thread.
struct RehearsalParts {
  using Languages = std::vector<std::string>;  // see base::languageChain

  RVDHostServices services;  // the real ones; the string table is absent
  rehearsal::ProblemWithSending problemWithSending;
  std::function<rehearsal::Server(const Languages& languages)> serverSpeaking;
  std::function<std::shared_ptr<const RVDClient>(const std::string& id, const Languages& languages)>
      clientNamed;
  Languages languages;  // the user's
};

// Everything outlives the services.
struct Parts {
  RVLogService& log;
  const config::Settings& settings;
  records::Accounts& accounts;
  records::AuthorizationRecords& records;
  records::AccessLog& accessLog;
  records::Intents& intents;
  http::Revocations& revocations;
  credentials::Keychain& keychain;
  preferences::PreferencesStore& preferences;
  preferences::NotificationCenter& notifications;
  clients::Identities& identities;
  const clients::ClientDirectory& clients;
  const std::vector<std::unique_ptr<plugins::PluginModule>>& plugins;
  requests::RequestPool& pool;
  requests::RequestTable& requests;
  requests::RateLimit& rate;
  std::shared_ptr<requests::WaitingLimiter> limits;
  std::shared_ptr<requests::WaitingLimiter> noLimits;
  const RehearsalParts& rehearsal;
};

// The module whose plug-in serves the account type, and that plug-in. Throw sdbus::Error
// (UnsupportedAccountType) where none does.
plugins::PluginModule& moduleForAccountType(const Parts& parts, const std::string& accountType);
RVDAccountAccessPlugin& pluginForAccountType(const Parts& parts, const std::string& accountType);

// What a plug-in is given for one call; it belongs to the calling thread's current request, if any.
std::shared_ptr<RVDAccountStore> makeStore(const Parts& parts);

// Who a connection is at this moment, for the account type. Nobody (no application, evidence unknown) where
// the record of that client was made with stronger evidence than there is for the connection.
clients::Identities::Identity identityOfConnection(const Parts& parts,
                                                   const std::string& uniqueName,
                                                   const std::string& accountType);

// The client that a connection is at this moment, for the account type.
std::shared_ptr<const clients::Client> clientOfConnection(const Parts& parts,
                                                          const std::string& uniqueName,
                                                          const std::string& accountType);

// Tells the client of this ID apart from all others, those without an ID included.
std::string clientKeyOfID(std::string_view id);

}  // namespace bus
