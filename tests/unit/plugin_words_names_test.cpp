// Names of what permissions open, phrases for audiences, and lists of names.
#include "tests/unit/plugin_words_fixture.h"

namespace plugin_tests {
namespace {

using testing::Each;
using testing::ElementsAre;
using testing::Field;
using testing::Optional;

using Lookup = fakes::FakeStringTable::Lookup;

class AnObjectName : public WordsTest {};

TEST_F(AnObjectName, OfAReadPermissionStandsUnderThePermissionInUpperCase) {
  host.stringTable.put("FACEBOOK_READ_PERMISSION_FRIENDS_PHOTOS", "photos");
  EXPECT_EQ(access.objectNameForReadPermission("friends_photos"), "photos");
}

TEST_F(AnObjectName, OfAManagePermissionStandsUnderThePermissionInUpperCase) {
  host.stringTable.put("FACEBOOK_MANAGE_PERMISSION_MANAGE_PAGES", "pages");
  EXPECT_EQ(access.objectNameForManagePermission("manage_pages"), "pages");
}

TEST_F(AnObjectName, HasAKeyForEachManagePermission) {
  const std::vector<std::pair<std::string, std::string>> keys = {
      {"ads_management", "FACEBOOK_MANAGE_PERMISSION_ADS_MANAGEMENT"},
      {"create_event", "FACEBOOK_MANAGE_PERMISSION_CREATE_EVENT"},
      {"rsvp_event", "FACEBOOK_MANAGE_PERMISSION_RSVP_EVENT"},
      {"xmpp_login", "FACEBOOK_MANAGE_PERMISSION_XMPP_LOGIN"},
      {"manage_friendlists", "FACEBOOK_MANAGE_PERMISSION_MANAGE_FRIENDLISTS"},
      {"manage_notifications", "FACEBOOK_MANAGE_PERMISSION_MANAGE_NOTIFICATIONS"},
      {"manage_pages", "FACEBOOK_MANAGE_PERMISSION_MANAGE_PAGES"},
  };
  for (const auto& [permission, key] : keys) EXPECT_EQ(access.objectNameForManagePermission(permission), key);
  EXPECT_EQ(access.managePermissions().size(), keys.size());
}

TEST_F(AnObjectName, IsLookedUpForAnyString) {
  EXPECT_EQ(access.objectNameForReadPermission(""), "FACEBOOK_READ_PERMISSION_");
  EXPECT_EQ(access.objectNameForReadPermission("manage_pages"), "FACEBOOK_READ_PERMISSION_MANAGE_PAGES");
  EXPECT_EQ(access.objectNameForManagePermission("made up"), "FACEBOOK_MANAGE_PERMISSION_MADE UP");
}

TEST_F(AnObjectName, KeepsTheDigitsOfThePermission) {
  EXPECT_EQ(access.objectNameForReadPermission("user_photos2x"), "FACEBOOK_READ_PERMISSION_USER_PHOTOS2X");
}

TEST_F(AnObjectName, IsUpperCasedInNoLanguageInParticular) {
  EXPECT_EQ(access.objectNameForReadPermission("straße_i"), "FACEBOOK_READ_PERMISSION_STRASSE_I");
  EXPECT_EQ(access.objectNameForManagePermission("ﬁle"), "FACEBOOK_MANAGE_PERMISSION_FILE");
}

TEST_F(AnObjectName, IsItsKeyWhereTheTableLacksIt) {
  EXPECT_EQ(access.objectNameForReadPermission("user_photos"), "FACEBOOK_READ_PERMISSION_USER_PHOTOS");
}

TEST_F(AnObjectName, IsAbsentWhereThereIsNoTable) {
  host.stringTable.setUnavailable();
  EXPECT_EQ(access.objectNameForReadPermission("user_photos"), std::nullopt);
  EXPECT_EQ(access.objectNameForManagePermission("manage_pages"), std::nullopt);
}

TEST_F(AnObjectName, IsLookedUpAnewEachTime) {
  access.objectNameForReadPermission("user_photos");
  host.stringTable.put("FACEBOOK_READ_PERMISSION_USER_PHOTOS", "photos");
  EXPECT_EQ(access.objectNameForReadPermission("user_photos"), "photos");
}

class AnAudiencePhrase : public WordsTest {};

TEST_F(AnAudiencePhrase, ForFriends) {
  EXPECT_EQ(access.userFriendlyAudienceString("friends"), "POST_TO_FRIENDS");
}

TEST_F(AnAudiencePhrase, ForTheUserAlone) {
  EXPECT_EQ(access.userFriendlyAudienceString("only_me"), "POST_PRIVATELY");
}

TEST_F(AnAudiencePhrase, ForEveryone) {
  EXPECT_EQ(access.userFriendlyAudienceString("everyone"), "POST_PUBLICALLY");
}

TEST_F(AnAudiencePhrase, ForAnAudienceThatIsNotKnownIsTheOneForEveryone) {
  for (const char* audience : {"acquaintances", "Friends", "friends ", "ONLY_ME", ""})
    EXPECT_EQ(access.userFriendlyAudienceString(audience), "POST_PUBLICALLY") << audience;
}

TEST_F(AnAudiencePhrase, ForNoAudienceIsTheOneForEveryone) {
  EXPECT_EQ(access.userFriendlyAudienceString(std::nullopt), "POST_PUBLICALLY");
}

TEST_F(AnAudiencePhrase, IsItsKeyWhereThereIsNoTable) {
  host.stringTable.setUnavailable();
  EXPECT_EQ(access.userFriendlyAudienceString("friends"), "POST_TO_FRIENDS");
  EXPECT_EQ(access.userFriendlyAudienceString("only_me"), "POST_PRIVATELY");
  EXPECT_EQ(access.userFriendlyAudienceString("everyone"), "POST_PUBLICALLY");
}

class TheUsersObjects : public WordsTest {};

TEST_F(TheUsersObjects, OfBasicPermissionsAreTheBasicProfileAndTheFriendList) {
  const std::string expected =
      "ACCOUNT_ACCESS_EXTENDED_READ_USER_MULTIPLE[" + basicProfile + "][" + friendList + "]";
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"email", "user_birthday"}), expected);
  for (const std::string& permission : access.basicReadPermissions())
    EXPECT_EQ(access.userObjectsRequestedByPermissions({permission}), expected) << permission;
}

