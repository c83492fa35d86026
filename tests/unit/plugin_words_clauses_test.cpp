// The clause of the sentence for one category of permissions.
#include "tests/unit/plugin_words_fixture.h"

namespace plugin_tests {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class AReadClause : public WordsTest {};

TEST_F(AReadClause, IsTheSameForBothReadCategories) {
  for (const RVPermissionSet& permissions :
       {RVPermissionSet{"email"}, {"friends_photos"}, {"user_photos", "friends_photos"}, {}}) {
    EXPECT_EQ(access.predicateForPermissions(permissions, "basic-read"),
              access.predicateForPermissions(permissions, "extended-read"));
  }
  EXPECT_NE(access.predicateForPermissions({"email"}, "basic-read"), std::nullopt);
}

TEST_F(AReadClause, OfBasicPermissionsSpeaksOfTheUsersThingsAlone) {
  EXPECT_EQ(access.predicateForPermissions({"email"}, "extended-read"),
            "ACCOUNT_ACCESS_EXTENDED_READ[ACCOUNT_ACCESS_EXTENDED_READ_USER_MULTIPLE[" + basicProfile + "][" +
                friendList + "]]");
}

TEST_F(AReadClause, OfFriendsPermissionsSpeaksOfTheFriendsThingsAlone) {
  EXPECT_EQ(access.predicateForPermissions({"friends_photos"}, "extended-read"),
            "ACCOUNT_ACCESS_EXTENDED_READ[ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS"
            "[FACEBOOK_READ_PERMISSION_FRIENDS_PHOTOS]]");
}

TEST_F(AReadClause, OfBothHasTheUsersThingsFirst) {
  EXPECT_EQ(access.predicateForPermissions({"user_photos", "friends_photos"}, "extended-read"),
            "ACCOUNT_ACCESS_EXTENDED_READ_MULTIPLE"
            "[ACCOUNT_ACCESS_EXTENDED_READ_USER[FACEBOOK_READ_PERMISSION_USER_PHOTOS]]"
            "[ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS[FACEBOOK_READ_PERMISSION_FRIENDS_PHOTOS]]");
}

TEST_F(AReadClause, LooksUpTheUsersThingsThenTheFriendsThenItself) {
  access.predicateForPermissions({"user_photos", "friends_photos"}, "extended-read");
  EXPECT_THAT(lookedUp(),
              ElementsAre(readName("USER_PHOTOS"),
                          "ACCOUNT_ACCESS_EXTENDED_READ_USER",
                          readName("FRIENDS_PHOTOS"),
                          "ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS",
                          "ACCOUNT_ACCESS_EXTENDED_READ_MULTIPLE"));
}

TEST_F(AReadClause, IsAbsentWhereThereIsNothingToRead) {
  EXPECT_EQ(access.predicateForPermissions({}, "extended-read"), std::nullopt);
  EXPECT_EQ(access.predicateForPermissions({"publish_stream"}, "basic-read"), std::nullopt);
}

TEST_F(AReadClause, DoesNotDependOnTheAudience) {
  EXPECT_EQ(access.predicateForPermissions({"email"}, "extended-read", "friends"),
            access.predicateForPermissions({"email"}, "extended-read", "only_me"));
}

class AWriteClause : public WordsTest {};

TEST_F(AWriteClause, SaysWhoSeesThePosts) {
  EXPECT_EQ(access.predicateForPermissions({"publish"}, "write", "friends"),
            "ACCCOUNT_ACCESS_WRITE[POST_TO_FRIENDS]");
  EXPECT_EQ(access.predicateForPermissions({"publish"}, "write", "only_me"),
            "ACCCOUNT_ACCESS_WRITE[POST_PRIVATELY]");
  EXPECT_EQ(access.predicateForPermissions({"publish"}, "write", "everyone"),
            "ACCCOUNT_ACCESS_WRITE[POST_PUBLICALLY]");
}

TEST_F(AWriteClause, DoesNotDependOnWhichPermissionsPost) {
  const auto clause = access.predicateForPermissions({"publish"}, "write", "friends");
  EXPECT_EQ(access.predicateForPermissions(
                {"publish_actions", "publish_stream", "publish_checkins", "publish"}, "write", "friends"),
            clause);
  EXPECT_EQ(access.predicateForPermissions({}, "write", "friends"), clause);
}

class AManageClause : public WordsTest {};

TEST_F(AManageClause, OfOneThingIsInTheSingularFormat) {
  EXPECT_EQ(access.predicateForPermissions({"manage_pages"}, "manage"),
            "ACCOUNT_ACCESS_MANAGE[FACEBOOK_MANAGE_PERMISSION_MANAGE_PAGES]");
}

TEST_F(AManageClause, OfSeveralThingsSetsTheLastInByteOrderApart) {
  EXPECT_EQ(access.predicateForPermissions({"manage_pages", "create_event", "rsvp_event"}, "manage"),
            "ACCOUNT_ACCESS_MANAGE_MULTIPLE[FACEBOOK_MANAGE_PERMISSION_CREATE_EVENT + "
            "FACEBOOK_MANAGE_PERMISSION_MANAGE_PAGES][FACEBOOK_MANAGE_PERMISSION_RSVP_EVENT]");
}

TEST_F(AManageClause, IsOrderedByTheNamesAndNotByThePermissions) {
  host.stringTable.put(manageName("CREATE_EVENT"), "zoo events");
  host.stringTable.put(manageName("RSVP_EVENT"), "answers");
  EXPECT_EQ(access.predicateForPermissions({"create_event", "rsvp_event"}, "manage"),
            "ACCOUNT_ACCESS_MANAGE_MULTIPLE[answers][zoo events]");
}

TEST_F(AManageClause, OfTwoPermissionsWithOneNameIsInTheSingularFormat) {
  host.stringTable.put(manageName("CREATE_EVENT"), "events");
  host.stringTable.put(manageName("RSVP_EVENT"), "events");
  EXPECT_EQ(access.predicateForPermissions({"create_event", "rsvp_event"}, "manage"),
            "ACCOUNT_ACCESS_MANAGE[events]");
}

TEST_F(AManageClause, PutsNeitherTheBasicProfileNorTheFriendListFirst) {
  host.stringTable.put(basicProfile, "b");
  host.stringTable.put(manageName("MANAGE_PAGES"), "b");
  host.stringTable.put(manageName("CREATE_EVENT"), "a");
  host.stringTable.put(manageName("RSVP_EVENT"), "c");
  EXPECT_EQ(access.predicateForPermissions({"manage_pages", "create_event", "rsvp_event"}, "manage"),
            "ACCOUNT_ACCESS_MANAGE_MULTIPLE[a + b][c]");
}

TEST_F(AManageClause, LooksUpTheNamesThenTheSeparatorThenItself) {
  access.predicateForPermissions({"create_event", "rsvp_event"}, "manage");
  EXPECT_THAT(lookedUp(),
              ElementsAre(manageName("CREATE_EVENT"),
                          manageName("RSVP_EVENT"),
                          "WORD_LIST_SEPARATOR",
                          "ACCOUNT_ACCESS_MANAGE_MULTIPLE"));
}

TEST_F(AManageClause, OfNothingIsAbsent) {
  EXPECT_EQ(access.predicateForPermissions({}, "manage"), std::nullopt);
}

TEST_F(AManageClause, IsAbsentWhereThereIsNoTable) {
  host.stringTable.setUnavailable();
  EXPECT_EQ(access.predicateForPermissions({"manage_pages", "create_event"}, "manage"), std::nullopt);
}

TEST_F(AManageClause, DoesNotDependOnTheAudience) {
  EXPECT_EQ(access.predicateForPermissions({"manage_pages"}, "manage", "friends"),
            access.predicateForPermissions({"manage_pages"}, "manage", "only_me"));
}

class AClause : public WordsTest {};

TEST_F(AClause, OfNoKnownCategoryIsAbsentAndLooksNothingUp) {
  for (const char* category : {"unknown", "", "Write", "read"})
    EXPECT_EQ(access.predicateForPermissions({"email", "publish"}, category, "friends"), std::nullopt);
  EXPECT_EQ(access.predicateForPermissions({"email"}, std::nullopt), std::nullopt);
  EXPECT_THAT(host.journal->calls(), IsEmpty());
}

TEST_F(AClause, IsLookedUpAnewEachTime) {
  access.predicateForPermissions({"manage_pages"}, "manage");
  host.stringTable.put("ACCOUNT_ACCESS_MANAGE", "run %@");
  host.stringTable.put(manageName("MANAGE_PAGES"), "pages");
  EXPECT_EQ(access.predicateForPermissions({"manage_pages"}, "manage"), "run pages");
}

TEST_F(AClause, IsNotLogged) {
  access.predicateForPermissions({"email", "friends_photos"}, "extended-read");
  access.predicateForPermissions({"publish"}, "write");
  access.predicateForPermissions({"manage_pages"}, "manage");
  access.predicateForPermissions({"manage_pages"}, "unknown");
  EXPECT_THAT(host.log.lines(), IsEmpty());
}

}  // namespace
}  // namespace plugin_tests
