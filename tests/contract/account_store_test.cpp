#include <gtest/gtest.h>

#include "tests/contract/Suites.h"

namespace contract {
namespace {

const std::string kType(RVAccountTypeIdentifierFacebook);
const RVAccountType kFacebook(kType);
const RVAccountType kOther("com.example.other");

template <typename Services>
class AccountStore : public ::testing::Test {
 protected:
  RVDAuthorizationManager& manager() { return services_.store().authorizationManager(); }

  static RVDClientAuthorization authorization(const std::shared_ptr<const RVDClient>& client,
                                              bool granted,
                                              std::optional<RVPermissionSet> permissions = std::nullopt,
                                              std::optional<RVDictionary> options = std::nullopt) {
    RVDClientAuthorization made(client);
    made.setIsGranted(granted);
    made.setGrantedPermissions(std::move(permissions));
    made.setOptions(std::move(options));
    return made;
  }

  void put(const std::string& clientId, bool granted, const RVAccountType& type = kFacebook) {
    const auto client = support::StoredState::client(clientId);
    EXPECT_FALSE(manager().setAuthorization(authorization(client, granted), *client, type));
  }

  std::optional<RVDClientAuthorization> recordOf(const std::string& clientId,
                                                 const RVAccountType& type = kFacebook) {
    return manager().authorizationForClient(*support::StoredState::client(clientId), type);
  }

  std::vector<std::string> listed(const RVAccountType& type) {
    std::vector<std::string> ids;
    for (const auto& record : manager().allAuthorizationsForAccountType(type))
      ids.push_back(record.client()->bundleID().value_or("(none)"));
    return ids;
  }

