// Decides which applications may use the device's Facebook account, and with which permissions.
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "host/RVDAccountAccessPlugin.h"

// The categories of Facebook permissions. Nothing belongs to the category "unknown": a permission is
// unknown when no other category holds it.
inline constexpr std::string_view TKFacebookPermissionCategoryUnknown = "unknown";
inline constexpr std::string_view TKFacebookPermissionCategoryBasicRead = "basic-read";
inline constexpr std::string_view TKFacebookPermissionCategoryExtendedRead = "extended-read";
inline constexpr std::string_view TKFacebookPermissionCategoryWrite = "write";
inline constexpr std::string_view TKFacebookPermissionCategoryManage = "manage";

// One object serves the daemon for the life of the process, from any number of threads. It keeps no
// state between calls but the permission lists, each filled once, when it is first asked for. Handlers
// that wait for the server point back to the object, which therefore outlives its calls (see
// RVDAccountAccessPlugin); a handler that is dropped unused does not touch it any more.
//
// Operations whose names begin with an underscore are the class's own; the comment above each gives its
// whole name, which is also the function name of its log lines.
class TKFacebookAccountAccessPlugin final : public RVDAccountAccessPlugin {
 public:
  // ---- The object, the account, the preference: TKFacebookAccountAccessPlugin.cpp ----

  // supportsAccountTypeWithIdentifier:
  // Whether the identifier is exactly that of Facebook accounts. An absent one is not.
  static bool supportsAccountTypeWithIdentifier(const std::optional<std::string>& identifier);

  // init
  // Null where a service is missing, since the object could then only fail later, in the middle of a
  // request.
  static std::unique_ptr<TKFacebookAccountAccessPlugin> init(const RVDHostServices& services);

  // Fills the category names and nothing else. services: all of them, outliving the object; preferences,
  // serial queues and notifications outlive the process's last use of any object of this class.
  explicit TKFacebookAccountAccessPlugin(const RVDHostServices& services);

  // ---- The daemon's calls; the contracts are in RVDAccountAccessPlugin.h. The request: AccessRequest.cpp;
  // the direct calls: DirectAccess.cpp ----

  // handleAccessRequestToAccountsOfType:forClient:withOptions:store:allowUserInteraction:completion:
  // allowUserInteraction is not looked at: a request that needs the user's consent asks for it.
  void handleAccessRequestToAccountsOfType(std::shared_ptr<const RVAccountType> accountType,
                                           std::shared_ptr<const RVDClient> client,
                                           const RVDictionary& options,
                                           std::shared_ptr<RVDAccountStore> store,
                                           bool allowUserInteraction,
                                           RVDAccessCompletion completion) override;

  // authorizeAccessToAccountsOfType:forClient:store:completion:
  void authorizeAccessToAccountsOfType(std::shared_ptr<const RVAccountType> accountType,
                                       std::shared_ptr<const RVDClient> client,
                                       std::shared_ptr<RVDAccountStore> store,
                                       RVDAccessCompletion completion) override;

  // revokeAccessToAccountsOfType:forClient:store:completion:
  void revokeAccessToAccountsOfType(std::shared_ptr<const RVAccountType> accountType,
                                    std::shared_ptr<const RVDClient> client,
                                    std::shared_ptr<RVDAccountStore> store,
                                    RVDAccessCompletion completion) override;

  // revokeAllAccessToAccountsOfType:store:withCompletion:
  void revokeAllAccessToAccountsOfType(std::shared_ptr<const RVAccountType> accountType,
                                       std::shared_ptr<RVDAccountStore> store,
                                       RVDAccessCompletion completion) override;

 private:
  friend struct TKFacebookAccountAccessPluginTestAccess;

  using Arguments = std::vector<std::optional<RVValue>>;

  // The outcome of an exchange with the server: whether it issued a token; the permissions that it
  // reports as granted, as it sent them, absent where it sent no list; why not.
  using ServerCompletion = std::function<void(bool success,
                                              const std::optional<RVArray>& grantedPermissions,
                                              const std::optional<RVError>& error)>;

