#include <gtest/gtest.h>

#include "daemon/credentials/SecretServiceStore.h"
#include "tests/contract/Suites.h"
#include "tests/support/DesktopKeyring.h"

namespace contract {
namespace {

const std::string kType(RVAccountTypeIdentifierFacebook);

template <typename Services>
class Keychain : public ::testing::Test {
 protected:
  void SetUp() override {
    accountId_ = services_.addAccount(kType);
    services_.addAccount(kType);
  }

  std::shared_ptr<RVAccount> account(std::size_t index = 0) {
    return services_.store().accountsWithAccountTypeIdentifier(kType).at(index);
  }
  static std::shared_ptr<const RVAccountCredential> credential(std::string_view token) {
    return std::make_shared<const RVAccountCredential>(RVSecret(token), RVSecret(""), kRVDistantFuture);
  }
  std::optional<RVError> set(const std::optional<std::string>& clientId,
                             const std::shared_ptr<const RVAccountCredential>& stored,
                             std::size_t index = 0) {
    const auto carrier = account(index);
    carrier->setCredential(stored);
    return services_.keychain().setCredentialForAccount(*carrier, clientId);
  }
  std::shared_ptr<const RVAccountCredential> get(const std::optional<std::string>& clientId,
                                                 std::size_t index = 0) {
    return services_.keychain().credentialForAccount(*account(index), clientId);
  }
  std::optional<std::string> token(const std::optional<std::string>& clientId, std::size_t index = 0) {
    const auto found = get(clientId, index);
    if (found == nullptr) return std::nullopt;
    return std::string(found->oauthToken().reveal());
  }

  Services services_;
  std::string accountId_;
};

// The daemon's services with the credentials in the desktop's keyring.
class KeyringServices : private support::DesktopKeyring, public DaemonServices {
 public:
  KeyringServices()
      : DaemonServices(
            [](auto&) { return std::make_unique<credentials::SecretServiceStore>("a database"); }) {}
};

struct KeychainNames {
  template <typename Services>
  static std::string GetName(int number) {
    return std::is_same_v<Services, KeyringServices> ? "SecretService" : Names::GetName<Services>(number);
  }
};

using Keychains = ::testing::Types<FakeServices, DaemonServices, KeyringServices>;
TYPED_TEST_SUITE(Keychain, Keychains, KeychainNames);

TYPED_TEST(Keychain, HoldsNothingAtFirst) {
  EXPECT_EQ(this->get("app"), nullptr);
  EXPECT_EQ(this->get(std::nullopt), nullptr);
}

TYPED_TEST(Keychain, GivesBackWhatTheAccountObjectCarried) {
  using std::string_literals::operator""s;
  const RVAccountCredential stored(
      RVSecret("tok\0en\xff"s), RVSecret("refresh"), RVDate(std::chrono::seconds(-5)));
  EXPECT_FALSE(this->set("app", std::make_shared<const RVAccountCredential>(stored)));
  const auto found = this->get("app");
  ASSERT_NE(found, nullptr);
  EXPECT_TRUE(*found == stored);
}

TYPED_TEST(Keychain, KeepsEmptyTokens) {
  EXPECT_FALSE(this->set("app", this->credential("")));
  EXPECT_EQ(this->token("app"), "");
  EXPECT_TRUE(this->get("app")->expiryDate() == kRVDistantFuture);
}

TYPED_TEST(Keychain, ReplacesWhatWasThere) {
  EXPECT_FALSE(this->set("app", this->credential("old")));
  EXPECT_FALSE(this->set("app", this->credential("new")));
  EXPECT_EQ(this->token("app"), "new");
}

TYPED_TEST(Keychain, KeepsClientsAndAccountsApart) {
  EXPECT_FALSE(this->set("one", this->credential("1")));
  EXPECT_FALSE(this->set("two", this->credential("2")));
  EXPECT_FALSE(this->set("one", this->credential("3"), 1));
  EXPECT_EQ(this->token("one"), "1");
  EXPECT_EQ(this->token("two"), "2");
  EXPECT_EQ(this->token("one", 1), "3");
  EXPECT_EQ(this->token("two", 1), std::nullopt);
  EXPECT_EQ(this->token("One"), std::nullopt);
}

TYPED_TEST(Keychain, AnEmptyClientIDIsNotNoClientID) {
  this->services_.setMasterToken(this->accountId_, "master");
  EXPECT_EQ(this->token(""), std::nullopt);
  EXPECT_FALSE(this->set("", this->credential("empty")));
  EXPECT_EQ(this->token(""), "empty");
  EXPECT_EQ(this->token(std::nullopt), "master");
  EXPECT_FALSE(this->services_.keychain().removeCredentialForAccount(*this->account(), ""));
  EXPECT_EQ(this->token(""), std::nullopt);
  EXPECT_EQ(this->token(std::nullopt), "master");
}

TYPED_TEST(Keychain, LetsNobodyChangeAnAccountsOwnCredential) {
  EXPECT_TRUE(this->set(std::nullopt, this->credential("forged")));
  EXPECT_EQ(this->token(std::nullopt), std::nullopt);
  this->services_.setMasterToken(this->accountId_, "master");
  EXPECT_TRUE(this->set(std::nullopt, this->credential("forged")));
  EXPECT_TRUE(this->services_.keychain().removeCredentialForAccount(*this->account(), std::nullopt));
  EXPECT_EQ(this->token(std::nullopt), "master");
}

TYPED_TEST(Keychain, AMasterCredentialCanBeReplacedAndNeverExpires) {
  this->services_.setMasterToken(this->accountId_, "old");
  this->services_.setMasterToken(this->accountId_, "new");
  EXPECT_EQ(this->token(std::nullopt), "new");
  EXPECT_TRUE(this->get(std::nullopt)->expiryDate() == kRVDistantFuture);
  EXPECT_EQ(this->token(std::nullopt, 1), std::nullopt);
}

TYPED_TEST(Keychain, StoresNothingForAnAccountObjectThatCarriesNothing) {
  EXPECT_TRUE(this->set("app", nullptr));
  EXPECT_EQ(this->token("app"), std::nullopt);
  EXPECT_FALSE(this->set("app", this->credential("kept")));
  EXPECT_TRUE(this->set("app", nullptr));
  EXPECT_EQ(this->token("app"), "kept");
}

TYPED_TEST(Keychain, RemovesOneCredentialAlone) {
  EXPECT_FALSE(this->set("one", this->credential("1")));
  EXPECT_FALSE(this->set("two", this->credential("2")));
  EXPECT_FALSE(this->services_.keychain().removeCredentialForAccount(*this->account(), "one"));
  EXPECT_EQ(this->token("one"), std::nullopt);
  EXPECT_EQ(this->token("two"), "2");
}

TYPED_TEST(Keychain, RemovingWhatIsNotThereIsASuccess) {
  EXPECT_FALSE(this->services_.keychain().removeCredentialForAccount(*this->account(), "app"));
}

}  // namespace
}  // namespace contract
