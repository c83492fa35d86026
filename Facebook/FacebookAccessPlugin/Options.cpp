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
  if (appID == nullptr || appID->string() == nullptr || appID->string()->empty()) return false;

  const RVArray* permissions = permissionList(options);
  if (permissions == nullptr) return RVValueForKey(options, RVFacebookPermissionsKey) == nullptr;

  const bool writes = std::any_of(permissions->begin(), permissions->end(), [&](const RVValue& permission) {
    return permission.string() != nullptr && _writePermissions().contains(*permission.string());
  });
  if (!writes) return true;
  const RVValue* audience = RVValueForKey(options, RVFacebookAudienceKey);
  return audience != nullptr && audience->string() != nullptr;
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
