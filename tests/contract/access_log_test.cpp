#include <gtest/gtest.h>

#include "tests/contract/Suites.h"

namespace contract {
namespace {

template <typename Services>
class AccessLog : public ::testing::Test {
 protected:
  Services services_;
};

TYPED_TEST_SUITE(AccessLog, Implementations, Names);

TYPED_TEST(AccessLog, KeepsEveryDecisionInOrder) {
  RVDAccessLog& log = this->services_.accessLog();
  log.RVDLogAccessRequest("type", "one", true, true, 0);
  log.RVDLogAccessRequest("type", std::nullopt, false, true, 0);
  log.RVDLogAccessRequest("other", "", true, false, 0);
  log.RVDLogAccessRequest("type", "one", false, false, 0);
  EXPECT_EQ(this->services_.logged(),
            (std::vector<LoggedDecision>{{"type", "one", true, true},
                                         {"type", std::nullopt, false, true},
                                         {"other", "", true, false},
                                         {"type", "one", false, false}}));
}

}  // namespace
}  // namespace contract