  // The answer to a prompt: whether the user allowed it; whether to leave the server out (never, from a
  // prompt); the permissions that the prompt was about, absent where no alert could be shown.
  using PromptCompletion =
      std::function<void(bool allowed, bool skipServer, const std::optional<RVPermissionSet>& permissions)>;

  // ---- The object, the account, the preference: TKFacebookAccountAccessPlugin.cpp ----

  // _accountOfType:withStore:
  // The store's first account of the type, with the account type attached to it; null where there is none.
  std::shared_ptr<RVAccount> _accountOfType(const std::shared_ptr<const RVAccountType>& type,
                                            RVDAccountStore& store) const;

  // _shouldIgnoreAccessRequest
  // Whether the user has set the preference to ignore access requests. Waits for the preferences queue.
  // The first call in the process has the preferences read anew whenever the environment changes.
  bool _shouldIgnoreAccessRequest() const;

  // What the process has one of, however many objects of the class there are: the queue on which
  // preferences are read, and the registration for changes of the environment. Never released.
  struct PreferencesState {
    std::mutex mutex;  // guards the first use of each
    std::shared_ptr<ZQSerialQueue> queue;
    std::optional<int> registrationToken;
  };
  static std::unique_ptr<PreferencesState>& preferencesState();

  // ---- Requests and the user's answer: AccessRequest.cpp ----

  // _handleUserResponse:toRequestForClient:withAppID:persistentOptions:onAccount:ofType:existingPermissions:newPermissions:audience:isFirstTimeRequest:shouldSkipServer:store:completion:
  // Turns the answer of the user into the request's outcome. account: null only where shouldSkipServer.
  // isFirstTimeRequest: despite its name, true when the client already held a grant, which a refusal
  // then leaves as it is.
  void _handleUserResponse(bool response,
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
                           const RVDAccessCompletion& completion) const;

  // The permissions that an earlier grant already gives a request: none for another app ID, and none to
  // write where the audience has changed.
  RVPermissionSet creditForRequest(const RVDClientAuthorization& authorization,
                                   const std::optional<std::string>& appID,
                                   const RVPermissionSet& requestedPermissions,
                                   const std::optional<std::string>& audience) const;

  // ---- Direct calls: DirectAccess.cpp ----

  // What the server grants the application now; waits for its answer. Empty where it grants nothing or
  // gives no answer.
  RVPermissionSet permissionsGrantedByServer(const std::shared_ptr<const RVDClient>& client,
                                             const std::string& appID,
                                             const std::shared_ptr<RVAccount>& account) const;

  // The app ID that the record remembers.
  std::optional<std::string> appIDOf(const RVDClientAuthorization& authorization) const;

  // Has the client's token invalidated and its credential removed, where the record names an app ID.
  // session: gives the session to use; asked only then.
  void revokeToken(std::string_view functionName,
                   const RVDClientAuthorization& authorization,
                   const RVDClient& client,
                   const RVAccount& account,
                   const std::function<std::shared_ptr<TKFacebookSession>()>& session) const;

  // ---- The options of a request: Options.cpp ----

  // _validateOptionsDictionary:
  // Whether there is an app ID, the permissions (if any) are a list, and an audience is given where a
  // write permission is among them.
  bool _validateOptionsDictionary(const RVDictionary& options) const;

  // _appIDFromOptionsDictionary:
  // The app ID where it is a string, an empty one included; absent otherwise.
  std::optional<std::string> _appIDFromOptionsDictionary(const RVDictionary& options) const;

  // _permissionsFromOptionsDictionary:
  // The names in the list; the empty set where there is no list.
  RVPermissionSet _permissionsFromOptionsDictionary(const RVDictionary& options) const;

  // _audienceFromOptionsDictionary:
  // The audience where it is a string, of whatever text; absent otherwise.
  std::optional<std::string> _audienceFromOptionsDictionary(const RVDictionary& options) const;

