// Asking the Facebook server to authorize an application, and keeping the token that it issues.
#include <utility>

#include "Facebook/FacebookAccessPlugin/Owed.h"
#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "Facebook/FacebookAccessPlugin/WordList.h"

namespace {

constexpr std::string_view kFunction =
    "-[TKFacebookAccountAccessPlugin "
    "_getServerAuthorizationForClient:withAppID:permissions:audience:account:completion:]";

std::optional<RVValue> textOf(const std::optional<RVError>& error) {
  return error ? error->localizedDescription() : std::nullopt;
}

// The member of an answer; a null pointer for an answer that is no object, since that has no members.
const RVValue* memberOf(const RVValue& answer, std::string_view name) {
  const RVDictionary* members = answer.dictionary();
  return members != nullptr ? RVValueForKey(*members, name) : nullptr;
}

}  // namespace

void TKFacebookAccountAccessPlugin::_getServerAuthorizationForClient(
    const std::shared_ptr<const RVDClient>& client,
    const std::string& appID,
    const std::optional<RVPermissionSet>& permissions,
    const std::optional<std::string>& audience,
    const std::shared_ptr<RVAccount>& account,
    const ServerCompletion& completion) const {
  const Owed<void(bool, const std::optional<RVArray>&, const std::optional<RVError>&)> owed(
      completion, false, std::nullopt, std::nullopt);
  const std::optional<std::string> bundleID = client->bundleID();
  if (!bundleID) {
    owed(false,
         std::nullopt,
         accessError(kRVErrorClientWithoutBundleID,
                     services_.stringTable->stringWithFormat(
                         "Cannot obtain server authorization for client %@ because it has no bundle ID.",
                         {client->description()})));
    return;
  }
  const auto request = services_.facebookRequests->initWithAppId(
      appID, *bundleID, permissions, _serverAudienceStringForAudience(audience));

  std::optional<RVSecret> masterToken;
  if (const auto credential = services_.keychainManager->credentialForAccount(*account, std::nullopt))
    masterToken = credential->oauthToken();
  if (!masterToken || masterToken->empty()) {
    // The server is asked all the same: what an unsigned request may do is its decision.
    log(kRVLogLevelError,
        kFunction,
        "Could not get the master token for account %@ to sign the access request.",
        {account->description()});
  }
  request->setAccessToken(std::move(masterToken));
  request->performRequestWithHandler([this, owed, client, account](const std::optional<std::string>& body,
                                                                   const std::optional<TKHTTPResponse>&,
                                                                   const std::optional<RVError>& error) {
    judgeAuthorizationAnswer(body, error, *client, *account, owed);
  });
}

void TKFacebookAccountAccessPlugin::judgeAuthorizationAnswer(const std::optional<std::string>& body,
                                                             const std::optional<RVError>& error,
                                                             const RVDClient& client,
                                                             RVAccount& account,
                                                             const ServerCompletion& completion) const {
  if (error || !body) {
    log(kRVLogLevelError,
        kFunction,
        "Error contacting Facebook server for access authorization: %@",
        {textOf(error)});
    completion(false, std::nullopt, error);
    return;
  }
  const RVJSONResult answer = services_.jsonReader->objectWithData(*body);
  if (answer.error || !answer.value) {
    log(kRVLogLevelError,
        kFunction,
        "TKFacebookAccountAccessPlugin could not parse server response: %@.",
        {textOf(answer.error)});
    completion(false, std::nullopt, answer.error);
    return;
  }
  log(kRVLogLevelDebug, kFunction, "Access request response: %@", {*answer.value});

  const RVValue* token = memberOf(*answer.value, "access_token");
  if (token != nullptr && token->string() != nullptr) {
    _saveCredentialForClient(client, account, RVSecret(*token->string()));
    const RVValue* permissions = memberOf(*answer.value, "permissions");
    const bool listed = permissions != nullptr && permissions->array() != nullptr;
    completion(true, listed ? std::optional(*permissions->array()) : std::nullopt, std::nullopt);
    return;
  }
  const RVValue* message = memberOf(*answer.value, "error_msg");
  completion(false,
             std::nullopt,
             accessError(kRVErrorPermissionDenied,
                         services_.stringTable->stringWithFormat(
                             "The Facebook server could not fulfill this access request: %@",
                             {message != nullptr ? std::optional(*message) : std::nullopt})));
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_serverAudienceStringForAudience(
    const std::optional<std::string>& audience) const {
  if (audience == RVFacebookAudienceEveryone) return "EVERYONE";
  if (audience == RVFacebookAudienceFriends) return "ALL_FRIENDS";
  if (audience == RVFacebookAudienceOnlyMe) return "SELF";
  return std::nullopt;
}

void TKFacebookAccountAccessPlugin::_saveCredentialForClient(
    const RVDClient& client,
    RVAccount& account,
    const std::optional<RVSecret>& accessToken) const {
  if (!accessToken) return;
  account.setCredential(
      std::make_shared<const RVAccountCredential>(*accessToken, RVSecret(""), kRVDistantFuture));
  // A token that could not be kept is still the client's: the server has issued it, so the grant stands.
  services_.keychainManager->setCredentialForAccount(account, client.bundleID());
}

std::string TKFacebookAccountAccessPlugin::_csvStringFromSet(const RVPermissionSet& set) const {
  return joined(set, ",");
}
