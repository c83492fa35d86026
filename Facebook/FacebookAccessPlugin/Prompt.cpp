// The alert.
#include <memory>
#include <string>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"

namespace {

// Any value but 0 is a refusal; this is the one for an alert that ended without a button.
constexpr ZQResponseFlags kNoButton = 2;

// Frees an alert when something throws; a failure to free it then is the lesser one.
struct ReleaseAlert {
  ZQUserNotificationService* service;
  void operator()(ZQUserNotification* notification) const noexcept {
    try {
      service->ZQRelease(notification);
    } catch (...) {
    }
  }
};

}  // namespace

void TKFacebookAccountAccessPlugin::_promptUserToApproveRequestForPermissions(
    const RVPermissionSet& permissions,
    const std::optional<std::string>& audience,
    const std::shared_ptr<const RVDClient>& client,
    const std::shared_ptr<RVAccount>& account,
    const PromptCompletion& completion) const {
  const std::string appName = client->localizedAppName();
  const auto message = _constructUserMessageForPermissions(permissions, audience, appName, account);
  if (!message) {
    log(kRVLogLevelError,
        "-[TKFacebookAccountAccessPlugin "
        "_promptUserToApproveRequestForPermissions:withAudience:fromClient:account:completion:]",
        "Something really bad happened and we ended up with an invalid message");
    return completion(false, false, std::nullopt);
  }
  _showAlertWithMessage(*message, [&](bool allowed) { completion(allowed, false, permissions); });
}

void TKFacebookAccountAccessPlugin::_showAlertWithMessage(
    const std::string& message,
    const std::function<void(bool allowed)>& completion) const {
  const std::string title = localizedText("ACCOUNT_ACCESS_REQUEST_TITLE");
  const std::string allow = localizedText("ACCOUNT_ACCESS_ALLOW_BUTTON_TITLE");
  const std::string doNotAllow = localizedText("ACCOUNT_ACCESS_DO_NOT_ALLOW_BUTTON_TITLE");
  _showUserNotificationWithTitle(
      title, message, allow, doNotAllow, [&completion](ZQUserNotificationRef, ZQResponseFlags responseFlags) {
        completion(responseFlags == 0);
      });
}

void TKFacebookAccountAccessPlugin::_showUserNotificationWithTitle(
    const std::string& title,
    const std::string& message,
    const std::string& defaultButtonTitle,
    const std::string& alternateButtonTitle,
    const std::function<void(ZQUserNotificationRef notification, ZQResponseFlags responseFlags)>&
        completionBlock) const {
  const auto key = [](std::string_view name) { return std::string(name); };
  const RVDictionary description{
      {key(kZQUserNotificationAlertHeaderKey), title},
      {key(kZQUserNotificationAlertMessageKey), message},
      {key(kZQUserNotificationAlternateButtonTitleKey), alternateButtonTitle},
      {key(kZQUserNotificationDefaultButtonTitleKey), defaultButtonTitle},
      {key(kZQUserNotificationAlertTopMostKey), true},
      {key(MWUserNotificationDismissOnLock), true},
      {key(MWUserNotificationDontDismissOnUnlock), true},
  };
  ZQUserNotificationService& service = *services_.userNotifications;
  std::unique_ptr<ZQUserNotification, ReleaseAlert> alert(
      service.ZQUserNotificationCreate(kZQAllocatorDefault, 0.0, 0, nullptr, description),
      ReleaseAlert{&service});
  // Stays as it is where there is no alert to answer.
  ZQResponseFlags responseFlags = kNoButton;
  service.ZQUserNotificationReceiveResponse(alert.get(), 0.0, &responseFlags);
  completionBlock(alert.get(), responseFlags);
  if (alert) service.ZQRelease(alert.release());
}
