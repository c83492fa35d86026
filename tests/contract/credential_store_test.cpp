#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "daemon/credentials/SecretServiceStore.h"
#include "tests/support/DesktopKeyring.h"
#include "tests/support/MemoryStore.h"
#include "tests/support/StoredState.h"

namespace {

using credentials::Place;
using support::succeed;
using support::valueOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;
using std::string_literals::operator""s;

struct InMemory {
  support::MemoryStore store;
  std::string account(const std::string& name) { return name; }
};

struct Sealed {
  support::TemporaryDirectory directory;
  support::StoredState state{directory.path("rvd")};
  credentials::CredentialStore& store = *state.credentialStore;
  std::string account(const std::string&) {
    return valueOf(state.accounts->add(std::string(RVAccountTypeIdentifierFacebook), "me")).identifier;
  }
};

struct Desktop {
  support::DesktopKeyring keyring;
  credentials::SecretServiceStore store{"a database"};
  std::string account(const std::string& name) { return name; }
};

struct Names {
  template <typename Kind>
  static std::string GetName(int) {
    if (std::is_same_v<Kind, InMemory>) return "Memory";
    return std::is_same_v<Kind, Sealed> ? "Sealed" : "SecretService";
  }
};

template <typename Kind>
class ACredentialStore : public ::testing::Test {
 protected:
  static RVAccountCredential credential(const std::string& token) {
    return {RVSecret(token), RVSecret(), kRVDistantFuture};
  }
  void write(const Place& place, const std::string& token) {
    succeed(kind_.store.write(place, credential(token)));
  }
  std::string token(const Place& place) {
    const auto found = valueOf(kind_.store.read(place));
    return found ? std::string(found->oauthToken().reveal()) : "(absent)";
  }

  Kind kind_;
  credentials::CredentialStore& store_ = kind_.store;
  const std::string one_ = kind_.account("one");
  const std::string two_ = kind_.account("two");
};

using Kinds = ::testing::Types<InMemory, Sealed, Desktop>;
TYPED_TEST_SUITE(ACredentialStore, Kinds, Names);

TYPED_TEST(ACredentialStore, HoldsNothingAtFirst) {
  EXPECT_THAT(valueOf(this->store_.places()), IsEmpty());
  EXPECT_EQ(this->token({this->one_, "app"}), "(absent)");
  EXPECT_EQ(this->token({this->one_, std::nullopt}), "(absent)");
}

TYPED_TEST(ACredentialStore, GivesBackTheVeryCredential) {
  const RVAccountCredential stored(
      RVSecret("tok\0en\xff\n"s), RVSecret("refresh"), RVDate(std::chrono::seconds(-5)));
  succeed(this->store_.write({this->one_, "app"}, stored));
  EXPECT_TRUE(*valueOf(this->store_.read({this->one_, "app"})) == stored);
  const RVAccountCredential large(
      RVSecret(std::string(100'000, 'x')), RVSecret(""), RVDate(std::chrono::seconds(7)));
  succeed(this->store_.write({this->one_, "app"}, large));
  EXPECT_TRUE(*valueOf(this->store_.read({this->one_, "app"})) == large);
}

TYPED_TEST(ACredentialStore, TakesAnyBytesForAClientAndKeepsAllApart) {
  std::vector<Place> places{{this->one_, std::nullopt}, {this->two_, std::nullopt}};
  for (const std::string& client : {"app"s,
                                    "App"s,
                                    ""s,
                                    "a\0b"s,
                                    "a"s,
                                    "new\nline"s,
                                    "\xff\xfe"s,
                                    "100%41"s,
                                    "100A"s,
                                    "caf\xc3\xa9"s,
                                    "*"s,
                                    " "s})
    places.push_back({this->one_, client});
  places.push_back({this->two_, "app"});
  for (std::size_t i = 0; i < places.size(); ++i) this->write(places[i], std::to_string(i));
  for (std::size_t i = 0; i < places.size(); ++i) EXPECT_EQ(this->token(places[i]), std::to_string(i));
  EXPECT_THAT(valueOf(this->store_.places()), ::testing::UnorderedElementsAreArray(places));
  // None goes with another.
  while (!places.empty()) {
    succeed(this->store_.remove(places.back()));
    places.pop_back();
    EXPECT_THAT(valueOf(this->store_.places()), ::testing::UnorderedElementsAreArray(places));
  }
}

TYPED_TEST(ACredentialStore, ReplacesWhatWasThere) {
  this->write({this->one_, "app"}, "old");
  this->write({this->one_, "app"}, "new");
  EXPECT_EQ(this->token({this->one_, "app"}), "new");
  this->write({this->one_, std::nullopt}, "old");
  this->write({this->one_, std::nullopt}, "new");
  EXPECT_EQ(this->token({this->one_, std::nullopt}), "new");
  EXPECT_THAT(valueOf(this->store_.places()),
              UnorderedElementsAre(Place{this->one_, "app"}, Place{this->one_, std::nullopt}));
}

TYPED_TEST(ACredentialStore, RemovesOnePlaceAlone) {
  this->write({this->one_, "app"}, "client");
  this->write({this->one_, std::nullopt}, "own");
  succeed(this->store_.remove({this->one_, std::nullopt}));
  EXPECT_EQ(this->token({this->one_, std::nullopt}), "(absent)");
  EXPECT_THAT(valueOf(this->store_.places()), ElementsAre(Place{this->one_, "app"}));
  succeed(this->store_.remove({this->one_, "app"}));
  EXPECT_THAT(valueOf(this->store_.places()), IsEmpty());
}

TYPED_TEST(ACredentialStore, RemovesWhatIsNotThere) {
  EXPECT_TRUE(this->store_.remove({this->one_, "app"}));
  EXPECT_TRUE(this->store_.remove({this->one_, std::nullopt}));
}

}  // namespace
