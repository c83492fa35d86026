// The exchanges with the Facebook server.
//
// All handlers run exactly once, on a thread of the host's choosing that is never the caller's own
// stack, and are released afterwards. A host that gives an exchange up without an answer (it is
// stopping, for example) destroys the handler unused. A request object keeps what it needs alive until
// then: whoever made it may let go of it as soon as it has been started.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "host/RVDKeychainManager.h"
#include "host/Values.h"

// What came along with an answer's body.
struct TKHTTPResponse {
  int statusCode = 0;
};

// body: the bytes of the answer, absent where none came; response: absent where the server did not
// answer; error: why the exchange failed, absent on success.
using TKFacebookRequestHandler = std::function<void(const std::optional<std::string>& body,
                                                    const std::optional<TKHTTPResponse>& response,
                                                    const std::optional<RVError>& error)>;

// Asks the server to authorize an application; answered with a JSON object.
class TKFacebookAuthorizationRequest {
 public:
  virtual ~TKFacebookAuthorizationRequest() = default;
  // The token that signs the request. Without one the request is sent unsigned.
  virtual void setAccessToken(std::optional<RVSecret> accessToken) = 0;
  // Sends the request and returns at once. Called once.
  virtual void performRequestWithHandler(TKFacebookRequestHandler handler) = 0;
};

// Asks the server to describe permissions; answered with a JSON string.
class TKFacebookPermissionDescriptionRequest {
 public:
  virtual ~TKFacebookPermissionDescriptionRequest() = default;
  virtual void setAccessToken(std::optional<RVSecret> accessToken) = 0;
  virtual void performRequestWithHandler(TKFacebookRequestHandler handler) = 0;
};

// The host's session with the server, for the one thing that nobody waits for.
class TKFacebookSession {
 public:
  virtual ~TKFacebookSession() = default;
  // Has the server invalidate the token that the device holds for the application. Returns at once.
  virtual void revokeAccessTokenForAppWithID(const std::string& appID) = 0;
};

// Makes the objects above; each method is the initialiser of the class that it returns. Called from any
// thread; never returns null.
class TKFacebookRequestFactory {
 public:
  virtual ~TKFacebookRequestFactory() = default;

  // An absent value is left out of the exchange; an empty one is sent empty.
  virtual std::shared_ptr<TKFacebookAuthorizationRequest> initWithAppId(
      const std::string& appId,
      const std::string& bundleId,
      const std::optional<RVPermissionSet>& permissions,
      const std::optional<std::string>& audience) = 0;

  virtual std::shared_ptr<TKFacebookPermissionDescriptionRequest> initWithPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& audience) = 0;

  virtual std::shared_ptr<TKFacebookSession> initSession() = 0;
};
