// The words of the consent message: what a permission opens, whom a post reaches, and lists of such words.
#include <algorithm>
#include <string>
#include <utility>
#include <vector>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "Facebook/FacebookAccessPlugin/UpperCase.h"
#include "Facebook/FacebookAccessPlugin/WordList.h"

namespace {

// Begins the permissions that read what belongs to the user's friends.
constexpr std::string_view kFriendsPrefix = "friends_";

void addIfPresent(RVPermissionSet& names, std::optional<std::string> name) {
  if (name) names.insert(*std::move(name));
}

}  // namespace

std::string TKFacebookAccountAccessPlugin::localizedText(std::string_view key) const {
  return localized(key).value_or(std::string(key));
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_objectNameForReadPermission(
    std::string_view permission) const {
  return localized("FACEBOOK_READ_PERMISSION_" + upperCased(permission));
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_objectNameForManagePermission(
    std::string_view permission) const {
  return localized("FACEBOOK_MANAGE_PERMISSION_" + upperCased(permission));
}

std::string TKFacebookAccountAccessPlugin::_userFriendlyAudienceString(
    const std::optional<std::string>& audience) const {
  if (audience == RVFacebookAudienceFriends) return localizedText("POST_TO_FRIENDS");
  if (audience == RVFacebookAudienceOnlyMe) return localizedText("POST_PRIVATELY");
  return localizedText("POST_PUBLICALLY");
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_userObjectsRequestedByPermissions(
    const RVPermissionSet& permissions) const {
  RVPermissionSet names;
  // A request for fields of the profile is described by those fields alone.
  if (!intersects(permissions, _userProfileReadPermissions()) &&
      intersects(permissions, _basicReadPermissions())) {
    addIfPresent(names, _objectNameForReadPermission("basic_profile"));
    addIfPresent(names, _objectNameForReadPermission("friends"));
  }
  for (const std::string& permission : permissions) {
    if (_extendedReadPermissions().contains(permission) && !permission.starts_with(kFriendsPrefix))
      addIfPresent(names, _objectNameForReadPermission(permission));
  }
  if (names.empty()) return std::nullopt;
  return _commaSeparatedListWithFormat("ACCOUNT_ACCESS_EXTENDED_READ_USER", names);
}

std::optional<std::string> TKFacebookAccountAccessPlugin::_friendObjectsRequestedByPermissions(
    const RVPermissionSet& permissions) const {
  RVPermissionSet names;
  for (const std::string& permission : permissions) {
    if (permission.starts_with(kFriendsPrefix)) addIfPresent(names, _objectNameForReadPermission(permission));
  }
  if (names.empty()) return std::nullopt;
  return _commaSeparatedListWithFormat("ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS", names);
}

std::string TKFacebookAccountAccessPlugin::_commaSeparatedListWithFormat(
    std::string_view format,
    const RVPermissionSet& objectNames) const {
  if (objectNames.size() == 1) return localizedFormat(format, {*objectNames.begin()});

  const std::string pluralFormat = localizedText(std::string(format) + "_MULTIPLE");
  RVPermissionSet others = objectNames;
  std::vector<std::string> list;
  const auto basicProfile = _objectNameForReadPermission("basic_profile");
  const auto friendList = _objectNameForReadPermission("friends");
  if (basicProfile && others.erase(*basicProfile) > 0) list.push_back(*basicProfile);
  if (friendList && objectNames.contains(*friendList)) {
    list.push_back(*friendList);
    others.erase(*friendList);
  }
  list.insert(list.end(), others.begin(), others.end());

  const std::string last = list.back();
  std::erase(list, last);
  return services_.stringTable->stringWithFormat(pluralFormat,
                                                 {joined(list, localizedText("WORD_LIST_SEPARATOR")), last});
}
