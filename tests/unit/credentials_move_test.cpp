#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "daemon/credentials/StoreChoice.h"
#include "tests/support/MemoryStore.h"
#include "tests/support/StoredState.h"

namespace {

using credentials::Place;
using credentials::StoreChoice;
using credentials::StoreKind;
using support::MemoryStore;
using support::succeed;
using support::valueOf;
using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

// Two stores in memory beside a real database.
class Credentials : public ::testing::Test {
 protected:
  void SetUp() override {
    account_ = state_.addAccount("master");
    state_.put("one", true);
    state_.put("two", true);
    for (const auto& clientId :
         {std::optional<std::string>(), std::optional<std::string>("one"), std::optional<std::string>("two")})
      all_.emplace(Place{account_, clientId},
                   RVAccountCredential(RVSecret("secret of " + clientId.value_or("the account")),
                                       RVSecret("refresh"),
                                       kRVDistantFuture));
    succeed(start(StoreKind::kSealed));
    *sealed_ = all_;
  }
  // What a start does. failing: which of the stores fails, if any; from which of its calls on.
  base::Result<void> start(StoreKind wanted, MemoryStore* failing = nullptr) {
    MemoryStore sealed(sealed_);
    MemoryStore keyring(keyring_);
    MemoryStore& sealedOrFailing = failing != nullptr && failing == failingSealed_ ? *failing : sealed;
    MemoryStore& keyringOrFailing = failing != nullptr && failing == failingKeyring_ ? *failing : keyring;
    const bool isSealed = wanted == StoreKind::kSealed;
    return credentials::keepCredentialsIn(wanted,
                                          isSealed ? sealedOrFailing : keyringOrFailing,
                                          isSealed ? &keyringOrFailing : &sealedOrFailing,
                                          *state_.database,
                                          choice(),
                                          state_.log);
  }
  StoreChoice choice() { return valueOf(StoreChoice::read(*state_.database)); }
  // That all is where it belongs and nothing elsewhere.
  void expectAllIn(StoreKind kind) {
    EXPECT_TRUE(choice().store == kind);
    EXPECT_FALSE(choice().hasLeftovers);
    EXPECT_TRUE((kind == StoreKind::kSealed ? *sealed_ : *keyring_) == all_);
    EXPECT_THAT((kind == StoreKind::kSealed ? *keyring_ : *sealed_), IsEmpty());
  }

  support::TemporaryDirectory temporary_;
  support::StoredState state_{temporary_.path("rvd")};
  std::shared_ptr<MemoryStore::Credentials> sealed_ = std::make_shared<MemoryStore::Credentials>();
  std::shared_ptr<MemoryStore::Credentials> keyring_ = std::make_shared<MemoryStore::Credentials>();
  MemoryStore* failingSealed_ = nullptr;
  MemoryStore* failingKeyring_ = nullptr;
  MemoryStore::Credentials all_;
  std::string account_;
};

TEST_F(Credentials, StayWhereTheyAreWhereTheSettingStays) {
  succeed(start(StoreKind::kSealed));
  expectAllIn(StoreKind::kSealed);
  EXPECT_THAT(state_.log.lines(), IsEmpty());
}

TEST_F(Credentials, AreMovedThereAndBack) {
  for (const StoreKind wanted : {StoreKind::kSecretService, StoreKind::kSealed, StoreKind::kSecretService}) {
    succeed(start(wanted));
    expectAllIn(wanted);
  }
  EXPECT_THAT(state_.log.texts(),
              Contains(HasSubstr("were moved from rvd's own database to the desktop's keyring")));
}

TEST_F(Credentials, ThatNobodyMayReadAreNotMoved) {
  state_.put("two", false);
  all_.erase(Place{account_, "two"});
  succeed(start(StoreKind::kSecretService));
  expectAllIn(StoreKind::kSecretService);
}

TEST_F(Credentials, OfWhichThereAreNoneNeedNoOtherStoreToBeMoved) {
  sealed_->clear();
  all_.clear();
  MemoryStore gone(keyring_);
  gone.setFailing(true);
  failingKeyring_ = &gone;
  succeed(start(StoreKind::kSecretService, &gone));
  expectAllIn(StoreKind::kSecretService);
}

TEST_F(Credentials, ThatCannotBeMovedAreRefusedWithAReasonAndWithoutASecret) {
  MemoryStore gone(keyring_);
  gone.setFailing(true);
  failingKeyring_ = &gone;
  const auto moved = start(StoreKind::kSecretService, &gone);
  ASSERT_FALSE(moved);
  EXPECT_THAT(moved.failure().message,
              ::testing::AllOf(HasSubstr("from rvd's own database to the desktop's keyring"),
                               HasSubstr("the store is gone"),
                               HasSubstr("set Store=sealed again")));
  EXPECT_TRUE(*sealed_ == all_);
  EXPECT_TRUE(choice().store == StoreKind::kSealed);
}

// Whatever call of whichever store is the last one that works, be it that rvd ends there or that the store is
// gone: all of it is in the one store or in the other, and the next start finishes the work.
class CredentialsOnTheirWay : public Credentials,
                              public ::testing::WithParamInterface<std::tuple<bool, bool, bool>> {};

TEST_P(CredentialsOnTheirWay, AreMovedAllOrNotAtAll) {
  const auto [isThere, isSealedFailing, isDone] = GetParam();
  const StoreKind from = isThere ? StoreKind::kSealed : StoreKind::kSecretService;
  const StoreKind to = isThere ? StoreKind::kSecretService : StoreKind::kSealed;
  int refused = 0;
  for (int call = 1;; ++call) {
    SCOPED_TRACE("call " + std::to_string(call));
    succeed(start(from));
    expectAllIn(from);
    MemoryStore failing(isSealedFailing ? sealed_ : keyring_);
    failing.failFrom(call, isDone);
    (isSealedFailing ? failingSealed_ : failingKeyring_) = &failing;
    const auto moved = start(to, &failing);
    failingSealed_ = failingKeyring_ = nullptr;
    const StoreKind holder = choice().store;
    EXPECT_EQ(static_cast<bool>(moved), holder == to);
    EXPECT_TRUE((holder == StoreKind::kSealed ? *sealed_ : *keyring_) == all_);
    if (!moved) {
      ++refused;
      EXPECT_EQ(moved.failure().message.find("secret of"), std::string::npos) << moved.failure().message;
    }
    // The next start: with the setting as it was before, or as it is now.
    const StoreKind next = call % 2 == 0 ? holder : to;
    succeed(start(next));
    expectAllIn(next);
    if (!failing.hasFailed()) break;
  }
  EXPECT_GE(refused, 4);
}

std::string nameOf(const ::testing::TestParamInfo<std::tuple<bool, bool, bool>>& info) {
  const auto [isThere, isSealedFailing, isDone] = info.param;
  return std::string(isThere ? "ToTheKeyring" : "FromTheKeyring") +
         (isSealedFailing ? "TheDatabaseFailing" : "TheKeyringFailing") + (isDone ? "After" : "Before");
}

INSTANTIATE_TEST_SUITE_P(Moves,
                         CredentialsOnTheirWay,
                         ::testing::Combine(::testing::Bool(), ::testing::Bool(), ::testing::Bool()),
                         nameOf);

TEST_F(Credentials, OfADatabaseAreToldFromThoseOfAnother) {
  support::StoredState other(temporary_.path("other"));
  EXPECT_NE(choice().name, valueOf(StoreChoice::read(*other.database)).name);
  EXPECT_EQ(choice().name.size(), 32U);
}

}  // namespace
