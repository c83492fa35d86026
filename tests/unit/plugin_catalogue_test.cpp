// The permissions that the plug-in knows.
#include <barrier>

#include "tests/unit/plugin_fixture.h"

namespace plugin_tests {
namespace {

using testing::UnorderedElementsAre;
using testing::UnorderedElementsAreArray;

class TheCatalogue : public PluginTest {};

TEST_F(TheCatalogue, NamesItsCategories) {
  EXPECT_EQ(TKFacebookPermissionCategoryUnknown, "unknown");
  EXPECT_EQ(TKFacebookPermissionCategoryBasicRead, "basic-read");
  EXPECT_EQ(TKFacebookPermissionCategoryExtendedRead, "extended-read");
  EXPECT_EQ(TKFacebookPermissionCategoryWrite, "write");
  EXPECT_EQ(TKFacebookPermissionCategoryManage, "manage");
}

TEST_F(TheCatalogue, HasSixPermissionsOfBasicReading) {
  EXPECT_THAT(access.basicReadPermissions(),
              UnorderedElementsAre(
                  "basic_info", "friends", "user_location", "user_birthday", "current_city", "email"));
}

TEST_F(TheCatalogue, HasFortyNinePermissionsOfExtendedReading) {
  RVPermissionSet expected = {"read_friendlists",
                              "read_requests",
                              "read_mailbox",
                              "read_stream",
                              "read_insights",
                              "friends_birthday",
                              "friends_location"};
  for (const char* thing : {"checkins",
                            "events",
                            "groups",
                            "likes",
                            "notes",
                            "photos",
                            "status",
                            "videos",
                            "questions",
                            "online_presence",
                            "relationships",
                            "relationship_details",
                            "religion_politics",
                            "about_me",
                            "activities",
                            "education_history",
                            "hometown",
                            "interests",
                            "subscriptions",
                            "website",
                            "work_history"}) {
    expected.insert(std::string("user_") + thing);
    expected.insert(std::string("friends_") + thing);
  }
  ASSERT_EQ(expected.size(), 49U);
  EXPECT_EQ(access.extendedReadPermissions(), expected);
}

TEST_F(TheCatalogue, CountsTheExtendedReadPermissionsByTheirPrefixes) {
  int ofTheUser = 0;
  int ofFriends = 0;
  int toRead = 0;
  for (const std::string& name : access.extendedReadPermissions()) {
    ofTheUser += name.starts_with("user_") ? 1 : 0;
    ofFriends += name.starts_with("friends_") ? 1 : 0;
    toRead += name.starts_with("read_") ? 1 : 0;
  }
  EXPECT_EQ(ofTheUser, 21);
  EXPECT_EQ(ofFriends, 23);
  EXPECT_EQ(toRead, 5);
}

TEST_F(TheCatalogue, HasFourPermissionsToWrite) {
  EXPECT_THAT(access.writePermissions(),
              UnorderedElementsAre("publish_actions", "publish_stream", "publish_checkins", "publish"));
}

TEST_F(TheCatalogue, HasSevenPermissionsToManage) {
  EXPECT_THAT(access.managePermissions(),
              UnorderedElementsAre("ads_management",
                                   "create_event",
                                   "rsvp_event",
                                   "xmpp_login",
                                   "manage_friendlists",
                                   "manage_notifications",
                                   "manage_pages"));
}

TEST_F(TheCatalogue, HasSevenUserProfileEntriesOfWhichOneIsTwoNamesInOne) {
  EXPECT_THAT(access.userProfileReadPermissions(),
              UnorderedElementsAre("user_about_me",
                                   "user_activities",
                                   "user_education_history",
                                   "user_hometown",
                                   "user_interests",
                                   "user_subscriptionsuser_website",
                                   "user_work_history"));
}

TEST_F(TheCatalogue, KeepsSubscriptionsAndWebsiteOutOfTheUserProfile) {
  for (const char* name : {"user_subscriptions", "user_website"}) {
    EXPECT_TRUE(access.extendedReadPermissions().contains(name)) << name;
    EXPECT_FALSE(access.userProfileReadPermissions().contains(name)) << name;
  }
  for (const auto category : {"basic-read", "extended-read", "write", "manage"})
    EXPECT_FALSE(access.allPermissionsInCategory(category)->contains("user_subscriptionsuser_website"));
}

TEST_F(TheCatalogue, PutsNoPermissionIntoTwoCategories) {
  RVPermissionSet all;
  std::size_t count = 0;
  for (const auto category : {"basic-read", "extended-read", "write", "manage"}) {
    const RVPermissionSet* names = access.allPermissionsInCategory(category);
    ASSERT_NE(names, nullptr) << category;
    count += names->size();
    all.insert(names->begin(), names->end());
  }
  EXPECT_EQ(count, 66U);
  EXPECT_EQ(all.size(), 66U);
  EXPECT_FALSE(all.contains("basic_profile"));
}

TEST_F(TheCatalogue, TellsFriendsBirthdaysAndLocationsFromTheUsersOwn) {
  for (const char* name : {"friends_birthday", "friends_location"}) {
    EXPECT_TRUE(access.extendedReadPermissions().contains(name)) << name;
    EXPECT_FALSE(access.basicReadPermissions().contains(name)) << name;
  }
  for (const char* name : {"user_birthday", "user_location"}) {
    EXPECT_TRUE(access.basicReadPermissions().contains(name)) << name;
    EXPECT_FALSE(access.extendedReadPermissions().contains(name)) << name;
  }
}

TEST_F(TheCatalogue, AnswersACategoryWithTheSameSetAsItsOwnOperation) {
  EXPECT_EQ(access.allPermissionsInCategory("basic-read"), &access.basicReadPermissions());
  EXPECT_EQ(access.allPermissionsInCategory("extended-read"), &access.extendedReadPermissions());
  EXPECT_EQ(access.allPermissionsInCategory("write"), &access.writePermissions());
  EXPECT_EQ(access.allPermissionsInCategory("manage"), &access.managePermissions());
}

TEST_F(TheCatalogue, AnswersTheSameSetObjectOnEveryCall) {
  EXPECT_EQ(access.allPermissionsInCategory("manage"), access.allPermissionsInCategory("manage"));
  EXPECT_EQ(&access.basicReadPermissions(), &access.basicReadPermissions());
}

TEST_F(TheCatalogue, HasNothingForAnyOtherCategory) {
  EXPECT_EQ(access.allPermissionsInCategory("unknown"), nullptr);
  EXPECT_EQ(access.allPermissionsInCategory("Write"), nullptr);
  EXPECT_EQ(access.allPermissionsInCategory(""), nullptr);
  EXPECT_EQ(access.allPermissionsInCategory(std::nullopt), nullptr);
  EXPECT_FALSE(access.writePermissionsAreFilled());
}

TEST_F(TheCatalogue, UnitesBothKindsOfReading) {
  RVPermissionSet expected = access.basicReadPermissions();
  expected.insert(access.extendedReadPermissions().begin(), access.extendedReadPermissions().end());
  EXPECT_EQ(access.allReadPermissions(), expected);
  EXPECT_EQ(access.allReadPermissions().size(), 55U);
}

TEST_F(TheCatalogue, HandsOutAllReadPermissionsAsACopy) {
  RVPermissionSet mine = access.allReadPermissions();
  mine.clear();
  EXPECT_EQ(access.allReadPermissions().size(), 55U);
  EXPECT_EQ(access.basicReadPermissions().size(), 6U);
  EXPECT_EQ(access.extendedReadPermissions().size(), 49U);
}

TEST_F(TheCatalogue, SplitsARequestByCategory) {
  const auto categoryOf = [&](const char* name) -> std::string {
    if (access.allReadPermissions().contains(name)) return "read";
    if (access.writePermissions().contains(name)) return "write";
    return access.managePermissions().contains(name) ? "manage" : "unknown";
  };
  EXPECT_EQ(categoryOf("email"), "read");
  EXPECT_EQ(categoryOf("publish_stream"), "write");
  EXPECT_EQ(categoryOf("manage_pages"), "manage");
  EXPECT_EQ(categoryOf("basic_profile"), "unknown");
}

TEST_F(TheCatalogue, FillsOnlyTheListThatIsAskedFor) {
  access.writePermissions();
  EXPECT_TRUE(access.writePermissionsAreFilled());
  EXPECT_FALSE(access.basicReadPermissionsAreFilled());
  EXPECT_FALSE(access.extendedReadPermissionsAreFilled());
  EXPECT_FALSE(access.managePermissionsAreFilled());
}

TEST_F(TheCatalogue, FillsNothingForTheUserProfile) {
  access.userProfileReadPermissions();
  EXPECT_FALSE(access.basicReadPermissionsAreFilled());
  EXPECT_FALSE(access.extendedReadPermissionsAreFilled());
}

TEST_F(TheCatalogue, IsFilledOnceWhenManyThreadsAskFirst) {
  constexpr int kThreads = 8;
  std::barrier start(kThreads);
  std::vector<std::vector<const RVPermissionSet*>> seen(kThreads);
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([&, i] {
      start.arrive_and_wait();
      for (const auto category : {"basic-read", "extended-read", "write", "manage"})
        seen[i].push_back(access.allPermissionsInCategory(category));
    });
  }
  for (std::thread& thread : threads) thread.join();
  for (const auto& sets : seen) EXPECT_EQ(sets, seen.front());
  EXPECT_EQ(seen.front().at(1)->size(), 49U);
}

TEST_F(TheCatalogue, AsksNothingOfTheHost) {
  access.allReadPermissions();
  access.writePermissions();
  access.managePermissions();
  access.userProfileReadPermissions();
  EXPECT_TRUE(host.journal->calls().empty());
}

}  // namespace
}  // namespace plugin_tests
