#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "tests/support/StoredState.h"

namespace {

using clients::Evidence;
using requests::RequestContext;
using requests::VoidReason;
using support::valueOf;

const std::string kType(RVAccountTypeIdentifierFacebook);
const RVAccountType kFacebook(kType);

class AVoidRequest : public ::testing::Test {
 protected:
  void SetUp() override {
    account_ = state_.addAccount();
    store_ = state_.storeFor(request_);
    carrier_ = store_->accountsWithAccountTypeIdentifier(kType).at(0);
    carrier_->setCredential(credential("token"));
  }
  static std::shared_ptr<const RVAccountCredential> credential(const std::string& token) {
    return std::make_shared<const RVAccountCredential>(RVSecret(token), RVSecret(), kRVDistantFuture);
  }
  std::optional<RVError> put(bool granted) {
    RVDClientAuthorization authorization(client_);
    authorization.setIsGranted(granted);
    return store_->authorizationManager().setAuthorization(authorization, *client_, kFacebook);
  }
  std::optional<RVError> storeCredential() {
    return state_.keychain->setCredentialForAccount(*carrier_, "app");
  }
  std::optional<std::string> token() {
    const auto found = state_.keychain->credentialForAccount(*state_.account(), "app");
    if (found == nullptr) return std::nullopt;
    return std::string(found->oauthToken().reveal());
  }

