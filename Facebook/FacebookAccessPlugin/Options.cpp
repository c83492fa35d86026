// Reading and checking the options of a request.
#include <algorithm>
#include <initializer_list>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"

namespace {

std::optional<std::string> stringForKey(const RVDictionary& options, std::string_view key) {
  const RVValue* value = RVValueForKey(options, key);
  if (value == nullptr || value->string() == nullptr) return std::nullopt;
  return *value->string();
}

// The list of permissions, or a null pointer where the options hold none, or something else in its place.
const RVArray* permissionList(const RVDictionary& options) {
  const RVValue* value = RVValueForKey(options, RVFacebookPermissionsKey);
  return value != nullptr ? value->array() : nullptr;
}

}  // namespace

bool TKFacebookAccountAccessPlugin::_validateOptionsDictionary(const RVDictionary& options) const {
  const RVValue* appID = RVValueForKey(options, RVFacebookAppIdKey);
  const bool hasAppID = appID != nullptr && appID->string() != nullptr && !appID->string()->empty();

  const RVArray* permissions = permissionList(options);
  const bool hasNothingElseForAList =
      permissions != nullptr || RVValueForKey(options, RVFacebookPermissionsKey) == nullptr;

  static const RVArray kNone;
  const RVArray& requested = permissions != nullptr ? *permissions : kNone;
  const RVPermissionSet& writePermissions = _writePermissions();
  const bool writes = std::any_of(requested.begin(), requested.end(), [&](const RVValue& permission) {
    return permission.string() != nullptr && writePermissions.contains(*permission.string());
  });
  const RVValue* audience = RVValueForKey(options, RVFacebookAudienceKey);
  const bool hasAudience = audience != nullptr && audience->string() != nullptr;

  return hasAppID && hasNothingElseForAList && (hasAudience || !writes);
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_appIDFromOptionsDictionary(
    const RVDictionary& options) const {
  return stringForKey(options, RVFacebookAppIdKey);
}

RVPermissionSet TKFacebookAccountAccessPlugin::_permissionsFromOptionsDictionary(
    const RVDictionary& options) const {
  return permissionNames(permissionList(options));
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_audienceFromOptionsDictionary(
    const RVDictionary& options) const {
  return stringForKey(options, RVFacebookAudienceKey);
}

RVDictionary TKFacebookAccountAccessPlugin::_persistentDictionaryForOptions(
    const RVDictionary& options) const {
  RVDictionary persistent;
  for (const std::string_view key : {RVFacebookAppIdKey, RVFacebookAudienceKey}) {
    if (const RVValue* value = RVValueForKey(options, key)) persistent.emplace(key, *value);
  }
  return persistent;
}

RVPermissionSet TKFacebookAccountAccessPlugin::permissionNames(const RVArray* list) {
  RVPermissionSet names;
  if (list == nullptr) return names;
  for (const RVValue& element : *list) {
    if (const std::string* name = element.string()) names.insert(*name);
  }
  return names;
}
