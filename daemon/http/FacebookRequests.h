// The host's request classes: what is said to the Facebook server, and how.
#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "daemon/http/TransferThread.h"
#include "host/RVDKeychainManager.h"
#include "host/RVLog.h"
#include "host/TKFacebookRequests.h"

namespace http {

struct FacebookServerSettings {
  std::optional<std::string> url;    // absent: every exchange fails and says so
  std::chrono::seconds timeout{60};  // for one exchange
  std::string caFile;                // PEM file of the authorities to trust; empty: the system's
};

// How long revocations may still take when the daemon stops (see TransferThread::stop).
inline constexpr std::chrono::seconds kRevocationGrace{3};

// Makes requests to one server.
//
// A request belongs to the RequestContext that is current when it is performed: the context waits until
// the answer has come, the exchange is ended when the context becomes void, and the handler runs with
// the context as the current one. A void context's request is answered with an error and sends nothing.
// A revocation belongs to no context, since nobody waits for it: it is sent whatever becomes of the
// request that asked for it, and its failure is logged.
class FacebookRequests final : public TKFacebookRequestFactory {
 public:
  // transfers, log: outlive this object, its requests and its sessions. masterToken: gives the token of
  // the account that the current call is about, absent where there is none; called on the thread that
  // revokes. acceptLanguage: the user's languages, as the header of that name lists them; may be empty.
  FacebookRequests(TransferThread& transfers,
                   FacebookServerSettings settings,
                   std::function<std::optional<RVSecret>()> masterToken,
                   std::string acceptLanguage,
                   RVLogService& log);
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

  class Server;

 private:
  const std::shared_ptr<const Server> server_;
};

}  // namespace http
