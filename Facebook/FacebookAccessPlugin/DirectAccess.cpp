// Grants and revocations that the daemon asks for itself.
#include <semaphore>
#include <utility>

#include "Facebook/FacebookAccessPlugin/Owed.h"
#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"

namespace {

constexpr std::string_view kAuthorize =
    "-[TKFacebookAccountAccessPlugin authorizeAccessToAccountsOfType:forClient:store:completion:]";
constexpr std::string_view kRevoke =
    "-[TKFacebookAccountAccessPlugin revokeAccessToAccountsOfType:forClient:store:completion:]";
constexpr std::string_view kRevokeAll =
    "-[TKFacebookAccountAccessPlugin revokeAllAccessToAccountsOfType:store:withCompletion:]";

using OwedCompletion = Owed<void(bool, const std::optional<RVError>&)>;

// What the server grants, on its way from the thread that its answer arrives on.
struct PendingGrant {
  std::binary_semaphore arrived{0};
  RVPermissionSet permissions;  // written before `arrived` is released
};

}  // namespace

void TKFacebookAccountAccessPlugin::authorizeAccessToAccountsOfType(
    std::shared_ptr<const RVAccountType> accountType,
    std::shared_ptr<const RVDClient> client,
    std::shared_ptr<RVDAccountStore> store,
    RVDAccessCompletion completion) {
  const OwedCompletion owed(std::move(completion), false, std::nullopt);
  const auto account = _accountOfType(accountType, *store);
  if (account == nullptr) return owed(false, std::nullopt);

  RVDAuthorizationManager& manager = store->authorizationManager();
  std::optional<RVPermissionSet> grantedPermissions;
  auto authorization = manager.authorizationForClient(*client, *accountType);
  if (authorization) {
    if (const auto appID = appIDOf(*authorization))
      grantedPermissions = permissionsGrantedByServer(client, *appID, account);
  } else {
    log(kRVLogLevelDebug,
        kAuthorize,
        "This is strange behavior. We're being asked to directly authorize %@ for Facebook access.",
        {client->description()});
    authorization.emplace(client);
  }
  authorization->setIsGranted(true);
  authorization->setGrantedPermissions(std::move(grantedPermissions));
  const std::optional<RVError> error = manager.setAuthorization(*authorization, *client, *accountType);
  services_.accessLog->RVDLogAccessRequest(
      accountType->identifier(), client->bundleID(), authorization->isGranted(), false, 0);
  owed(!error, error);
}

RVPermissionSet TKFacebookAccountAccessPlugin::permissionsGrantedByServer(
    const std::shared_ptr<const RVDClient>& client,
    const std::string& appID,
    const std::shared_ptr<RVAccount>& account) const {
  // Shared: the thread of the answer may still be at the semaphore when this one is on its way again.
  const auto pending = std::make_shared<PendingGrant>();
  // Goes with the completion, so that the wait ends as well where that throws.
  Owed<void()> arrived([pending] { pending->arrived.release(); });
  _getServerAuthorizationForClient(
      client,
      appID,
      std::nullopt,
      std::nullopt,
      account,
      [pending, arrived = std::move(arrived)](
          bool, const std::optional<RVArray>& grantedPermissions, const std::optional<RVError>&) {
        pending->permissions = permissionNames(grantedPermissions ? &*grantedPermissions : nullptr);
        arrived();
      });
  pending->arrived.acquire();
  return std::move(pending->permissions);
}

void TKFacebookAccountAccessPlugin::revokeAccessToAccountsOfType(
    std::shared_ptr<const RVAccountType> accountType,
    std::shared_ptr<const RVDClient> client,
    std::shared_ptr<RVDAccountStore> store,
    RVDAccessCompletion completion) {
  const OwedCompletion owed(std::move(completion), false, std::nullopt);
  const auto account = _accountOfType(accountType, *store);
  if (account == nullptr) return owed(true, std::nullopt);

  RVDAuthorizationManager& manager = store->authorizationManager();
  auto authorization = manager.authorizationForClient(*client, *accountType);
  if (!authorization) {
    log(kRVLogLevelDebug,
        kRevoke,
        "Client %@ does not have an exiting ClientAuthorization. Ignoring...",
        {client->bundleID()});
    return owed(true, std::nullopt);
  }
  revokeToken(kRevoke, *authorization, *client, *account, [this] {
    return services_.facebookRequests->initSession();
  });
  authorization->setIsGranted(false);
  authorization->setGrantedPermissions(std::nullopt);
  manager.setAuthorization(*authorization, *client, *accountType);
  services_.accessLog->RVDLogAccessRequest(
      accountType->identifier(), client->bundleID(), authorization->isGranted(), false, 0);
  owed(true, std::nullopt);
}

void TKFacebookAccountAccessPlugin::revokeAllAccessToAccountsOfType(
    std::shared_ptr<const RVAccountType> accountType,
    std::shared_ptr<RVDAccountStore> store,
    RVDAccessCompletion completion) {
  const OwedCompletion owed(std::move(completion), false, std::nullopt);
  const auto account = _accountOfType(accountType, *store);
  if (account == nullptr) {
    log(kRVLogLevelError, kRevokeAll, "No Facebook account. What?");
    return owed(true, std::nullopt);
  }
  RVDAuthorizationManager& manager = store->authorizationManager();
  const auto authorizations = manager.allAuthorizationsForAccountType(*accountType);
  log(kRVLogLevelDebug,
      kRevokeAll,
      "Found %d authorized clients. Revoking all...",
      {static_cast<std::int64_t>(authorizations.size())});
  std::shared_ptr<TKFacebookSession> session = services_.facebookRequests->initSession();
  for (const RVDClientAuthorization& authorization : authorizations)
    revokeToken(kRevokeAll, authorization, *authorization.client(), *account, [&] { return session; });
  manager.removeAllClientAuthorizationsForAccountType(*accountType);
  owed(true, std::nullopt);
}

void TKFacebookAccountAccessPlugin::revokeToken(
    std::string_view functionName,
    const RVDClientAuthorization& authorization,
    const RVDClient& client,
    const RVAccount& account,
    const std::function<std::shared_ptr<TKFacebookSession>()>& session) const {
  const std::optional<std::string> appID = appIDOf(authorization);
  const std::optional<std::string> bundleID = client.bundleID();
  log(kRVLogLevelDebug, functionName, "Found Facebook app ID: %@ for client: %@", {appID, bundleID});
  if (!appID) return;
  log(kRVLogLevelDebug, functionName, "Contacting tesseld to invalidate token for client: %@", {bundleID});
  session()->revokeAccessTokenForAppWithID(*appID);
  log(kRVLogLevelDebug, functionName, "Removing credential from keychain for client: %@", {bundleID});
  services_.keychainManager->removeCredentialForAccount(account, bundleID);
}

std::optional<std::string> TKFacebookAccountAccessPlugin::appIDOf(
    const RVDClientAuthorization& authorization) const {
  return authorization.options() ? _appIDFromOptionsDictionary(*authorization.options()) : std::nullopt;
}
