#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>

#include "daemon/credentials/CredentialBytes.h"
#include "daemon/credentials/SealingKey.h"
#include "tests/support/StoredState.h"

namespace {

using credentials::SealingKey;
using ::testing::HasSubstr;
using std::string_literals::operator""s;

class ASealingKey : public ::testing::Test {
 protected:
  base::Result<SealingKey::Opened> open(const std::optional<std::filesystem::path>& handedIn = std::nullopt) {
    return SealingKey::open(*directory_, handedIn);
  }
  std::string refusal(const std::optional<std::filesystem::path>& handedIn = std::nullopt) {
    const auto opened = open(handedIn);
    if (opened) return "(opened)";
    EXPECT_EQ(opened.failure().kind, base::FailureKind::kRefused);
    return opened.failure().message;
  }

  support::TemporaryDirectory temporary_;
  std::unique_ptr<state::Directory> directory_ =
      support::valueOf(state::Directory::open(temporary_.path("rvd")));
  const std::string file_ = temporary_.path("rvd/credentials.key");
};

TEST_F(ASealingKey, IsMadeOnceForItsOwnerAlone) {
  const mode_t before = ::umask(0);
  const auto first = open();
  ::umask(before);
  ASSERT_TRUE(first);
  EXPECT_TRUE(first->isNew);
  struct stat status {};
  ASSERT_EQ(::stat(file_.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600U);
  const std::string content = support::contentOf(file_);
  EXPECT_EQ(content.size(), 32U);
  const auto second = open();
  ASSERT_TRUE(second);
  EXPECT_FALSE(second->isNew);
  EXPECT_EQ(support::contentOf(file_), content);
  const std::string sealed = first->key.seal(RVSecret("text"), "bound");
  EXPECT_TRUE(second->key.open(sealed, "bound") == RVSecret("text"));
}

TEST_F(ASealingKey, OfAnotherSizeIsRefusedAndLeftAlone) {
  for (const std::size_t size : {0U, 1U, 31U, 33U, 64U, 100'000U}) {
    temporary_.write("rvd/credentials.key", std::string(size, 'k'), 0600);
    EXPECT_THAT(refusal(), HasSubstr("no key of 32 bytes"));
    EXPECT_EQ(support::contentOf(file_), std::string(size, 'k'));
  }
}

TEST_F(ASealingKey, ThatOthersCouldHaveReadIsRefusedAndLeftAlone) {
  for (const mode_t mode : {0640, 0644, 0604, 0620, 0660}) {
    temporary_.write("rvd/credentials.key", std::string(32, 'k'), mode);
    EXPECT_THAT(refusal(), HasSubstr("chmod 600")) << std::oct << mode;
  }
}

TEST_F(ASealingKey, BehindALinkIsRefused) {
  std::filesystem::create_symlink(temporary_.write("outside", std::string(32, 'k'), 0600), file_);
  refusal();
  std::filesystem::remove(file_);
  std::filesystem::create_symlink(temporary_.path("nowhere"), file_);
  refusal();
  EXPECT_FALSE(std::filesystem::exists(temporary_.path("nowhere")));
}

TEST_F(ASealingKey, CanBeHandedIn) {
  const std::string key(32, 'k');
  for (const mode_t mode : {0400, 0440, 0600}) {
    const auto handedIn = open(temporary_.write("key" + std::to_string(mode), key, mode));
    ASSERT_TRUE(handedIn);
    EXPECT_FALSE(handedIn->isNew);
  }
  EXPECT_FALSE(std::filesystem::exists(file_));
  // It is the very key.
  const std::string sealed = open(temporary_.path("key256"))->key.seal(RVSecret("text"), "");
  temporary_.write("rvd/credentials.key", key, 0600);
  EXPECT_TRUE(open()->key.open(sealed, "") == RVSecret("text"));
}

TEST_F(ASealingKey, ThatIsHandedInMustBeSafeAsWell) {
  for (const mode_t mode : {0404, 0444, 0420, 0402, 0777})
    EXPECT_THAT(refusal(temporary_.write("key", std::string(32, 'k'), mode)), HasSubstr("mode 0400"));
  EXPECT_THAT(refusal(temporary_.write("short", "k", 0400)), HasSubstr("no key of 32 bytes"));
  std::filesystem::create_symlink(temporary_.write("good", std::string(32, 'k'), 0400),
                                  temporary_.path("link"));
  EXPECT_FALSE(open(temporary_.path("link")));
  EXPECT_FALSE(open(temporary_.path("nothing")));
  EXPECT_FALSE(std::filesystem::exists(file_));
}

TEST_F(ASealingKey, OpensNothingButWhatItSealedForTheSamePlace) {
  const auto opened = open();
  ASSERT_TRUE(opened);
  const SealingKey& key = opened->key;
  const std::string sealed = key.seal(RVSecret("a secret"), "here");
  EXPECT_EQ(sealed.size(), 24 + 8 + 16U);
  EXPECT_EQ(sealed.find("a secret"), std::string::npos);
  EXPECT_NE(sealed, key.seal(RVSecret("a secret"), "here"));
  EXPECT_TRUE(key.open(sealed, "here") == RVSecret("a secret"));
  EXPECT_FALSE(key.open(sealed, "there"));
  EXPECT_FALSE(key.open(sealed, ""));
  for (std::size_t i = 0; i < sealed.size() * 8; ++i) {
    std::string changed = sealed;
    changed[i / 8] = static_cast<char>(changed[i / 8] ^ (1 << i % 8));
    EXPECT_FALSE(key.open(changed, "here")) << i;
  }
  for (std::size_t size = 0; size < sealed.size(); ++size)
    EXPECT_FALSE(key.open(sealed.substr(0, size), "here"));
  EXPECT_TRUE(key.open(key.seal(RVSecret(), ""), "") == RVSecret());
}

TEST(CredentialBytes, AreWhatTheDocumentDraws) {
  const RVAccountCredential credential(RVSecret("tok"), RVSecret("r"), RVDate(std::chrono::seconds(258)));
  EXPECT_EQ(credentials::bytesFromCredential(credential).reveal(),
            "\1"
            "\3\0\0\0\0\0\0\0"
            "tok"
            "\1\0\0\0\0\0\0\0"
            "r"
            "\2\1\0\0\0\0\0\0"s);
  EXPECT_EQ(credentials::bindingOf("acc", std::nullopt),
            "\1"
            "\3\0\0\0\0\0\0\0"
            "acc"
            "\0"s);
  EXPECT_EQ(credentials::bindingOf("acc", "cl"),
            "\1"
            "\3\0\0\0\0\0\0\0"
            "acc"
            "\1"
            "\2\0\0\0\0\0\0\0"
            "cl"s);
}

TEST(CredentialBytes, GiveEveryCredentialBack) {
  for (const auto& expiry :
       {RVDate(std::chrono::seconds(-1)), RVDate(), kRVDistantFuture, RVDate::min(), RVDate::max()}) {
    for (const std::string& token : {""s, "token"s, "\0\xff"s, std::string(70'000, 't')}) {
      const RVAccountCredential credential{RVSecret(token), RVSecret("refresh"), expiry};
      const auto back = credentials::credentialFromBytes(credentials::bytesFromCredential(credential));
      ASSERT_TRUE(back);
      EXPECT_TRUE(*back == credential);
    }
  }
}

TEST(CredentialBytes, ThatAreCutOrContinuedAreNone) {
  const RVAccountCredential credential{RVSecret("token"), RVSecret("refresh"), kRVDistantFuture};
  const std::string bytes(credentials::bytesFromCredential(credential).reveal());
  for (std::size_t size = 0; size < bytes.size(); ++size)
    EXPECT_FALSE(credentials::credentialFromBytes(RVSecret(bytes.substr(0, size)))) << size;
  EXPECT_FALSE(credentials::credentialFromBytes(RVSecret(bytes + "x")));
  EXPECT_FALSE(credentials::credentialFromBytes(RVSecret("\2" + bytes.substr(1))));
  std::string endless = bytes;
  endless.replace(1, 8, 8, '\xff');
  EXPECT_FALSE(credentials::credentialFromBytes(RVSecret(endless)));
}

TEST(CredentialBytes, BindNoTwoPlacesAlike) {
  EXPECT_NE(credentials::bindingOf("a", std::nullopt), credentials::bindingOf("a", ""));
  EXPECT_NE(credentials::bindingOf("ab", "c"), credentials::bindingOf("a", "bc"));
  EXPECT_NE(credentials::bindingOf("a", "b"), credentials::bindingOf("b", "a"));
}

}  // namespace
