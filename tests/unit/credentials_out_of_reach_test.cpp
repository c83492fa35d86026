#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/support/MemoryStore.h"
#include "tests/support/StoredState.h"

namespace {

using credentials::Place;
using support::succeed;
using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

class AStoreOutOfReach : public ::testing::Test {
 protected:
  void SetUp() override {
    account_ = state_->addAccount();
    ASSERT_FALSE(state_->storeCredential("app", "token"));
    state_->put("app", true);
  }
  std::unique_ptr<support::StoredState> makeState() {
    return std::make_unique<support::StoredState>(temporary_.path("rvd"), [this](auto&) {
      auto store = std::make_unique<support::MemoryStore>(memory_);
      store_ = store.get();
      return store;
    });
  }
  // What the store holds stays, as a keyring does.
  void restart() {
    state_.reset();
    state_ = makeState();
  }
  bool isHandedOut() {
    return state_->keychain->credentialForClient(account_, "app", clients::Evidence::kRegistered) != nullptr;
  }
  bool isReadByAPlugIn() {
    return state_->keychain->credentialForAccount(*state_->account(), "app") != nullptr;
  }
  bool isStored() { return memory_->contains(Place{account_, "app"}); }
  // As a revocation does it.
  void revoke() {
    state_->put("app", false);
    EXPECT_FALSE(state_->keychain->removeCredentialForAccount(*state_->account(), "app"));
  }

  support::TemporaryDirectory temporary_;
  support::MemoryStore* store_ = nullptr;
  std::shared_ptr<support::MemoryStore::Credentials> memory_ =
      std::make_shared<support::MemoryStore::Credentials>();
  std::unique_ptr<support::StoredState> state_ = makeState();
  std::string account_;
};

TEST_F(AStoreOutOfReach, StoresNothingAndSaysSo) {
  store_->setFailing(true);
  EXPECT_TRUE(state_->storeCredential("other", "token"));
  EXPECT_FALSE(state_->keychain->setMasterCredential(account_, RVSecret("token")));
  EXPECT_FALSE(isHandedOut());
  EXPECT_THAT(state_->log.texts(), Contains(HasSubstr("cannot be read: the store is gone")));
  store_->setFailing(false);
  EXPECT_TRUE(isHandedOut());
  EXPECT_EQ(state_->keychain->credentialForClient(account_, "other", clients::Evidence::kRegistered),
            nullptr);
}

TEST_F(AStoreOutOfReach, DeletesWhatWasRevokedWhenItWorksAgain) {
  store_->setFailing(true);
  revoke();
  EXPECT_THAT(state_->log.texts(), Contains(HasSubstr("of the client app, cannot be deleted now")));
  EXPECT_FALSE(isHandedOut());
  store_->setFailing(false);
  EXPECT_TRUE(isStored());
  // The next thing that it does, whatever it is.
  EXPECT_NE(state_->keychain->credentialForAccount(*state_->account(), std::nullopt), nullptr);
  EXPECT_FALSE(isStored());
  EXPECT_THAT(state_->log.texts(), Contains(HasSubstr("of the client app, could not be deleted before")));
}

TEST_F(AStoreOutOfReach, DoesNotGiveANewGrantARevokedCredential) {
  store_->setFailing(true);
  revoke();
  state_->put("app", true);
  EXPECT_FALSE(isHandedOut());
  restart();
  EXPECT_FALSE(isHandedOut());
  EXPECT_FALSE(isReadByAPlugIn());
  // Nor after the start that deletes it.
  succeed(state_->keychain->reconcile());
  EXPECT_FALSE(isStored());
  EXPECT_FALSE(isHandedOut());
  ASSERT_FALSE(state_->storeCredential("app", "new"));
  EXPECT_TRUE(isHandedOut());
}

TEST_F(AStoreOutOfReach, HandsOutTheCredentialThatWasStoredOverARevokedOne) {
  store_->setFailing(true);
  revoke();
  store_->setFailing(false);
  const auto request = support::newRequest();
  ASSERT_FALSE(state_->storeCredential("app", "new", request));
  state_->put("app", true);
  EXPECT_TRUE(isHandedOut());
  restart();
  succeed(state_->keychain->reconcile());
  EXPECT_TRUE(isHandedOut());
}

TEST_F(AStoreOutOfReach, AtTheStartIsReconciledWhenItWorks) {
  const auto hold = [&] {
    memory_->insert_or_assign(Place{account_, "ungranted"}, memory_->begin()->second);
  };
  hold();
  memory_->insert_or_assign(Place{"nobody", std::nullopt}, memory_->begin()->second);
  store_->setFailing(true);
  EXPECT_FALSE(state_->keychain->reconcile());
  EXPECT_FALSE(isHandedOut());
  store_->setFailing(false);
  EXPECT_TRUE(isHandedOut());
  EXPECT_EQ(memory_->size(), 2U);
  // It is not done again and again.
  hold();
  EXPECT_TRUE(isHandedOut());
  EXPECT_EQ(memory_->size(), 3U);
}

TEST_F(AStoreOutOfReach, LeavesWhatALivingRequestHasStored) {
  const auto request = support::newRequest();
  ASSERT_FALSE(state_->storeCredential("other", "token", request));
  succeed(state_->keychain->reconcile());
  EXPECT_TRUE(memory_->contains(Place{account_, "other"}));
  request->makeVoid(requests::VoidReason::kCallerGone);
  store_->setFailing(true);
  state_->keychain->requestEnded(request);
  store_->setFailing(false);
  EXPECT_TRUE(isHandedOut());
  EXPECT_FALSE(memory_->contains(Place{account_, "other"}));
}

TEST_F(AStoreOutOfReach, ErasesAnAccountThatIsGoneWhenItWorksAgain) {
  const std::string second = state_->addAccount("second");
  succeed(state_->accounts->remove(account_));
  store_->setFailing(true);
  state_->keychain->eraseAccount(account_);
  EXPECT_THAT(state_->log.texts(), Contains(HasSubstr("account " + account_ + ", which is gone")));
  store_->setFailing(false);
  EXPECT_NE(state_->keychain->credentialForAccount(*state_->account(), std::nullopt), nullptr);
  EXPECT_EQ(memory_->size(), 1U);
  EXPECT_TRUE(memory_->contains(Place{second, std::nullopt}));
}

TEST_F(AStoreOutOfReach, ErasesAnAccountAtOnceWhereItCan) {
  const std::string second = state_->addAccount("second");
  succeed(state_->accounts->remove(account_));
  state_->keychain->eraseAccount(account_);
  EXPECT_EQ(memory_->size(), 1U);
  EXPECT_TRUE(memory_->contains(Place{second, std::nullopt}));
}

}  // namespace
