#include <gtest/gtest.h>

#include <string>

#include "daemon/requests/RateLimit.h"

namespace requests {
namespace {

using std::chrono::milliseconds;

class TheRate : public testing::Test {
 protected:
  int takeAll(const std::string& client) {
    int taken = 0;
    while (taken < 1000 && limit_.take(client)) ++taken;
    return taken;
  }
  RateLimit::Time now_{};
  RateLimit limit_{10, [this] { return now_; }};
};

TEST_F(TheRate, LetsASecondsWorthThroughAtOnce) {
  EXPECT_EQ(takeAll("a"), 10);
  EXPECT_FALSE(limit_.take("a"));
}

TEST_F(TheRate, LetsOneThroughForEachPartOfASecondThatPasses) {
  takeAll("a");
  now_ += milliseconds(100);
  EXPECT_EQ(takeAll("a"), 1);
  now_ += milliseconds(550);
  EXPECT_EQ(takeAll("a"), 5);
  now_ += milliseconds(50);
  EXPECT_EQ(takeAll("a"), 1) << "a half is kept";
}

TEST_F(TheRate, KeepsNoMoreThanASecondsWorth) {
  takeAll("a");
  now_ += std::chrono::hours(1);
  EXPECT_EQ(takeAll("a"), 10);
}

TEST_F(TheRate, OfOneClientIsNotAnothers) {
  takeAll("a");
  EXPECT_EQ(takeAll("b"), 10);
  EXPECT_FALSE(limit_.take("a")) << "not even when another one comes";
}

}  // namespace
}  // namespace requests
