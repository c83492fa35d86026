#include "daemon/clients/Client.h"

#include <utility>

#include "base/Text.h"

namespace clients {

std::string_view evidenceText(Evidence evidence) {
  switch (evidence) {
    case Evidence::kUnknown:
      break;
    case Evidence::kRegistered:
      return "registered";
    case Evidence::kScope:
      return "scope";
    case Evidence::kSandbox:
      return "sandbox";
  }
  return "unknown";
}

Client::Client(std::optional<std::string> id,
               std::string name,
               std::string icon,
               Evidence evidence,
               config::Entitlements::Names entitlements)
    : id_(std::move(id)),
      name_(std::move(name)),
      icon_(std::move(icon)),
      evidence_(evidence),
      entitlements_(std::move(entitlements)) {
}

std::optional<std::string> Client::bundleID() const {
  return id_;
}

std::string Client::localizedAppName() const {
  return base::isolated(name_);
}

bool Client::hasEntitlement(std::string_view entitlement) const {
  return entitlements_.contains(entitlement);
}

std::string Client::description() const {
  return id_.value_or("(no ID)");
}

ClientDirectory::ClientDirectory(const InstalledApplications& applications,
                                 const config::Entitlements& entitlements,
                                 std::string unknownName)
    : applications_(applications),
      entitlements_(entitlements),
      unknownName_(std::move(unknownName)) {
}

std::shared_ptr<const Client> ClientDirectory::clientForID(const std::string& id) const {
  const auto application = applications_.find(id);
  return clientForIdentity(application.value_or(InstalledApplication{id, shownName(id, unknownName_), ""}),
                           Evidence::kUnknown);
}

std::shared_ptr<const Client> ClientDirectory::clientForIdentity(const InstalledApplication& application,
                                                                 Evidence evidence) const {
  return std::make_shared<const Client>(application.id,
                                        application.name,
                                        application.icon,
                                        evidence,
                                        entitlements_.entitlementsOfClient(application.id));
}

std::shared_ptr<const Client> ClientDirectory::unknownClient() const {
  return std::make_shared<const Client>(
      std::nullopt, unknownName_, "", Evidence::kUnknown, config::Entitlements::Names());
}

}  // namespace clients
