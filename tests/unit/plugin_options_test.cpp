// Reading and checking the options of a request.
#include "tests/unit/plugin_fixture.h"

namespace plugin_tests {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class Options : public PluginTest {
 protected:
  static RVDictionary with(std::initializer_list<std::pair<std::string_view, RVValue>> entries) {
    RVDictionary options;
    for (const auto& [key, value] : entries) options.emplace(key, value);
    return options;
  }
  bool valid(std::initializer_list<std::pair<std::string_view, RVValue>> entries) {
    return access.validateOptionsDictionary(with(entries));
  }
};

TEST_F(Options, WithOnlyAnAppIDAreValidAndAskForNothing) {
  EXPECT_TRUE(valid({{RVFacebookAppIdKey, "111"}}));
  EXPECT_THAT(access.permissionsFromOptionsDictionary(with({{RVFacebookAppIdKey, "111"}})), IsEmpty());
}

TEST_F(Options, WithoutAnAppIDAreInvalid) {
  EXPECT_FALSE(valid({}));
  EXPECT_FALSE(valid({{RVFacebookPermissionsKey, RVArray{"email"}}}));
  EXPECT_EQ(access.appIDFromOptionsDictionary({}), std::nullopt);
}

TEST_F(Options, WithAnEmptyAppIDAreInvalidThoughItIsRead) {
  EXPECT_FALSE(valid({{RVFacebookAppIdKey, ""}}));
  EXPECT_EQ(access.appIDFromOptionsDictionary(with({{RVFacebookAppIdKey, ""}})), "");
}

TEST_F(Options, WithANumberAsAppIDAreInvalidThoughItIsKept) {
  const RVDictionary options = with({{RVFacebookAppIdKey, 111}});
  EXPECT_FALSE(access.validateOptionsDictionary(options));
  EXPECT_EQ(access.appIDFromOptionsDictionary(options), std::nullopt);
  EXPECT_EQ(access.persistentDictionaryForOptions(options), options);
}

TEST_F(Options, WithNullAsAppIDAreInvalid) {
  EXPECT_FALSE(valid({{RVFacebookAppIdKey, RVValue()}}));
}

TEST_F(Options, ToWriteNeedAnAudience) {
  for (const char* permission : {"publish_actions", "publish_stream", "publish_checkins", "publish"}) {
    const RVArray permissions{permission};
    EXPECT_FALSE(valid({{RVFacebookAppIdKey, "111"}, {RVFacebookPermissionsKey, permissions}})) << permission;
    EXPECT_TRUE(valid({{RVFacebookAppIdKey, "111"},
                       {RVFacebookPermissionsKey, permissions},
                       {RVFacebookAudienceKey, "friends"}}))
        << permission;
  }
}

TEST_F(Options, ToWriteTakeAnyTextAsAudience) {
  const RVArray permissions{"user_photos", "publish_stream"};
  for (const char* audience : {"everyone", "friends", "only_me", "the neighbours", ""}) {
    EXPECT_TRUE(valid({{RVFacebookAppIdKey, "111"},
                       {RVFacebookPermissionsKey, permissions},
                       {RVFacebookAudienceKey, audience}}))
        << audience;
  }
}

TEST_F(Options, ToWriteTakeNoAudienceOfAnotherType) {
  const RVArray permissions{"publish_stream"};
  EXPECT_FALSE(valid({{RVFacebookAppIdKey, "111"},
                      {RVFacebookPermissionsKey, permissions},
                      {RVFacebookAudienceKey, RVArray{"friends"}}}));
  EXPECT_FALSE(valid({{RVFacebookAppIdKey, "111"},
                      {RVFacebookPermissionsKey, permissions},
                      {RVFacebookAudienceKey, RVValue()}}));
}

TEST_F(Options, ToReadOrManageNeedNoAudience) {
  EXPECT_TRUE(valid({{RVFacebookAppIdKey, "111"}, {RVFacebookPermissionsKey, RVArray{"user_photos"}}}));
  EXPECT_TRUE(valid({{RVFacebookAppIdKey, "111"}, {RVFacebookPermissionsKey, RVArray{"manage_pages"}}}));
  EXPECT_TRUE(valid({{RVFacebookAppIdKey, "111"}, {RVFacebookPermissionsKey, RVArray()}}));
}

TEST_F(Options, ToReadDoNotLookAtTheAudience) {
  EXPECT_TRUE(valid({{RVFacebookAppIdKey, "111"},
                     {RVFacebookPermissionsKey, RVArray{"user_photos"}},
                     {RVFacebookAudienceKey, 7}}));
}

TEST_F(Options, WhosePermissionsAreNoListAreInvalid) {
  for (const RVValue& permissions :
       {RVValue("publish_stream"), RVValue(7), RVValue(), RVValue(RVDictionary{{"publish", true}})}) {
    const RVDictionary options = with({{RVFacebookAppIdKey, "111"},
                                       {RVFacebookPermissionsKey, permissions},
                                       {RVFacebookAudienceKey, "friends"}});
    EXPECT_FALSE(access.validateOptionsDictionary(options));
    EXPECT_THAT(access.permissionsFromOptionsDictionary(options), IsEmpty());
  }
}

TEST_F(Options, WithANameTwiceAskForItOnce) {
  EXPECT_THAT(access.permissionsFromOptionsDictionary(optionsFor({"email", "user_photos", "email"})),
              ElementsAre("email", "user_photos"));
}

TEST_F(Options, LeaveOutOfTheListWhatIsNoName) {
  const RVDictionary options =
      with({{RVFacebookAppIdKey, "111"},
            {RVFacebookPermissionsKey, RVArray{"email", 7, RVValue(), RVArray{"publish"}, true}}});
  EXPECT_TRUE(access.validateOptionsDictionary(options));
  EXPECT_THAT(access.permissionsFromOptionsDictionary(options), ElementsAre("email"));
}

TEST_F(Options, GiveTheAudienceAsItIs) {
  EXPECT_EQ(access.audienceFromOptionsDictionary(with({{RVFacebookAudienceKey, "only_me"}})), "only_me");
  EXPECT_EQ(access.audienceFromOptionsDictionary(with({{RVFacebookAudienceKey, "whoever"}})), "whoever");
  EXPECT_EQ(access.audienceFromOptionsDictionary(with({{RVFacebookAudienceKey, ""}})), "");
  EXPECT_EQ(access.audienceFromOptionsDictionary(with({{RVFacebookAudienceKey, 1}})), std::nullopt);
  EXPECT_EQ(access.audienceFromOptionsDictionary({}), std::nullopt);
}

TEST_F(Options, AreKeptWithoutPermissionsAndWithoutUnknownKeys) {
  RVDictionary options = optionsFor({"publish_stream"}, "friends");
  options.emplace("colour", "blue");
  EXPECT_EQ(access.persistentDictionaryForOptions(options), keptOptions("111", "friends"));
}

TEST_F(Options, AreKeptAsTheyAreWhateverTheirType) {
  const RVDictionary odd = with({{RVFacebookAppIdKey, RVArray{1}}, {RVFacebookAudienceKey, RVValue()}});
  EXPECT_EQ(access.persistentDictionaryForOptions(odd), odd);
}

TEST_F(Options, ThatHoldNothingToKeepAreKeptAsAnEmptyDictionary) {
  EXPECT_THAT(access.persistentDictionaryForOptions({}), IsEmpty());
  EXPECT_THAT(access.persistentDictionaryForOptions(with({{RVFacebookPermissionsKey, RVArray()}})),
              IsEmpty());
}

TEST_F(Options, AreReadWithoutALogLine) {
  access.validateOptionsDictionary({});
  access.permissionsFromOptionsDictionary({});
  EXPECT_TRUE(host.journal->calls().empty());
}

}  // namespace
}  // namespace plugin_tests
