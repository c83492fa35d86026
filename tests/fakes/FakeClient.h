// A client that is what a test says it is.
#pragma once

#include <optional>
#include <set>
#include <string>
#include <string_view>

#include "host/RVDAccountStore.h"
#include "tests/fakes/Fake.h"

namespace fakes {

class FakeClient final : public RVDClient, public Fake {
 public:
  // Described in log lines by its bundle ID, or by its name where it has none.
  explicit FakeClient(std::optional<std::string> bundleID = "org.example.PhotoApp",
                      std::string localizedAppName = "Photo App",
                      std::set<std::string, std::less<>> entitlements = {});

  std::optional<std::string> bundleID() const override;
  std::string localizedAppName() const override;
  bool hasEntitlement(std::string_view entitlement) const override;
  std::string description() const override;

 private:
  const std::optional<std::string> bundleID_;
  const std::string localizedAppName_;
  const std::set<std::string, std::less<>> entitlements_;
};

}  // namespace fakes
