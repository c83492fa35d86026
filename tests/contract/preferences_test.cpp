#include <gtest/gtest.h>

#include "tests/contract/Suites.h"

namespace contract {
namespace {

constexpr std::string_view kApplication = TKFacebookPreferencesAppID;
constexpr std::string_view kKey = TKFacebookIgnoreAccessRequests;

template <typename Services>
class Preferences : public ::testing::Test {
 protected:
  std::optional<RVValue> read(std::string_view key = kKey, std::string_view application = kApplication) {
    return services_.preferences().ZQPreferencesCopyValue(
        key, application, kZQPreferencesCurrentUser, kZQPreferencesAnyHost);
  }
  bool synchronise(std::string_view application = kApplication) {
    return services_.preferences().ZQPreferencesAppSynchronize(application);
  }

  Services services_;
};

TYPED_TEST_SUITE(Preferences, Implementations, Names);

TYPED_TEST(Preferences, AreAbsentUntilTheyAreStored) {
  EXPECT_FALSE(this->read());
}

TYPED_TEST(Preferences, OfEveryTypeAreReadAsTheyWereStored) {
  const RVArray values = {RVValue(),
                          true,
                          false,
                          0,
                          std::int64_t{-9'223'372'036'854'775'807 - 1},
                          std::int64_t{9'223'372'036'854'775'807},
                          1.0,
                          -0.5,
                          "",
                          "text",
                          RVArray{},
                          RVArray{1, "a", RVArray{true}},
                          RVDictionary{},
                          RVDictionary{{"a", RVDictionary{{"", 1}}}}};
  for (std::size_t i = 0; i < values.size(); ++i) {
    this->services_.storePreference(kApplication, std::to_string(i), values[i]);
    EXPECT_TRUE(this->read(std::to_string(i)) == values[i]) << i;
  }
}

TYPED_TEST(Preferences, ThatWereReadAreKeptUntilTheApplicationIsSynchronised) {
  this->services_.storePreference(kApplication, kKey, true);
  EXPECT_TRUE(this->read() == RVValue(true));
  this->services_.storePreference(kApplication, kKey, false);
  EXPECT_TRUE(this->read() == RVValue(true));
  EXPECT_TRUE(this->synchronise());
  EXPECT_TRUE(this->read() == RVValue(false));
}

TYPED_TEST(Preferences, ThatWereReadAsAbsentStayAbsentUntilTheApplicationIsSynchronised) {
  EXPECT_FALSE(this->read());
  this->services_.storePreference(kApplication, kKey, true);
  EXPECT_FALSE(this->read());
  EXPECT_TRUE(this->synchronise());
  EXPECT_TRUE(this->read() == RVValue(true));
}

TYPED_TEST(Preferences, OfAnotherApplicationAreNotSynchronised) {
  EXPECT_FALSE(this->read(kKey, "com.example.one"));
  this->services_.storePreference("com.example.one", kKey, 1);
  EXPECT_TRUE(this->synchronise("com.example.two"));
  EXPECT_FALSE(this->read(kKey, "com.example.one"));
  EXPECT_FALSE(this->read(kKey, "com.example.two"));
}

TYPED_TEST(Preferences, AreReadAsBooleans) {
  const ZQPreferences& preferences = this->services_.preferences();
  for (const RVValue& value : RVArray{true, 1, -1, 0.5, "true", "TRUE", "Yes", "oN", "1"})
    EXPECT_TRUE(preferences.booleanValue(value));
  for (const RVValue& value : RVArray{false,
                                      0,
                                      0.0,
                                      -0.0,
                                      "",
                                      "0",
                                      "no",
                                      "2",
                                      " true",
                                      "true ",
                                      RVValue(),
                                      RVArray{true},
                                      RVDictionary{}})
    EXPECT_FALSE(preferences.booleanValue(value));
}

}  // namespace
}  // namespace contract
