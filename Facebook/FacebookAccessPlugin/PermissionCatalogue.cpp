// The Facebook permissions that the plug-in knows, by category.
#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"

namespace {

constexpr std::string_view kBasicRead[] = {
    "basic_info",
    "friends",
    "user_location",
    "user_birthday",
    "current_city",
    "email",
};

constexpr std::string_view kExtendedRead[] = {
    "user_checkins",
    "friends_checkins",
    "user_events",
    "friends_events",
    "user_groups",
    "friends_groups",
    "user_likes",
    "friends_likes",
    "user_notes",
    "friends_notes",
    "user_photos",
    "friends_photos",
    "user_status",
    "friends_status",
    "user_videos",
    "friends_videos",
    "user_questions",
    "friends_questions",
    "read_friendlists",
    "read_requests",
    "read_mailbox",
    "read_stream",
    "read_insights",
    "user_online_presence",
    "friends_online_presence",
    "user_relationships",
    "friends_relationships",
    "user_relationship_details",
    "friends_relationship_details",
    "user_religion_politics",
    "friends_religion_politics",
    "user_about_me",
    "friends_about_me",
    "user_activities",
    "friends_activities",
    "friends_birthday",
    "user_education_history",
    "friends_education_history",
    "user_hometown",
    "friends_hometown",
    "user_interests",
    "friends_interests",
    "user_subscriptions",
    "friends_subscriptions",
    "user_website",
    "friends_website",
    "user_work_history",
    "friends_work_history",
    "friends_location",
};

constexpr std::string_view kWrite[] = {
    "publish_actions",
    "publish_stream",
    "publish_checkins",
    "publish",
};

constexpr std::string_view kManage[] = {
    "ads_management",
    "create_event",
    "rsvp_event",
    "xmpp_login",
    "manage_friendlists",
    "manage_notifications",
    "manage_pages",
};

constexpr std::string_view kUserProfileRead[] = {
    "user_about_me",
    "user_activities",
    "user_education_history",
    "user_hometown",
    "user_interests",
    // One name, not two: what a request for either part says of the basic profile depends on neither
    // being in this list.
    "user_subscriptionsuser_website",
    "user_work_history",
};

RVPermissionSet setOf(std::span<const std::string_view> literals) {
  return {literals.begin(), literals.end()};
}

}  // namespace

const RVPermissionSet* TKFacebookAccountAccessPlugin::_allPermissionsInCategory(
    const std::optional<std::string_view>& category) const {
  if (category == TKFacebookPermissionCategoryBasicRead) return &_basicReadPermissions();
  if (category == TKFacebookPermissionCategoryExtendedRead) return &_extendedReadPermissions();
  if (category == TKFacebookPermissionCategoryWrite) return &_writePermissions();
  if (category == TKFacebookPermissionCategoryManage) return &_managePermissions();
  return nullptr;
}

const RVPermissionSet& TKFacebookAccountAccessPlugin::_basicReadPermissions() const {
  return basicReadPermissions_.filledWith(kBasicRead);
}

const RVPermissionSet& TKFacebookAccountAccessPlugin::_extendedReadPermissions() const {
  return extendedReadPermissions_.filledWith(kExtendedRead);
}

const RVPermissionSet& TKFacebookAccountAccessPlugin::_writePermissions() const {
  return writePermissions_.filledWith(kWrite);
}

const RVPermissionSet& TKFacebookAccountAccessPlugin::_managePermissions() const {
  return managePermissions_.filledWith(kManage);
}

RVPermissionSet TKFacebookAccountAccessPlugin::_allReadPermissions() const {
  RVPermissionSet all = _extendedReadPermissions();
  const RVPermissionSet& basic = _basicReadPermissions();
  all.insert(basic.begin(), basic.end());
  return all;
}

RVPermissionSet TKFacebookAccountAccessPlugin::_userProfileReadPermissions() const {
  return setOf(kUserProfileRead);
}

const RVPermissionSet& TKFacebookAccountAccessPlugin::LazyList::filledWith(
    std::span<const std::string_view> literals) {
  std::call_once(filled, [&] { names = std::make_unique<const RVPermissionSet>(setOf(literals)); });
  return *names;
}
