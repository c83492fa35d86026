#include "daemon/bus/Parts.h"

#include <sdbus-c++/sdbus-c++.h>

#include "daemon/bus/Names.h"

namespace bus {

plugins::PluginModule& moduleForAccountType(const Parts& parts, const std::string& accountType) {
  for (const auto& module : parts.plugins)
    if (module->supportsAccountType(accountType)) return *module;
  throw sdbus::Error(kUnsupportedAccountType, "No plug-in serves this account type");
}

RVDAccountAccessPlugin& pluginForAccountType(const Parts& parts, const std::string& accountType) {
  return moduleForAccountType(parts, accountType).plugin();
}

std::shared_ptr<RVDAccountStore> makeStore(const Parts& parts) {
  const auto clientForID = [&clients = parts.clients](const std::string& id) {
    return clients.clientForID(id);
  };
  return std::make_shared<records::RequestStore>(
      parts.records, parts.accounts, requests::RequestContext::current(), clientForID, parts.log);
}

clients::Identities::Identity identityOfConnection(const Parts& parts,
                                                   const std::string& uniqueName,
                                                   const std::string& accountType) {
  auto identity = parts.identities.identityOf(uniqueName);
  const bool isKnown = identity.application && identity.evidence != clients::Evidence::kUnknown;
  if (!isKnown || parts.records.isStronger(accountType, identity.application->id, identity.evidence))
    return {};
  return identity;
}

std::shared_ptr<const clients::Client> clientOfConnection(const Parts& parts,
                                                          const std::string& uniqueName,
                                                          const std::string& accountType) {
  const auto identity = identityOfConnection(parts, uniqueName, accountType);
  if (!identity.application) return parts.clients.unknownClient();
  return parts.clients.clientForIdentity(*identity.application, identity.evidence);
}

std::string clientKeyOfID(std::string_view id) {
  return "id " + std::string(id);  // a unique name never begins like this
}

}  // namespace bus