TEST_F(TheUsersObjects, OfAProfileFieldLeaveBasicPermissionsUnmentioned) {
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"email", "user_about_me"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_USER[FACEBOOK_READ_PERMISSION_USER_ABOUT_ME]");
  for (const char* field : {"user_activities",
                            "user_education_history",
                            "user_hometown",
                            "user_interests",
                            "user_work_history"}) {
    const auto objects = access.userObjectsRequestedByPermissions({"email", "friends", field});
    ASSERT_TRUE(objects);
    EXPECT_THAT(*objects, testing::StartsWith("ACCOUNT_ACCESS_EXTENDED_READ_USER[")) << field;
  }
}

TEST_F(TheUsersObjects, CountNeitherSubscriptionsNorTheWebsiteAsProfileFields) {
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"email", "user_subscriptions", "user_website"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_USER_MULTIPLE[" + basicProfile + " + " + friendList +
                " + FACEBOOK_READ_PERMISSION_USER_SUBSCRIPTIONS]" +
                "[FACEBOOK_READ_PERMISSION_USER_WEBSITE]");
}

TEST_F(TheUsersObjects, CountTheirJoinedNameAsAProfileFieldWithoutAnObject) {
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"email", "user_subscriptionsuser_website"}),
            std::nullopt);
}

TEST_F(TheUsersObjects, OfExtendedPermissionsAloneDoNotMentionTheBasicProfile) {
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"user_photos"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_USER[FACEBOOK_READ_PERMISSION_USER_PHOTOS]");
}

TEST_F(TheUsersObjects, IncludeWhatReadPermissionsOpen) {
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"read_mailbox"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_USER[FACEBOOK_READ_PERMISSION_READ_MAILBOX]");
}

