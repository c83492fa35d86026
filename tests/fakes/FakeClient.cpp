#include "tests/fakes/FakeClient.h"

#include <utility>

namespace fakes {

FakeClient::FakeClient(std::optional<std::string> bundleID,
                       std::string localizedAppName,
                       std::set<std::string, std::less<>> entitlements)
    : Fake("client"),
      bundleID_(std::move(bundleID)),
      localizedAppName_(std::move(localizedAppName)),
      entitlements_(std::move(entitlements)) {
}

std::optional<std::string> FakeClient::bundleID() const {
  begin("bundleID");
  return bundleID_;
}

std::string FakeClient::localizedAppName() const {
  begin("localizedAppName");
  return localizedAppName_;
}

bool FakeClient::hasEntitlement(std::string_view entitlement) const {
  begin("hasEntitlement");
  return entitlements_.count(entitlement) > 0;
}

std::string FakeClient::description() const {
  begin("description");
  return bundleID_.value_or(localizedAppName_);
}

}  // namespace fakes