  // _persistentDictionaryForOptions:
  // What of the options is kept with a grant: app ID and audience, as they are.
  RVDictionary _persistentDictionaryForOptions(const RVDictionary& options) const;

  // ---- The permissions that are known: PermissionCatalogue.cpp ----
  // A list is owned by this object; the references stay valid as long as it lives.

  // _allPermissionsInCategory:
  // The category's list, the same on every call; null for any other name.
  const RVPermissionSet* _allPermissionsInCategory(const std::optional<std::string_view>& category) const;

  // _basicReadPermissions
  const RVPermissionSet& _basicReadPermissions() const;

  // _extendedReadPermissions
  const RVPermissionSet& _extendedReadPermissions() const;

  // _writePermissions
  const RVPermissionSet& _writePermissions() const;

  // _managePermissions
  const RVPermissionSet& _managePermissions() const;

  // _allReadPermissions
  // A new set of basic and extended read permissions, the caller's own.
  RVPermissionSet _allReadPermissions() const;

  // _userProfileReadPermissions
  // A new set of the permissions that read the user's profile fields.
  RVPermissionSet _userProfileReadPermissions() const;

  // ---- The consent message: ConsentMessage.cpp ----

  // _constructUserMessageForPermissions:audience:appName:account:
  // The sentence that tells the user what the application will be able to do; absent where some of it
  // could not be put into words. Waits for the server where permissions are unknown.
  std::optional<std::string> _constructUserMessageForPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& audience,
      const std::string& appName,
      const std::shared_ptr<RVAccount>& account) const;

  // _predicateForPermissions:ofCategory:audience:
  // The clause of the sentence for one category's permissions; absent where there is nothing to say.
  std::optional<std::string> _predicateForPermissions(const RVPermissionSet& permissions,
                                                      const std::optional<std::string_view>& category,
                                                      const std::optional<std::string>& audience) const;

  // _objectNameForReadPermission:
  std::optional<std::string> _objectNameForReadPermission(std::string_view permission) const;

  // _objectNameForManagePermission:
  std::optional<std::string> _objectNameForManagePermission(std::string_view permission) const;

  // _userFriendlyAudienceString:
  // Who will see what is posted; an audience that is not known reads as everyone.
  std::string _userFriendlyAudienceString(const std::optional<std::string>& audience) const;

  // _userObjectsRequestedByPermissions:
  // The user's own things among what is to be read, as a phrase; absent where there is none.
  std::optional<std::string> _userObjectsRequestedByPermissions(const RVPermissionSet& permissions) const;

  // _friendObjectsRequestedByPermissions:
  // The same for the things of the user's friends.
  std::optional<std::string> _friendObjectsRequestedByPermissions(const RVPermissionSet& permissions) const;

  // _commaSeparatedListWithFormat:forObjectNames:
  // One name in the format, or several in the format's plural form: the basic profile first, the friend
  // list next, the others in byte order, the last one set apart. objectNames: not empty.
  std::string _commaSeparatedListWithFormat(std::string_view format,
                                            const RVPermissionSet& objectNames) const;

  // _appendDescriptionOfUnknownPermissions:toUserMessage:forAppWithName:audience:account:
  // The message with the server's description of the permissions after it, or made of it alone; absent
  // where there is no description, since consent to something unexplained is never asked for.
  std::optional<std::string> _appendDescriptionOfUnknownPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& userMessage,
      const std::string& appName,
      const std::optional<std::string>& audience,
      const std::shared_ptr<RVAccount>& account) const;

  // _fetchDescriptionForUnknownPermissions:audience:account:
  // The server's description; absent where it has none. Waits for the answer without limit.
  std::optional<std::string> _fetchDescriptionForUnknownPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& audience,
      const std::shared_ptr<RVAccount>& account) const;

  // ---- The alert: Prompt.cpp. Each calls its completion once, before it returns ----

  // _promptUserToApproveRequestForPermissions:withAudience:fromClient:account:completion:
  void _promptUserToApproveRequestForPermissions(const RVPermissionSet& permissions,
                                                 const std::optional<std::string>& audience,
                                                 const std::shared_ptr<const RVDClient>& client,
                                                 const std::shared_ptr<RVAccount>& account,
                                                 const PromptCompletion& completion) const;

  // _showAlertWithMessage:completion:
  void _showAlertWithMessage(const std::string& message,
                             const std::function<void(bool allowed)>& completion) const;

  // _showUserNotificationWithTitle:message:defaultButtonTitle:alternateButtonTitle:withCompletionBlock:
  // The completion must not keep the alert, which is null where none could be created.
  void _showUserNotificationWithTitle(
      const std::string& title,
      const std::string& message,
      const std::string& defaultButtonTitle,
      const std::string& alternateButtonTitle,
      const std::function<void(ZQUserNotificationRef notification, ZQResponseFlags responseFlags)>&
          completionBlock) const;

  // ---- The server and the token: ServerAuthorization.cpp ----

  // _getServerAuthorizationForClient:withAppID:permissions:audience:account:completion:
  // Has the server authorize the application, and stores the token that it issues before the completion
  // runs. Returns at once; the completion runs on the thread of the answer.
  void _getServerAuthorizationForClient(const std::shared_ptr<const RVDClient>& client,
                                        const std::string& appID,
                                        const std::optional<RVPermissionSet>& permissions,
                                        const std::optional<std::string>& audience,
                                        const std::shared_ptr<RVAccount>& account,
                                        const ServerCompletion& completion) const;

  // Judges the server's answer to that; pays the completion.
  void judgeAuthorizationAnswer(const std::optional<std::string>& body,
                                const std::optional<RVError>& error,
                                const RVDClient& client,
                                RVAccount& account,
                                const ServerCompletion& completion) const;

  // _serverAudienceStringForAudience:
  // The audience in the server's words; absent where it is none of the three that are known.
  std::optional<std::string> _serverAudienceStringForAudience(
      const std::optional<std::string>& audience) const;

  // _saveCredentialForClient:onAccount:usingAccessToken:
  // Keeps the token as the client's own credential, and leaves it on the account object. Does nothing
  // where there is no token.
  void _saveCredentialForClient(const RVDClient& client,
                                RVAccount& account,
                                const std::optional<RVSecret>& accessToken) const;

  // _csvStringFromSet:
  // The members joined by commas. Nothing here needs it; the daemon's other plug-ins offer it as well.
  std::string _csvStringFromSet(const RVPermissionSet& set) const;

  // ---- Shared by all of the above ----

  // Writes a line of the log, with the line of the call as its source line.
  void log(int level,
           std::string_view functionName,
           std::string_view format,
           const Arguments& arguments = {},
           int line = __builtin_LINE()) const;

  // An error of an access decision, with its text where there is one for a person.
  static RVError accessError(int code, std::optional<std::string> localizedDescription = std::nullopt);

  // The names in a list of permissions; the empty set for an absent list. An element of another type
  // names nothing.
  static RVPermissionSet permissionNames(const RVArray* list);

  // The text of this plug-in's string table for the key, absent only where the host has none at all.
  std::optional<std::string> localized(std::string_view key) const;

  // The same, with the key itself where the host has no table at all.
  std::string localizedText(std::string_view key) const;

  // The table's text for the key, filled with the arguments.
  std::string localizedFormat(std::string_view key, const Arguments& arguments) const;

  // One list of permissions, filled when it is first asked for.
  struct LazyList {
    std::once_flag filled;
    std::unique_ptr<const RVPermissionSet> names;

    const RVPermissionSet& filledWith(std::span<const std::string_view> literals);
  };

  RVDHostServices services_;

  RVPermissionSet permissionCategories_;
  mutable LazyList basicReadPermissions_;
  mutable LazyList extendedReadPermissions_;
  mutable LazyList writePermissions_;
  mutable LazyList managePermissions_;
};