TEST_F(TheUsersObjects, LeaveOutWhatBelongsToFriends) {
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"friends_photos"}), std::nullopt);
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"friends_photos", "user_likes"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_USER[FACEBOOK_READ_PERMISSION_USER_LIKES]");
}

TEST_F(TheUsersObjects, LeaveOutWhatNoReadPermissionOpens) {
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"publish_stream", "manage_pages", "user_made_up"}),
            std::nullopt);
  EXPECT_EQ(access.userObjectsRequestedByPermissions({}), std::nullopt);
}

TEST_F(TheUsersObjects, WithOneNameForTwoPermissionsAreOneThing) {
  host.stringTable.put("FACEBOOK_READ_PERMISSION_USER_NOTES", "writings");
  host.stringTable.put("FACEBOOK_READ_PERMISSION_USER_STATUS", "writings");
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"user_notes", "user_status"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_USER[writings]");
}

TEST_F(TheUsersObjects, KeepANameThatIsEmpty) {
  host.stringTable.put("FACEBOOK_READ_PERMISSION_USER_NOTES", "");
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"user_notes"}), "ACCOUNT_ACCESS_EXTENDED_READ_USER[]");
}

TEST_F(TheUsersObjects, LeaveOutANameThatIsAbsent) {
  TableWithGaps table(host.stringTable,
                      {"FACEBOOK_READ_PERMISSION_USER_NOTES", "FACEBOOK_READ_PERMISSION_FRIENDS"});
  RVDHostServices services = host.services();
  services.stringTable = &table;
  const TKFacebookAccountAccessPlugin other(services);
  const TKFacebookAccountAccessPluginTestAccess otherAccess{other};
  EXPECT_EQ(otherAccess.userObjectsRequestedByPermissions({"email", "user_notes", "user_photos"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_USER_MULTIPLE[" + basicProfile +
                "][FACEBOOK_READ_PERMISSION_USER_PHOTOS]");
  EXPECT_EQ(otherAccess.userObjectsRequestedByPermissions({"user_notes"}), std::nullopt);
}

TEST_F(TheUsersObjects, AreAbsentWhereThereIsNoTable) {
  host.stringTable.setUnavailable();
  EXPECT_EQ(access.userObjectsRequestedByPermissions({"email", "user_photos"}), std::nullopt);
}

class TheFriendsObjects : public WordsTest {};

TEST_F(TheFriendsObjects, OfOnePermissionAreOneThing) {
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({"friends_photos"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS[FACEBOOK_READ_PERMISSION_FRIENDS_PHOTOS]");
}

TEST_F(TheFriendsObjects, OfSeveralPermissionsAreAList) {
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({"friends_photos", "friends_likes", "friends_videos"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS_MULTIPLE[FACEBOOK_READ_PERMISSION_FRIENDS_LIKES + "
            "FACEBOOK_READ_PERMISSION_FRIENDS_PHOTOS][FACEBOOK_READ_PERMISSION_FRIENDS_VIDEOS]");
}

TEST_F(TheFriendsObjects, DoNotIncludeTheUsersOwnFriendList) {
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({"friends"}), std::nullopt);
}

TEST_F(TheFriendsObjects, LeaveOutWhatIsTheUsersOwn) {
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({"email", "user_photos", "read_stream"}),
            std::nullopt);
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({}), std::nullopt);
}

TEST_F(TheFriendsObjects, AreKnownByTheBeginningOfThePermissionAlone) {
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({"friends_made_up"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS[FACEBOOK_READ_PERMISSION_FRIENDS_MADE_UP]");
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({"friends_"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS[FACEBOOK_READ_PERMISSION_FRIENDS_]");
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({"Friends_photos", "my_friends_photos"}),
            std::nullopt);
}

TEST_F(TheFriendsObjects, KeepANameThatIsEmpty) {
  host.stringTable.put("FACEBOOK_READ_PERMISSION_FRIENDS_NOTES", "");
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({"friends_notes"}),
            "ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS[]");
}

TEST_F(TheFriendsObjects, AreAbsentWhereThereIsNoTable) {
  host.stringTable.setUnavailable();
  EXPECT_EQ(access.friendObjectsRequestedByPermissions({"friends_photos"}), std::nullopt);
}

class AListOfNames : public WordsTest {
 protected:
  AListOfNames() {
    host.stringTable.put("KEY", "one <%@>");
    host.stringTable.put("KEY_MULTIPLE", "<%@> and <%@>");
    host.stringTable.put(basicProfile, "profile");
    host.stringTable.put(friendList, "list");
  }
  std::string list(const RVPermissionSet& names) { return access.commaSeparatedListWithFormat("KEY", names); }
};

TEST_F(AListOfNames, OfOneNameIsTheNameInTheFormat) {
  EXPECT_EQ(list({"photos"}), "one <photos>");
  EXPECT_EQ(list({"profile"}), "one <profile>");
  EXPECT_THAT(lookedUp(), ElementsAre("KEY", "KEY"));
}

TEST_F(AListOfNames, OfSeveralNamesIsInThePluralFormat) {
  EXPECT_EQ(list({"photos", "videos"}), "<photos> and <videos>");
}

TEST_F(AListOfNames, IsInByteOrderWithTheLastNameSetApart) {
  EXPECT_EQ(list({"videos", "Zebras", "photos", "émissions"}), "<Zebras + photos + videos> and <émissions>");
}

TEST_F(AListOfNames, EndsWithTheFriendListWhereOnlyTheBasicProfileIsBesideIt) {
  EXPECT_EQ(list({"profile", "list"}), "<profile> and <list>");
}

TEST_F(AListOfNames, BeginsWithTheBasicProfile) {
  EXPECT_EQ(list({"profile", "albums"}), "<profile> and <albums>");
  EXPECT_EQ(list({"profile", "albums", "books"}), "<profile + albums> and <books>");
}

TEST_F(AListOfNames, BeginsWithTheFriendListWhereThereIsNoBasicProfile) {
  EXPECT_EQ(list({"list", "albums"}), "<list> and <albums>");
}

TEST_F(AListOfNames, HasTheFriendListAfterTheBasicProfile) {
  EXPECT_EQ(list({"profile", "list", "albums"}), "<profile + list> and <albums>");
  EXPECT_EQ(list({"profile", "list", "albums", "books"}), "<profile + list + albums> and <books>");
}

TEST_F(AListOfNames, NamesAFriendListThatReadsLikeTheBasicProfileTwice) {
  host.stringTable.put(friendList, "profile");
  EXPECT_EQ(list({"profile", "albums"}), "<profile + profile> and <albums>");
}

TEST_F(AListOfNames, KnowsNoNameOfItsOwnWhereThereIsNoTable) {
  host.stringTable.setUnavailable();
  EXPECT_EQ(list({"a", "b"}), "KEY_MULTIPLE");
  EXPECT_EQ(list({"a"}), "KEY");
}

TEST_F(AListOfNames, DoesNotFillPlaceholdersInNames) {
  EXPECT_EQ(list({"%@", "%2$@", "x"}), "<%2$@ + %@> and <x>");
}

TEST_F(AListOfNames, LooksUpFormatNamesAndSeparatorInThisOrder) {
  list({"a", "b"});
  EXPECT_THAT(lookedUp(), ElementsAre("KEY_MULTIPLE", basicProfile, friendList, "WORD_LIST_SEPARATOR"));
}

TEST_F(AListOfNames, LooksUpInThePlugInsTableWithoutADefault) {
  list({"a", "b"});
  EXPECT_THAT(host.stringTable.lookups(), Each(Field(&Lookup::table, "Localizable")));
  EXPECT_THAT(host.stringTable.lookups(), Each(Field(&Lookup::value, "")));
}

TEST_F(AListOfNames, PassesOnWhatTheTableThrows) {
  host.stringTable.setBeforeCall([](std::string_view) { throw std::runtime_error("no table"); });
  EXPECT_THROW(list({"a", "b"}), std::runtime_error);
  EXPECT_THROW(access.userObjectsRequestedByPermissions({"email"}), std::runtime_error);
}

}  // namespace
}  // namespace plugin_tests
