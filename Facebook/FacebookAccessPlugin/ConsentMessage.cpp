// The sentence of the alert, and the description of permissions that the server alone knows.
#include <algorithm>
#include <iterator>
#include <memory>
#include <semaphore>
#include <string>
#include <utility>

#include "Facebook/FacebookAccessPlugin/Owed.h"
#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "Facebook/FacebookAccessPlugin/WordList.h"

namespace {

RVPermissionSet intersection(const RVPermissionSet& permissions, const RVPermissionSet& others) {
  RVPermissionSet both;
  std::set_intersection(
      permissions.begin(), permissions.end(), others.begin(), others.end(), std::inserter(both, both.end()));
  return both;
}

RVValue asValue(const RVPermissionSet& permissions) {
  return RVArray(permissions.begin(), permissions.end());
}

// What the server says of permissions that it does not know.
constexpr std::string_view kServerParameterError = "API_EC_PARAM";

// The answer to one description request, on its way from the thread that it arrives on.
struct PendingDescription {
  std::binary_semaphore arrived{0};
  std::optional<std::string> text;  // written before `arrived` is released
};

}  // namespace

std::optional<std::string> TKFacebookAccountAccessPlugin::_constructUserMessageForPermissions(
    const RVPermissionSet& permissions,
    const std::optional<std::string>& audience,
    const std::string& appName,
    const std::shared_ptr<RVAccount>& account) const {
  constexpr std::string_view kFunction =
      "-[TKFacebookAccountAccessPlugin _constructUserMessageForPermissions:audience:appName:account:]";
  log(kRVLogLevelDebug, kFunction, "Generating user message for permission: %@.", {asValue(permissions)});

  Arguments sentence{appName};  // and the clauses: reading, posting, managing
  const auto addClause = [&](const RVPermissionSet& part, std::string_view category) {
    if (const auto clause = _predicateForPermissions(part, category, audience))
      sentence.emplace_back(*clause);
  };
  bool onlyReads = true;
  const RVPermissionSet read = intersection(permissions, _allReadPermissions());
  if (!read.empty()) addClause(read, TKFacebookPermissionCategoryExtendedRead);
  for (const auto category : {TKFacebookPermissionCategoryWrite, TKFacebookPermissionCategoryManage}) {
    const RVPermissionSet part = intersection(permissions, *_allPermissionsInCategory(category));
    if (part.empty()) continue;
    addClause(part, category);
    onlyReads = false;
  }

  RVPermissionSet unknown = permissions;
  for (const RVPermissionSet* known :
       {&_basicReadPermissions(), &_extendedReadPermissions(), &_writePermissions(), &_managePermissions()}) {
    for (const std::string& permission : *known) unknown.erase(permission);
  }
  if (!unknown.empty()) {
    log(kRVLogLevelDebug, kFunction, "Unknown permissions were requested!");
    onlyReads = false;
  }

  constexpr std::string_view kFrames[] = {"ACCOUNT_ACCESS_BASIC_MESSAGE",
                                          "ACCOUNT_ACCESS_ONE_PERMISSION_FORMAT",
                                          "ACCOUNT_ACCESS_TWO_PERMISSION_FORMAT",
                                          "ACCOUNT_ACCESS_THREE_PERMISSION_FORMAT"};
  const std::size_t clauses = sentence.size() - 1;
  std::optional<std::string> message;
  if (clauses == 1 && onlyReads)
    message = localizedFormat("ACCOUNT_ACCESS_ONE_PERMISSION_SHORT_FORMAT", sentence);
  else if (clauses > 0 || unknown.empty())
    message = localizedFormat(kFrames[clauses], sentence);
  if (!unknown.empty())
    message = _appendDescriptionOfUnknownPermissions(unknown, message, appName, audience, account);
  if (!message) {
    log(kRVLogLevelDebug,
        kFunction,
        "Something went wrong and we ended up with a nil user message. Falling back to default.");
  }
  return message;
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_predicateForPermissions(
    const RVPermissionSet& permissions,
    const std::optional<std::string_view>& category,
    const std::optional<std::string>& audience) const {
  if (category == TKFacebookPermissionCategoryBasicRead ||
      category == TKFacebookPermissionCategoryExtendedRead) {
    const auto userObjects = _userObjectsRequestedByPermissions(permissions);
    const auto friendObjects = _friendObjectsRequestedByPermissions(permissions);
    if (userObjects && friendObjects)
      return localizedFormat("ACCOUNT_ACCESS_EXTENDED_READ_MULTIPLE", {*userObjects, *friendObjects});
    if (userObjects) return localizedFormat("ACCOUNT_ACCESS_EXTENDED_READ", {*userObjects});
    if (friendObjects) return localizedFormat("ACCOUNT_ACCESS_EXTENDED_READ", {*friendObjects});
    return std::nullopt;
  }
  if (category == TKFacebookPermissionCategoryWrite)
    return localizedFormat("ACCCOUNT_ACCESS_WRITE", {_userFriendlyAudienceString(audience)});
  if (category == TKFacebookPermissionCategoryManage) {
    RVPermissionSet names;
    for (const std::string& permission : permissions) {
      if (auto name = _objectNameForManagePermission(permission)) names.insert(*std::move(name));
    }
    if (names.empty()) return std::nullopt;
    if (names.size() == 1) return localizedFormat("ACCOUNT_ACCESS_MANAGE", {*names.begin()});
    const std::string last = *names.rbegin();
    names.erase(last);
    return localizedFormat("ACCOUNT_ACCESS_MANAGE_MULTIPLE",
                           {joined(names, localizedText("WORD_LIST_SEPARATOR")), last});
  }
  return std::nullopt;
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_appendDescriptionOfUnknownPermissions(
    const RVPermissionSet& permissions,
    const std::optional<std::string>& userMessage,
    const std::string& appName,
    const std::optional<std::string>& audience,
    const std::shared_ptr<RVAccount>& account) const {
  const auto description = _fetchDescriptionForUnknownPermissions(permissions, audience, account);
  if (!description || description->empty()) return std::nullopt;
  if (userMessage)
    return *userMessage + " " + localizedFormat("ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT", {*description});
  return localizedFormat("ACCOUNT_ACCESS_UNKNOWN_FORMAT", {appName, *description});
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_fetchDescriptionForUnknownPermissions(
    const RVPermissionSet& permissions,
    const std::optional<std::string>& audience,
    const std::shared_ptr<RVAccount>& account) const {
  static constexpr std::string_view kFunction =
      "-[TKFacebookAccountAccessPlugin _fetchDescriptionForUnknownPermissions:audience:account:]";
  const auto request = services_.facebookRequests->initWithPermissions(
      permissions, _serverAudienceStringForAudience(audience));
  const auto credential = services_.keychainManager->credentialForAccount(*account, std::nullopt);
  request->setAccessToken(credential ? std::optional(credential->oauthToken()) : std::nullopt);

  const auto read = [this, permissions](const std::optional<std::string>& body,
                                        const std::optional<RVError>& error) -> std::optional<std::string> {
    const auto textOf = [](const std::optional<RVError>& reason) {
      return reason ? reason->localizedDescription() : std::nullopt;
    };
    if (error || !body) {
      log(kRVLogLevelError,
          kFunction,
          "Error contacting Facebook server for permission description: %@",
          {textOf(error)});
      return std::nullopt;
    }
    const RVJSONResult answer = services_.jsonReader->objectWithData(*body);
    const std::string* description = answer.value ? answer.value->string() : nullptr;
    if (answer.error || description == nullptr) {
      log(kRVLogLevelError, kFunction, "Could not parse server response: %@.", {textOf(answer.error)});
      return std::nullopt;
    }
    log(kRVLogLevelDebug,
        kFunction,
        "Server description for %@ was: %@",
        {asValue(permissions), *description});
    if (*description == kServerParameterError) return std::nullopt;
    return *description;
  };

  const auto pending = std::make_shared<PendingDescription>();
  Owed<void()> arrived([pending] { pending->arrived.release(); });
  // The handler takes the debt with it, so that a handler that goes unused ends the wait as well.
  request->performRequestWithHandler(
      [read, pending, arrived = std::move(arrived)](const std::optional<std::string>& body,
                                                    const std::optional<TKHTTPResponse>&,
                                                    const std::optional<RVError>& error) {
        pending->text = read(body, error);
        arrived();
      });
  pending->arrived.acquire();
  return pending->text;
}
