// The host's request classes: what is said to the Facebook server, and how.
#pragma once

#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "daemon/http/FacebookServer.h"
#include "daemon/http/Revocations.h"
#include "host/TKFacebookRequests.h"

namespace http {

// How long revocations that are on their way may still take when the daemon stops (see
// TransferThread::stop); the next start tells the server what it has not answered by then.
inline constexpr std::chrono::seconds kRevocationGrace{3};

// Makes requests to one server.
//
// A request belongs to the RequestContext that is current when it is performed: the context waits until
// the answer has come, the exchange is ended when the context becomes void, and the handler runs with
// the context as the current one. A void context's request is answered with an error and sends nothing.
// An app for which a revocation is still owed is authorized once the server has answered that; where it
// cannot be told, the exchange fails with that error and is not sent.
//
// A revocation belongs to no context, since nobody waits for it: it is owed, whatever becomes of the
// request that asked for it. One that cannot be written down throws std::runtime_error, so that whoever
// revokes leaves the record as it is.
class FacebookRequests final : public TKFacebookRequestFactory {
 public:
  // Both outlive this object, its requests and its sessions.
  FacebookRequests(FacebookServer& server, Revocations& revocations);
  ~FacebookRequests() override;

  std::shared_ptr<TKFacebookAuthorizationRequest> initWithAppId(
      const std::string& appId,
      const std::string& bundleId,
      const std::optional<RVPermissionSet>& permissions,
      const std::optional<std::string>& audience) override;

  std::shared_ptr<TKFacebookPermissionDescriptionRequest> initWithPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& audience) override;

  std::shared_ptr<TKFacebookSession> initSession() override;

  // Why a request for these permissions is answered with an error and never sent, whatever the server;
  // absent where it is sent.
  std::optional<RVError> problemWithSending(const std::optional<RVPermissionSet>& permissions) const;

  class Shared;

 private:
  const std::shared_ptr<Shared> shared_;
};

}  // namespace http
