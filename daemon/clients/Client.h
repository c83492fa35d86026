// Clients, as the plug-in and the prompt see them.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "daemon/clients/Evidence.h"
#include "daemon/clients/InstalledApplications.h"
#include "daemon/config/Entitlements.h"
#include "host/RVDAccountStore.h"

namespace clients {

// One client at the time of one request: what policy gives it and what it is called do not change while
// the request runs. Immutable, shared between threads.
class Client final : public RVDClient {
 public:
  // name: for display, not empty.
  Client(std::optional<std::string> id,
         std::string name,
         std::string icon,
         Evidence evidence,
         config::Entitlements::Names entitlements);

  std::optional<std::string> bundleID() const override;
  // As it is put into sentences for the user: isolated, so that a name in the other direction of writing
  // moves nothing of what stands around it.
  std::string localizedAppName() const override;
  bool hasEntitlement(std::string_view entitlement) const override;
  // The ID, or "(no ID)".
  std::string description() const override;

  // The name alone.
  const std::string& name() const { return name_; }
  // A name or a path; empty where the application has none.
  const std::string& icon() const { return icon_; }
  Evidence evidence() const { return evidence_; }

 private:
  const std::optional<std::string> id_;
  const std::string name_;
  const std::string icon_;
  const Evidence evidence_;
  const config::Entitlements::Names entitlements_;
};

// Makes client objects. Called from any thread.
class ClientDirectory {
 public:
  // unknownName: what the user is shown for a client without an ID, in the user's language. The references
  // must outlive the directory.
  ClientDirectory(const InstalledApplications& applications,
                  const config::Entitlements& entitlements,
                  std::string unknownName);

  // The client of a record or of a management call, which need not be installed any more: its name is then
  // the ID. Evidence: unknown, as nobody is connected.
  std::shared_ptr<const Client> clientForID(const std::string& id) const;

  // The client that a connection is (see Identities::identityOf), with the name that was read when it
  // became known.
  std::shared_ptr<const Client> clientForIdentity(const InstalledApplication& application,
                                                  Evidence evidence) const;

  // The client that nothing is known about: no ID, no entitlements.
  std::shared_ptr<const Client> unknownClient() const;

 private:
  const InstalledApplications& applications_;
  const config::Entitlements& entitlements_;
  const std::string unknownName_;
};

}  // namespace clients
