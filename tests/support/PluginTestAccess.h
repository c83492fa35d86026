// The plug-in's own operations, for tests of one operation at a time.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"

// Each function calls the operation of the same name, without its underscore.
struct TKFacebookAccountAccessPluginTestAccess {
  using PromptCompletion = TKFacebookAccountAccessPlugin::PromptCompletion;
  using ServerCompletion = TKFacebookAccountAccessPlugin::ServerCompletion;

  const TKFacebookAccountAccessPlugin& plugin;

  const RVPermissionSet& basicReadPermissions() const { return plugin._basicReadPermissions(); }
  const RVPermissionSet& extendedReadPermissions() const { return plugin._extendedReadPermissions(); }
  const RVPermissionSet& writePermissions() const { return plugin._writePermissions(); }
  const RVPermissionSet& managePermissions() const { return plugin._managePermissions(); }

  std::optional<std::string> constructUserMessageForPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& audience,
      const std::string& appName,
      const std::shared_ptr<RVAccount>& account) const {
    return plugin._constructUserMessageForPermissions(permissions, audience, appName, account);
  }
  std::optional<std::string> predicateForPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string_view>& category,
      const std::optional<std::string>& audience = std::nullopt) const {
    return plugin._predicateForPermissions(permissions, category, audience);
  }
  std::optional<std::string> objectNameForReadPermission(std::string_view permission) const {
    return plugin._objectNameForReadPermission(permission);
  }
  std::optional<std::string> objectNameForManagePermission(std::string_view permission) const {
    return plugin._objectNameForManagePermission(permission);
  }
  std::string userFriendlyAudienceString(const std::optional<std::string>& audience) const {
    return plugin._userFriendlyAudienceString(audience);
  }
  std::optional<std::string> userObjectsRequestedByPermissions(const RVPermissionSet& permissions) const {
    return plugin._userObjectsRequestedByPermissions(permissions);
  }
  std::optional<std::string> friendObjectsRequestedByPermissions(const RVPermissionSet& permissions) const {
    return plugin._friendObjectsRequestedByPermissions(permissions);
  }
  std::string commaSeparatedListWithFormat(std::string_view format,
                                           const RVPermissionSet& objectNames) const {
    return plugin._commaSeparatedListWithFormat(format, objectNames);
  }
  std::optional<std::string> appendDescriptionOfUnknownPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& userMessage,
      const std::string& appName,
      const std::optional<std::string>& audience,
      const std::shared_ptr<RVAccount>& account) const {
    return plugin._appendDescriptionOfUnknownPermissions(
        permissions, userMessage, appName, audience, account);
  }
  std::optional<std::string> fetchDescriptionForUnknownPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& audience,
      const std::shared_ptr<RVAccount>& account) const {
    return plugin._fetchDescriptionForUnknownPermissions(permissions, audience, account);
  }
  void promptUserToApproveRequestForPermissions(const RVPermissionSet& permissions,
                                                const std::optional<std::string>& audience,
                                                const std::shared_ptr<const RVDClient>& client,
                                                const std::shared_ptr<RVAccount>& account,
                                                const PromptCompletion& completion) const {
    plugin._promptUserToApproveRequestForPermissions(permissions, audience, client, account, completion);
  }
  void showAlertWithMessage(const std::string& message,
                            const std::function<void(bool allowed)>& completion) const {
    plugin._showAlertWithMessage(message, completion);
  }
  void showUserNotificationWithTitle(
      const std::string& title,
      const std::string& message,
      const std::string& defaultButtonTitle,
      const std::string& alternateButtonTitle,
      const std::function<void(ZQUserNotificationRef, ZQResponseFlags)>& completionBlock) const {
    plugin._showUserNotificationWithTitle(
        title, message, defaultButtonTitle, alternateButtonTitle, completionBlock);
  }

  std::shared_ptr<RVAccount> accountOfType(const std::shared_ptr<const RVAccountType>& type,
                                           RVDAccountStore& store) const {
    return plugin._accountOfType(type, store);
  }
  bool shouldIgnoreAccessRequest() const { return plugin._shouldIgnoreAccessRequest(); }
  bool validateOptionsDictionary(const RVDictionary& options) const {
    return plugin._validateOptionsDictionary(options);
  }
  std::optional<std::string> appIDFromOptionsDictionary(const RVDictionary& options) const {
    return plugin._appIDFromOptionsDictionary(options);
  }
  RVPermissionSet permissionsFromOptionsDictionary(const RVDictionary& options) const {
    return plugin._permissionsFromOptionsDictionary(options);
  }
  std::optional<std::string> audienceFromOptionsDictionary(const RVDictionary& options) const {
    return plugin._audienceFromOptionsDictionary(options);
  }
  RVDictionary persistentDictionaryForOptions(const RVDictionary& options) const {
    return plugin._persistentDictionaryForOptions(options);
  }
  const RVPermissionSet* allPermissionsInCategory(const std::optional<std::string_view>& category) const {
    return plugin._allPermissionsInCategory(category);
  }
  RVPermissionSet allReadPermissions() const { return plugin._allReadPermissions(); }
  RVPermissionSet userProfileReadPermissions() const { return plugin._userProfileReadPermissions(); }
  void getServerAuthorizationForClient(const std::shared_ptr<const RVDClient>& client,
                                       const std::string& appID,
                                       const std::optional<RVPermissionSet>& permissions,
                                       const std::optional<std::string>& audience,
                                       const std::shared_ptr<RVAccount>& account,
                                       const ServerCompletion& completion) const {
    plugin._getServerAuthorizationForClient(client, appID, permissions, audience, account, completion);
  }
  std::optional<std::string> serverAudienceStringForAudience(
      const std::optional<std::string>& audience) const {
    return plugin._serverAudienceStringForAudience(audience);
  }
  void saveCredentialForClient(const RVDClient& client,
                               RVAccount& account,
                               const std::optional<RVSecret>& accessToken) const {
    plugin._saveCredentialForClient(client, account, accessToken);
  }
  std::string csvStringFromSet(const RVPermissionSet& set) const { return plugin._csvStringFromSet(set); }

  const RVPermissionSet& permissionCategories() const { return plugin.permissionCategories_; }
  bool basicReadPermissionsAreFilled() const { return plugin.basicReadPermissions_.names != nullptr; }
  bool extendedReadPermissionsAreFilled() const { return plugin.extendedReadPermissions_.names != nullptr; }
  bool writePermissionsAreFilled() const { return plugin.writePermissions_.names != nullptr; }
  bool managePermissionsAreFilled() const { return plugin.managePermissions_.names != nullptr; }

  // Puts the process back to where no plug-in object has read a preference yet. Not while one is at work.
  static void forgetPreferencesQueue() {
    TKFacebookAccountAccessPlugin::preferencesState() =
        std::make_unique<TKFacebookAccountAccessPlugin::PreferencesState>();
  }
};