  support::TemporaryDirectory temporary_;
  support::StoredState state_{temporary_.path("rvd")};
  std::shared_ptr<RequestContext> request_ = support::newRequest();
  std::shared_ptr<const RVDClient> client_ = support::StoredState::client("app");
  std::shared_ptr<records::RequestStore> store_;
  std::shared_ptr<RVAccount> carrier_;
  std::string account_;
};

TEST_F(AVoidRequest, HasAnEffectUntilItIsVoid) {
  EXPECT_FALSE(put(true));
  EXPECT_FALSE(storeCredential());
  EXPECT_TRUE(state_.records->find(kType, "app"));
  EXPECT_EQ(token(), "token");
}

TEST_F(AVoidRequest, LeavesNoRecord) {
  request_->makeVoid(VoidReason::kCallerGone);
  EXPECT_TRUE(put(false));
  EXPECT_FALSE(state_.records->find(kType, "app"));
}

TEST_F(AVoidRequest, LeavesTheEarlierRecordAsItWas) {
  state_.put("app", true);
  request_->makeVoid(VoidReason::kClientRevoked);
  EXPECT_TRUE(put(false));
  EXPECT_TRUE(state_.records->find(kType, "app")->granted);
  store_->authorizationManager().removeAllClientAuthorizationsForAccountType(kFacebook);
  EXPECT_TRUE(state_.records->find(kType, "app")->granted);
}

TEST_F(AVoidRequest, LeavesNoCredential) {
  request_->makeVoid(VoidReason::kAccountRemoved);
  EXPECT_TRUE(storeCredential());
  EXPECT_EQ(token(), std::nullopt);
}

TEST_F(AVoidRequest, LeavesTheEarlierCredentialAsItWas) {
  ASSERT_FALSE(state_.storeCredential("app", "earlier"));
  request_->makeVoid(VoidReason::kStopping);
  EXPECT_TRUE(storeCredential());
  EXPECT_TRUE(state_.keychain->removeCredentialForAccount(*carrier_, "app"));
  EXPECT_EQ(token(), "earlier");
}

TEST_F(AVoidRequest, LeavesNoEntryInTheAccessLog) {
  const RequestContext::Scope scope(request_);
  state_.accessLog.RVDLogAccessRequest(kType, "app", true, true, 0);
  request_->makeVoid(VoidReason::kCallerGone);
  state_.accessLog.RVDLogAccessRequest(kType, "app", false, true, 0);
  const auto entries = valueOf(state_.accessLog.newest(10));
  ASSERT_EQ(entries.size(), 1U);
  EXPECT_TRUE(entries[0].granted);
}

TEST_F(AVoidRequest, StillReadsWhatIsThere) {
  state_.put("app", true);
  request_->makeVoid(VoidReason::kCallerGone);
  EXPECT_TRUE(store_->authorizationManager().authorizationForClient(*client_, kFacebook)->isGranted());
  EXPECT_EQ(store_->accountsWithAccountTypeIdentifier(kType).size(), 1U);
}

TEST_F(AVoidRequest, TakesWithItTheCredentialThatItStoredBefore) {
  ASSERT_FALSE(storeCredential());
  request_->makeVoid(VoidReason::kCallerGone);
  state_.keychain->requestEnded(request_);
  EXPECT_EQ(token(), std::nullopt);
}

TEST_F(AVoidRequest, LeavesTheCredentialOfAClientThatHoldsAGrant) {
  state_.put("app", true);
  ASSERT_FALSE(storeCredential());
  request_->makeVoid(VoidReason::kCallerGone);
  state_.keychain->requestEnded(request_);
  EXPECT_EQ(token(), "token");
}

TEST_F(AVoidRequest, LeavesTheCredentialThatAnotherRequestStoredOverItsOwn) {
  const auto other = support::newRequest();
  ASSERT_FALSE(storeCredential());
  ASSERT_FALSE(state_.storeCredential("app", "other", other));
  request_->makeVoid(VoidReason::kCallerGone);
  state_.keychain->requestEnded(request_);
  EXPECT_EQ(token(), "other");
  state_.keychain->requestEnded(nullptr);
  EXPECT_EQ(token(), "other");
}

TEST_F(AVoidRequest, ChangesNothingOnceMakeVoidHasReturned) {
  for (int round = 0; round < 20; ++round) {
    const auto request = support::newRequest();
    const auto store = state_.storeFor(request);
    const auto account = store->accountsWithAccountTypeIdentifier(kType).at(0);
    account->setCredential(credential("round " + std::to_string(round)));
    std::atomic<bool> stopping = false;
    std::atomic<int> written = 0;
    std::thread writer([&] {
      const RequestContext::Scope scope(request);
      for (bool granted = true; !stopping; granted = !granted) {
        RVDClientAuthorization authorization(client_);
        authorization.setIsGranted(granted);
        (void)store->authorizationManager().setAuthorization(authorization, *client_, kFacebook);
        (void)state_.keychain->setCredentialForAccount(*account, "app");
        state_.accessLog.RVDLogAccessRequest(kType, "app", granted, true, 0);
        ++written;
        written.notify_one();
      }
    });
    written.wait(0);
    request->makeVoid(VoidReason::kCallerGone);
    const auto record = state_.records->find(kType, "app");
    const auto stored = token();
    const std::size_t logged = valueOf(state_.accessLog.newest(100'000)).size();
    const int before = written;
    while (written < before + 3) std::this_thread::yield();
    stopping = true;
    writer.join();
    EXPECT_TRUE(state_.records->find(kType, "app") == record);
    EXPECT_EQ(token(), stored);
    EXPECT_EQ(valueOf(state_.accessLog.newest(100'000)).size(), logged);
  }
}

// A request whose caller is known with some evidence, and records that others made.
class ARequestWithEvidence : public AVoidRequest {
 protected:
  void setEvidence(Evidence evidence) {
    request_ = support::newRequest(evidence);
    store_ = state_.storeFor(request_);
    carrier_ = store_->accountsWithAccountTypeIdentifier(kType).at(0);
    carrier_->setCredential(credential("token"));
  }
  void putWith(Evidence evidence) {
    support::succeed(state_.records->put({kType, "app", true, {}, {}, {}, evidence}));
  }
  Evidence evidence() { return state_.records->find(kType, "app")->evidence; }
};

TEST_F(ARequestWithEvidence, LeavesItWithItsRecord) {
  setEvidence(Evidence::kScope);
  EXPECT_FALSE(put(true));
  EXPECT_EQ(evidence(), Evidence::kScope);
}

TEST_F(ARequestWithEvidence, RaisesTheEvidenceOfAWeakerRecord) {
  putWith(Evidence::kRegistered);
  setEvidence(Evidence::kSandbox);
  EXPECT_TRUE(store_->authorizationManager().authorizationForClient(*client_, kFacebook)->isGranted());
  EXPECT_EQ(evidence(), Evidence::kRegistered);
  EXPECT_FALSE(put(true));
  EXPECT_EQ(evidence(), Evidence::kSandbox);
}

TEST_F(ARequestWithEvidence, UsesTheRecordThatTheUserMade) {
  state_.put("app", true);
  setEvidence(Evidence::kRegistered);
  EXPECT_TRUE(store_->authorizationManager().authorizationForClient(*client_, kFacebook)->isGranted());
  EXPECT_FALSE(request_->isVoid());
}

TEST_F(ARequestWithEvidence, IsVoidWhereItMeetsAStrongerRecord) {
  putWith(Evidence::kSandbox);
  setEvidence(Evidence::kScope);
  EXPECT_FALSE(store_->authorizationManager().authorizationForClient(*client_, kFacebook));
  EXPECT_EQ(request_->voidReason(), VoidReason::kWeakerEvidence);
}

TEST_F(ARequestWithEvidence, IsVoidWhereAStrongerRecordCameInBetween) {
  setEvidence(Evidence::kRegistered);
  EXPECT_FALSE(store_->authorizationManager().authorizationForClient(*client_, kFacebook));
  putWith(Evidence::kScope);
  EXPECT_TRUE(put(false));
  EXPECT_EQ(request_->voidReason(), VoidReason::kWeakerEvidence);
  EXPECT_TRUE(state_.records->find(kType, "app")->granted);
  EXPECT_EQ(evidence(), Evidence::kScope);
  EXPECT_TRUE(storeCredential());
}

TEST_F(ARequestWithEvidence, IsVoidForTheReasonThatItHad) {
  setEvidence(Evidence::kRegistered);
  request_->makeVoid(VoidReason::kOutdated);
  EXPECT_TRUE(put(false));
  EXPECT_EQ(request_->voidReason(), VoidReason::kOutdated);
}

TEST_F(ARequestWithEvidence, IsNoneOfTheUsersOwn) {
  putWith(Evidence::kSandbox);
  EXPECT_TRUE(store_->authorizationManager().authorizationForClient(*client_, kFacebook)->isGranted());
  EXPECT_FALSE(put(false));
  EXPECT_FALSE(request_->isVoid());
  EXPECT_FALSE(state_.records->find(kType, "app")->granted);
  EXPECT_EQ(evidence(), Evidence::kSandbox);
}

}  // namespace
