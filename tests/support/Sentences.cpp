#include "tests/support/Sentences.h"

#include <utility>

#include "tests/support/PluginTestAccess.h"

namespace support {
namespace {

using Access = TKFacebookAccountAccessPluginTestAccess;

constexpr const char* kUnknownPermission = "play_music";

const std::vector<std::optional<std::string>>& audiences() {
  static const std::vector<std::optional<std::string>> all = {std::string(RVFacebookAudienceEveryone),
                                                              std::string(RVFacebookAudienceFriends),
                                                              std::string(RVFacebookAudienceOnlyMe),
                                                              std::nullopt};
  return all;
}

const std::vector<RVPermissionSet>& readingRequests() {
  static const std::vector<RVPermissionSet> requests = {
      {},
      {"email"},
      {"user_about_me"},
      {"email", "user_about_me"},
      {"email", "user_photos"},
      {"user_photos"},
      {"read_mailbox", "user_photos"},
      {"read_friendlists", "user_events", "user_religion_politics", "user_status"},
      {"friends_photos"},
      {"friends_birthday", "friends_photos"},
      {"friends_birthday", "friends_photos", "friends_relationships", "friends_status"},
      {"email", "friends_photos"},
      {"user_photos", "friends_photos"},
      {"user_photos", "user_videos", "friends_photos"},
      {"user_photos", "friends_photos", "friends_videos"},
      {"email", "user_photos", "user_videos", "friends_likes", "friends_photos", "friends_videos"},
  };
  return requests;
}

const std::vector<RVPermissionSet>& managingRequests() {
  static const std::vector<RVPermissionSet> requests = {
      {},
      {"manage_pages"},
      {"create_event", "rsvp_event"},
      {"ads_management",
       "create_event",
       "manage_friendlists",
       "manage_notifications",
       "manage_pages",
       "rsvp_event",
       "xmpp_login"},
  };
  return requests;
}

}  // namespace

SentenceMaker::SentenceMaker(const std::string& language)
    : table_(RVD_PLUGIN_RESOURCES, {language}, host_.log) {
  RVDHostServices services = host_.services();
  services.stringTable = &table_;
  plugin_ = TKFacebookAccountAccessPlugin::init(services);
  setDescription("It plays the music that you and your friends like.");
}

void SentenceMaker::setDescription(const std::string& description) {
  host_.facebookRequests.replyToDescriptions({fakes::FakeReply::withBody("\"" + description + "\"")});
}

std::optional<AlertTexts> SentenceMaker::alertFor(const ConsentRequest& request) {
  const auto account = std::make_shared<fakes::FakeAccount>();
  const std::size_t before = host_.userNotifications.alerts().size();
  Access{*plugin_}.promptUserToApproveRequestForPermissions(
      request.permissions, request.audience, host_.makeClient(), account, [](bool, bool, const auto&) {});
  const auto alerts = host_.userNotifications.alerts();
  if (alerts.size() == before) return std::nullopt;
  const auto text = [&](std::string_view key) {
    return *RVValueForKey(alerts.back().description, key)->string();
  };
  return AlertTexts{text(kZQUserNotificationAlertHeaderKey),
                    text(kZQUserNotificationAlertMessageKey),
                    text(kZQUserNotificationDefaultButtonTitleKey),
                    text(kZQUserNotificationAlternateButtonTitleKey)};
}

std::vector<ConsentRequest> everyCombination() {
  std::vector<ConsentRequest> combinations;
  const auto add = [&](bool unknown,
                       const RVPermissionSet& managing,
                       const RVPermissionSet& posting,
                       const std::optional<std::string>& audience) {
    for (const RVPermissionSet& reading : readingRequests()) {
      ConsentRequest request{reading, audience};
      request.permissions.insert(posting.begin(), posting.end());
      request.permissions.insert(managing.begin(), managing.end());
      if (unknown) request.permissions.insert(kUnknownPermission);
      combinations.push_back(std::move(request));
    }
  };
  for (const bool unknown : {false, true}) {
    for (const RVPermissionSet& managing : managingRequests()) {
      add(unknown, managing, {}, std::nullopt);
      for (const auto& audience : audiences()) add(unknown, managing, {"publish_stream"}, audience);
    }
  }
  return combinations;
}

std::vector<ConsentRequest> everyPermissionAlone() {
  fakes::FakeHost host;
  const auto plugin = TKFacebookAccountAccessPlugin::init(host.services());
  const Access access{*plugin};
  std::vector<ConsentRequest> requests;
  for (const auto* list :
       {&access.basicReadPermissions(), &access.extendedReadPermissions(), &access.managePermissions()}) {
    for (const std::string& permission : *list) requests.push_back({{permission}, std::nullopt});
  }
  for (const std::string& permission : access.writePermissions()) {
    for (const auto& audience : audiences()) requests.push_back({{permission}, audience});
  }
  return requests;
}

}  // namespace support
