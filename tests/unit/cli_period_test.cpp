#include <gtest/gtest.h>

#include <cstdlib>
#include <ctime>

#include "cli/Period.h"

namespace {

class APeriod : public ::testing::Test {
 protected:
  void SetUp() override { setZone("UTC"); }
  void TearDown() override {
    ::unsetenv("TZ");
    ::tzset();
  }
  static void setZone(const char* zone) {
    ::setenv("TZ", zone, 1);
    ::tzset();
  }
  static void expect(const std::string& text, long long first, long long last) {
    const auto period = cli::periodFrom(text);
    ASSERT_TRUE(period) << text;
    EXPECT_EQ(period->first, first) << text;
    EXPECT_EQ(period->last, last) << text;
  }
};

TEST_F(APeriod, IsADayAMinuteOrASecond) {
  expect("2024-05-01", 1714521600, 1714607999);
  expect("2024-05-01T12:30", 1714566600, 1714566659);
  expect("2024-05-01 12:30:15", 1714566615, 1714566615);
  expect("1969-12-31T23:59:59", -1, -1);
}

TEST_F(APeriod, IsOfTheLocalTimeZoneUnlessItSaysOtherwise) {
  setZone("CET-1CEST,M3.5.0,M10.5.0/3");
  expect("2024-05-01T12:30:00", 1714559400, 1714559400);
  expect("2024-05-01T12:30:00Z", 1714566600, 1714566600);
  expect("2024-05-01T12:30:00-01:30", 1714572000, 1714572000);
  expect("2024-03-31", 1711839600, 1711839600 + 23 * 3600 - 1);  // the clock goes forward
}

TEST_F(APeriod, IsNothingElse) {
  for (const char* text : {"",
                           "yesterday",
                           "2024",
                           "2024-5-1",
                           "2024-02-30",
                           "2024-13-01",
                           "2024-05-01T",
                           "2024-05-01T24:00",
                           "2024-05-01T12",
                           "2024-05-01T12:60",
                           "2024-05-01T12:30:61",
                           "2024-05-01Z",
                           "2024-05-01T12:30+25:00",
                           "2024-05-01T12:30:00 ",
                           "1714566600",
                           "99999-01-01"}) {
    const auto period = cli::periodFrom(text);
    ASSERT_FALSE(period) << text;
    EXPECT_EQ(period.failure().kind, base::FailureKind::kInvalid);
  }
}

}  // namespace
