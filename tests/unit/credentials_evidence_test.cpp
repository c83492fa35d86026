#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/support/StoredState.h"

namespace {

using clients::Evidence;
using ::testing::Contains;
using ::testing::HasSubstr;

const std::string kType(RVAccountTypeIdentifierFacebook);

class ACredentialOfAClient : public ::testing::Test {
 protected:
  using Request = std::shared_ptr<requests::RequestContext>;

  static Request request(Evidence evidence) {
    return std::make_shared<requests::RequestContext>("app", nullptr, RVDictionary(), evidence);
  }
  bool store(const std::string& token, const Request& request) {
    return !state_.storeCredential("app", token, request);
  }
  bool remove(const Request& request) {
    return !state_.keychain->removeCredentialForAccount(*state_.account(request), "app");
  }
  void record(Evidence evidence, bool granted = true) {
    support::succeed(state_.records->put({kType, "app", granted, {}, {}, {}, evidence}));
  }
  std::string token() {
    const auto found = state_.keychain->credentialForAccount(*state_.account(), "app");
    return found != nullptr ? std::string(found->oauthToken().reveal()) : "(absent)";
  }

  support::TemporaryDirectory temporary_;
  support::StoredState state_{temporary_.path("rvd")};
  const std::string account_ = state_.addAccount();
};

TEST_F(ACredentialOfAClient, IsNotReplacedOrRemovedOnWeakerEvidenceThanItsRecordHas) {
  ASSERT_TRUE(store("strong", request(Evidence::kSandbox)));
  record(Evidence::kSandbox);
  for (const Evidence weaker : {Evidence::kRegistered, Evidence::kScope}) {
    EXPECT_FALSE(store("weak", request(weaker)));
    EXPECT_FALSE(remove(request(weaker)));
    EXPECT_EQ(token(), "strong");
  }
  EXPECT_TRUE(store("newer", request(Evidence::kSandbox)));
  EXPECT_EQ(token(), "newer");
  EXPECT_TRUE(remove(request(Evidence::kSandbox)));
  EXPECT_EQ(token(), "(absent)");
}

TEST_F(ACredentialOfAClient, IsNotStoredOnWeakerEvidenceThanARefusalHas) {
  record(Evidence::kScope, false);
  EXPECT_FALSE(store("weak", request(Evidence::kRegistered)));
  EXPECT_EQ(token(), "(absent)");
  EXPECT_TRUE(store("strong", request(Evidence::kSandbox)));
}

TEST_F(ACredentialOfAClient, IsNotReplacedWhileARequestWithStrongerEvidenceThatStoredItLives) {
  auto strong = request(Evidence::kScope);
  ASSERT_TRUE(store("strong", strong));
  EXPECT_FALSE(store("weak", request(Evidence::kRegistered)));
  EXPECT_FALSE(remove(request(Evidence::kRegistered)));
  EXPECT_EQ(token(), "strong");
  // It has ended without a record, so its credential is nobody's.
  strong.reset();
  EXPECT_TRUE(store("weak", request(Evidence::kRegistered)));
  EXPECT_EQ(token(), "weak");
}

TEST_F(ACredentialOfAClient, IsHandedOutOnNoWeakerEvidenceThanItsRecordHas) {
  const auto isHandedOut = [&](Evidence evidence) {
    return state_.keychain->credentialForClient(account_, "app", evidence) != nullptr;
  };
  ASSERT_TRUE(store("strong", request(Evidence::kScope)));
  record(Evidence::kScope);
  EXPECT_FALSE(isHandedOut(Evidence::kRegistered));
  EXPECT_TRUE(isHandedOut(Evidence::kScope));
  EXPECT_TRUE(isHandedOut(Evidence::kSandbox));
}

TEST_F(ACredentialOfAClient, IsNotHandedOutOnTheStrengthOfAWeakerRecordThatItWasNotStoredFor) {
  ASSERT_TRUE(store("weak", request(Evidence::kRegistered)));
  record(Evidence::kRegistered);
  const auto strong = request(Evidence::kSandbox);
  ASSERT_TRUE(store("strong", strong));
  EXPECT_EQ(state_.keychain->credentialForClient(account_, "app", Evidence::kRegistered), nullptr);
  EXPECT_NE(state_.keychain->credentialForClient(account_, "app", Evidence::kSandbox), nullptr);
}

TEST_F(ACredentialOfAClient, DoesNotStayUnderAWeakerRecordThanItWasStoredFor) {
  ASSERT_TRUE(store("weak", request(Evidence::kRegistered)));
  record(Evidence::kRegistered);
  const auto strong = request(Evidence::kSandbox);
  ASSERT_TRUE(store("strong", strong));
  strong->makeVoid(requests::VoidReason::kCallerGone);
  state_.keychain->requestEnded(strong);
  EXPECT_EQ(token(), "(absent)");
}

TEST_F(ACredentialOfAClient, IsTheUsersToChangeWhateverTheEvidence) {
  ASSERT_TRUE(store("strong", request(Evidence::kSandbox)));
  record(Evidence::kSandbox);
  EXPECT_TRUE(store("by the user", request(Evidence::kUnknown)));
  EXPECT_EQ(token(), "by the user");
  EXPECT_TRUE(remove(nullptr));
  EXPECT_EQ(token(), "(absent)");
}

}  // namespace
