// A client's request for access, from its arrival to the record of the user's answer.
#include <algorithm>
#include <utility>

#include "Facebook/FacebookAccessPlugin/Owed.h"
#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "Facebook/FacebookAccessPlugin/WordList.h"

namespace {

constexpr std::string_view kHandleRequest =
    "-[TKFacebookAccountAccessPlugin "
    "handleAccessRequestToAccountsOfType:forClient:withOptions:store:allowUserInteraction:completion:]";
constexpr std::string_view kHandleResponse =
    "-[TKFacebookAccountAccessPlugin "
    "_handleUserResponse:toRequestForClient:withAppID:persistentOptions:onAccount:ofType:"
    "existingPermissions:newPermissions:audience:isFirstTimeRequest:shouldSkipServer:store:completion:]";

void removeAll(RVPermissionSet& from, const RVPermissionSet& names) {
  for (const std::string& name : names) from.erase(name);
}

}  // namespace

void TKFacebookAccountAccessPlugin::handleAccessRequestToAccountsOfType(
    std::shared_ptr<const RVAccountType> accountType,
    std::shared_ptr<const RVDClient> client,
    const RVDictionary& options,
    std::shared_ptr<RVDAccountStore> store,
    bool /*allowUserInteraction*/,
    RVDAccessCompletion completion) {
  const Owed<void(bool, const std::optional<RVError>&)> owed(std::move(completion), false, std::nullopt);
  log(kRVLogLevelDebug,
      kHandleRequest,
      "FacebookAccessPlugin is handling request for access from %@.",
      {client->description()});
  if (client->hasEntitlement(kRVDAllAccountsAccessEntitlement)) return owed(true, std::nullopt);

  const bool hasDefaultAccess = client->hasEntitlement(kRVDFacebookAccountsDefaultAccessEntitlement);
  if (hasDefaultAccess)
    log(kRVLogLevelDebug, kHandleRequest, "Granting default access to %@.", {client->description()});
  const auto account = _accountOfType(accountType, *store);
  if (!hasDefaultAccess && account == nullptr) {
    log(kRVLogLevelError, kHandleRequest, "No Facebook accounts. Rejecting access request.");
    return owed(false, accessError(kRVErrorNoAccount));
  }
  if (!_validateOptionsDictionary(options)) {
    log(kRVLogLevelError,
        kHandleRequest,
        "%@ provided an invalid options dictionary.",
        {client->description()});
    return owed(false, accessError(kRVErrorInvalidOptions));
  }

  const std::optional<std::string> audience = _audienceFromOptionsDictionary(options);
  const std::optional<std::string> appID = _appIDFromOptionsDictionary(options);
  RVPermissionSet requested = _permissionsFromOptionsDictionary(options);
  RVPermissionSet existing;
  const auto authorization = store->authorizationManager().authorizationForClient(*client, *accountType);
  if (authorization) {
    if (!authorization->isGranted()) return owed(false, std::nullopt);
    existing = creditForRequest(*authorization, appID, requested, audience);
    if (!existing.empty() &&
        std::includes(existing.begin(), existing.end(), requested.begin(), requested.end()))
      return owed(true, std::nullopt);
  }
  removeAll(requested, existing);
  const RVPermissionSet& newPermissions = requested;

  const PromptCompletion respond =
      [&](bool granted, bool skipServer, const std::optional<RVPermissionSet>& permissions) {
        // How long the decision took is not measured.
        if (!hasDefaultAccess)
          services_.accessLog->RVDLogAccessRequest(
              accountType->identifier(), client->bundleID(), granted, true, 0);
        _handleUserResponse(granted,
                            client,
                            *appID,
                            _persistentDictionaryForOptions(options),
                            account,
                            accountType,
                            existing,
                            permissions.value_or(RVPermissionSet()),
                            audience,
                            authorization.has_value(),
                            skipServer,
                            store,
                            owed);
      };
  if (hasDefaultAccess) {
    respond(true, account == nullptr, newPermissions);
  } else {
    _promptUserToApproveRequestForPermissions(newPermissions, audience, client, account, respond);
  }
}

RVPermissionSet TKFacebookAccountAccessPlugin::creditForRequest(
    const RVDClientAuthorization& authorization,
    const std::optional<std::string>& appID,
    const RVPermissionSet& requestedPermissions,
    const std::optional<std::string>& audience) const {
  RVPermissionSet credit;
  if (!authorization.options()) return credit;
  if (_appIDFromOptionsDictionary(*authorization.options()) == appID)
    credit = authorization.grantedPermissions().value_or(RVPermissionSet());
  if (intersects(requestedPermissions, _writePermissions()) &&
      _audienceFromOptionsDictionary(*authorization.options()) != audience)
    removeAll(credit, _writePermissions());
  return credit;
}

void TKFacebookAccountAccessPlugin::_handleUserResponse(bool response,
                                                        const std::shared_ptr<const RVDClient>& client,
                                                        const std::string& appID,
                                                        const RVDictionary& persistentOptions,
                                                        const std::shared_ptr<RVAccount>& account,
                                                        const std::shared_ptr<const RVAccountType>& type,
                                                        const RVPermissionSet& existingPermissions,
                                                        const RVPermissionSet& newPermissions,
                                                        const std::optional<std::string>& audience,
                                                        bool isFirstTimeRequest,
                                                        bool shouldSkipServer,
                                                        const std::shared_ptr<RVDAccountStore>& store,
                                                        const RVDAccessCompletion& completion) const {
  if (_shouldIgnoreAccessRequest()) {
    log(kRVLogLevelNotice,
        kHandleResponse,
        "Will not contact server about this access request due to user-set pref.");
    return completion(false, std::nullopt);
  }
  RVDClientAuthorization authorization(client);
  authorization.setOptions(persistentOptions);
  if (!response) {
    if (!isFirstTimeRequest) store->authorizationManager().setAuthorization(authorization, *client, *type);
    return completion(false, accessError(kRVErrorPermissionDenied));
  }
  const ServerCompletion serverCompletion = [=](bool success,
                                                const std::optional<RVArray>& grantedPermissions,
                                                const std::optional<RVError>& error) {
    if (success) {
      RVDClientAuthorization granted = authorization;
      granted.setIsGranted(true);
      granted.setGrantedPermissions(permissionNames(grantedPermissions ? &*grantedPermissions : nullptr));
      store->authorizationManager().setAuthorization(granted, *client, *type);
    }
    completion(success, error);
  };
  if (shouldSkipServer) {
    log(kRVLogLevelNotice, kHandleResponse, "Skipping server request!");
    RVArray all(existingPermissions.begin(), existingPermissions.end());
    all.insert(all.end(), newPermissions.begin(), newPermissions.end());
    serverCompletion(true, all, std::nullopt);
  } else {
    _getServerAuthorizationForClient(client, appID, newPermissions, audience, account, serverCompletion);
  }
}