  Services services_;
};

TYPED_TEST_SUITE(AccountStore, Implementations, Names);

TYPED_TEST(AccountStore, WithoutAccountsHandsOutNone) {
  EXPECT_TRUE(this->services_.store().accountsWithAccountTypeIdentifier(kType).empty());
}

TYPED_TEST(AccountStore, HandsOutTheAccountsOfTheTypeInTheOrderInWhichTheyWereAdded) {
  const std::string first = this->services_.addAccount(kType);
  this->services_.addAccount("com.example.other");
  const std::string second = this->services_.addAccount(kType);
  std::vector<std::string> found;
  for (const auto& account : this->services_.store().accountsWithAccountTypeIdentifier(kType))
    found.push_back(account->identifier());
  EXPECT_EQ(found, (std::vector{first, second}));
}

TYPED_TEST(AccountStore, ServesNoOtherCaseOfTheType) {
  this->services_.addAccount(kType);
  EXPECT_TRUE(this->services_.store().accountsWithAccountTypeIdentifier("com.zentor.Facebook").empty());
}

TYPED_TEST(AccountStore, HandsOutNewAccountObjectsThatNobodyElseSees) {
  this->services_.addAccount(kType);
  const auto mine = this->services_.store().accountsWithAccountTypeIdentifier(kType).at(0);
  EXPECT_EQ(mine->credential(), nullptr);
  const auto credential =
      std::make_shared<const RVAccountCredential>(RVSecret("t"), RVSecret(""), kRVDistantFuture);
  const auto type = std::make_shared<const RVAccountType>(kType);
  mine->setCredential(credential);
  mine->setAccountType(type);
  EXPECT_EQ(mine->credential(), credential);
  EXPECT_EQ(mine->accountType(), type);
  const auto theirs = this->services_.store().accountsWithAccountTypeIdentifier(kType).at(0);
  EXPECT_EQ(theirs->credential(), nullptr);
  EXPECT_NE(theirs->accountType(), type);
  EXPECT_EQ(theirs->identifier(), mine->identifier());
}

TYPED_TEST(AccountStore, DescribesAnAccountWithoutItsCredential) {
  this->services_.addAccount(kType);
  const auto account = this->services_.store().accountsWithAccountTypeIdentifier(kType).at(0);
  account->setCredential(
      std::make_shared<const RVAccountCredential>(RVSecret("s3cret"), RVSecret("r3fresh"), kRVDistantFuture));
  EXPECT_FALSE(account->description().empty());
  EXPECT_EQ(account->description().find("s3cret"), std::string::npos);
  EXPECT_EQ(account->description().find("r3fresh"), std::string::npos);
}

TYPED_TEST(AccountStore, HasNoRecordOfAClientThatNeverAsked) {
  EXPECT_FALSE(this->recordOf("org.example.App"));
  EXPECT_TRUE(this->listed(kFacebook).empty());
}

TYPED_TEST(AccountStore, KeepsEveryKindOfRecordAsItIs) {
  const std::vector<std::optional<RVPermissionSet>> permissions = {
      std::nullopt, RVPermissionSet{}, RVPermissionSet{"email", "user_photos", "ünï"}};
  const std::vector<std::optional<RVDictionary>> options = {
      std::nullopt,
      RVDictionary{},
      RVDictionary{{"app_id", "1234"}, {"audience", "friends"}},
      RVDictionary{{"app_id", std::int64_t{1}}, {"audience", RVArray{1.5, true, RVValue(), "x"}}}};
  const auto client = support::StoredState::client("org.example.App");
  for (const bool granted : {false, true}) {
    for (const auto& permission : permissions) {
      for (const auto& option : options) {
        const auto made = this->authorization(client, granted, permission, option);
        ASSERT_FALSE(this->manager().setAuthorization(made, *client, kFacebook));
        const auto record = this->recordOf("org.example.App");
        ASSERT_TRUE(record);
        EXPECT_EQ(record->isGranted(), granted);
        EXPECT_EQ(record->grantedPermissions(), permission);
        EXPECT_EQ(record->options(), option);
        EXPECT_EQ(record->client()->bundleID(), "org.example.App");
      }
    }
  }
  EXPECT_EQ(this->listed(kFacebook).size(), 1U);
}

TYPED_TEST(AccountStore, ARecordChangesNothingUntilItIsHandedBack) {
  this->put("org.example.App", true);
  auto record = this->recordOf("org.example.App");
  record->setIsGranted(false);
  EXPECT_TRUE(this->recordOf("org.example.App")->isGranted());
}

TYPED_TEST(AccountStore, FilesARecordUnderTheClientThatIsNamedBesideIt) {
  const auto one = support::StoredState::client("one");
  const auto two = support::StoredState::client("two");
  EXPECT_FALSE(this->manager().setAuthorization(this->authorization(one, true), *two, kFacebook));
  EXPECT_FALSE(this->recordOf("one"));
  EXPECT_TRUE(this->recordOf("two"));
}

TYPED_TEST(AccountStore, ListsRecordsInByteOrderOfTheClientIDs) {
  for (const char* id : {"b", "a", "Z", "é", "~", "", "aa", "a b"}) this->put(id, true);
  EXPECT_EQ(this->listed(kFacebook), (std::vector<std::string>{"", "Z", "a", "a b", "aa", "b", "~", "é"}));
}

TYPED_TEST(AccountStore, KeepsTheRecordsOfAccountTypesApart) {
  this->put("app", true, kFacebook);
  this->put("app", false, kOther);
  EXPECT_TRUE(this->recordOf("app", kFacebook)->isGranted());
  EXPECT_FALSE(this->recordOf("app", kOther)->isGranted());
  this->manager().removeAllClientAuthorizationsForAccountType(kFacebook);
  EXPECT_FALSE(this->recordOf("app", kFacebook));
  EXPECT_TRUE(this->recordOf("app", kOther));
}

TYPED_TEST(AccountStore, RemovesAllRecordsAlsoWhereThereAreNone) {
  this->manager().removeAllClientAuthorizationsForAccountType(kFacebook);
  this->put("one", true);
  this->put("two", false);
  this->manager().removeAllClientAuthorizationsForAccountType(kFacebook);
  EXPECT_TRUE(this->listed(kFacebook).empty());
}

TYPED_TEST(AccountStore, StoresNothingForAClientWithoutAnID) {
  const auto client = std::make_shared<fakes::FakeClient>(std::nullopt, "An unknown application");
  const auto error = this->manager().setAuthorization(this->authorization(client, true), *client, kFacebook);
  ASSERT_TRUE(error);
  EXPECT_EQ(error->domain, RVErrorDomain);
  EXPECT_EQ(error->code, kRVErrorClientWithoutBundleID);
  EXPECT_TRUE(this->listed(kFacebook).empty());
  EXPECT_FALSE(this->manager().authorizationForClient(*client, kFacebook));
}

TYPED_TEST(AccountStore, AnEmptyIDIsAnID) {
  this->put("", true);
  EXPECT_TRUE(this->recordOf(""));
}

}  // namespace
}  // namespace contract
