#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <thread>

#include "daemon/config/Entitlements.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using config::Entitlements;
using Names = Entitlements::Names;

constexpr std::string_view kPolicy = "[org.example.App]\nEntitlements=a;b;\n";

class ThePolicy : public testing::Test {
 protected:
  ThePolicy() { directory_.write("entitlements.d/first.conf", kPolicy); }

  Entitlements read() {
    return Entitlements(directory_.path("entitlements.d"), {::getuid(), directory_.path()}, log_);
  }
  Names namesAfterReading() { return read().entitlementsOfClient("org.example.App"); }
  std::string path(const std::string& name) { return directory_.path("entitlements.d/" + name); }

  // Nothing is given, and one line says so.
  void expectRefusal(const std::string& what) {
    log_.clear();
    EXPECT_EQ(namesAfterReading(), Names{}) << what;
    ASSERT_EQ(log_.lines().size(), 1u) << what;
    EXPECT_EQ(log_.lines()[0].level, kRVLogLevelError);
  }

  support::TemporaryDirectory directory_;
  fakes::FakeLog log_;
  const Names given_{"a", "b"};
};

TEST_F(ThePolicy, GivesAClientWhatItsSectionNames) {
  const Entitlements entitlements = read();
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), given_);
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.app"), Names{});
  EXPECT_EQ(entitlements.entitlementsOfClient(""), Names{});
  EXPECT_TRUE(log_.lines().empty());
}

TEST_F(ThePolicy, OfSeveralFilesAddsUp) {
  directory_.write("entitlements.d/second.conf",
                   "[org.example.App]\nEntitlements= c ; ;a\n[other]\nEntitlements=d\n[none]\n");
  const Entitlements entitlements = read();
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), (Names{"a", "b", "c"}));
  EXPECT_EQ(entitlements.entitlementsOfClient("other"), Names{"d"});
  EXPECT_EQ(entitlements.entitlementsOfClient("none"), Names{});
}

TEST_F(ThePolicy, IsReadOnlyFromFilesOfItsName) {
  directory_.write("entitlements.d/second.conf~", "[x]\nEntitlements=c\n");
  directory_.write("entitlements.d/.third.conf", "[x]\nEntitlements=c\n");
  EXPECT_EQ(read().entitlementsOfClient("x"), Names{});
  EXPECT_TRUE(log_.lines().empty());
}

TEST_F(ThePolicy, ThatIsNotThereGivesNothingSilently) {
  const Entitlements entitlements(directory_.path("none"), {::getuid(), directory_.path()}, log_);
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), Names{});
  EXPECT_TRUE(log_.lines().empty());
}

TEST_F(ThePolicy, IsReadAnewWhenAFileChanges) {
  const Entitlements entitlements = read();
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), given_);
  directory_.write("entitlements.d/first.conf", "[org.example.App]\nEntitlements=c\n");
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), Names{"c"});
  directory_.write("entitlements.d/second.conf", "[org.example.App]\nEntitlements=d\n");
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), (Names{"c", "d"}));
  std::filesystem::remove(path("first.conf"));
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), Names{"d"});
  ASSERT_EQ(::chmod(path("second.conf").c_str(), 0666), 0);
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), Names{});
}

TEST_F(ThePolicy, IsReadAnewWhenADirectoryAboveItChanges) {
  directory_.write("a/b/first.conf", kPolicy);
  const Entitlements entitlements(directory_.path("a/b"), {::getuid(), directory_.path()}, log_);
  const auto names = [&] { return entitlements.entitlementsOfClient("org.example.App"); };
  EXPECT_EQ(names(), given_);
  for (const std::string& directory : {directory_.path(), directory_.path("a"), directory_.path("a/b")}) {
    ASSERT_EQ(::chmod(directory.c_str(), 0777), 0);
    EXPECT_EQ(names(), Names{}) << directory;
    ASSERT_EQ(::chmod(directory.c_str(), 0755), 0);
    EXPECT_EQ(names(), given_) << directory;
  }
  std::filesystem::rename(directory_.path("a"), directory_.path("aside"));
  EXPECT_EQ(names(), Names{});
  directory_.write("a/b/first.conf", "[org.example.App]\nEntitlements=c\n");
  EXPECT_EQ(names(), Names{"c"});
}

TEST_F(ThePolicy, ThatSomebodyElseMayWriteByAnAccessListIsNotBelieved) {
  const auto allow = [](const std::string& file) {
    return std::system(("setfacl -m u:12345:rw '" + file + "' 2>/dev/null").c_str()) == 0;
  };
  if (!allow(path("first.conf"))) GTEST_SKIP() << "the file system keeps no access lists";
  expectRefusal("file");
  ASSERT_EQ(std::system(("setfacl -b '" + path("first.conf") + "'").c_str()), 0);
  EXPECT_EQ(namesAfterReading(), given_);
  ASSERT_TRUE(allow(directory_.path("entitlements.d")));
  expectRefusal("directory");
}

TEST_F(ThePolicy, IsJudgedByTheFileAndNotByHowManyNamesItHas) {
  std::filesystem::create_hard_link(path("first.conf"), directory_.path("elsewhere"));
  EXPECT_EQ(namesAfterReading(), given_);
  ASSERT_EQ(::chmod(directory_.path("elsewhere").c_str(), 0666), 0);
  expectRefusal("changed under its other name");
}

TEST_F(ThePolicy, InAFileThatOthersCanWriteIsNotBelieved) {
  for (mode_t mode = 0400; mode <= 0777; ++mode) {
    ASSERT_EQ(::chmod(path("first.conf").c_str(), mode), 0);
    if ((mode & 0022) == 0)
      EXPECT_EQ(namesAfterReading(), given_) << std::oct << mode;
    else
      expectRefusal(std::to_string(mode));
  }
}

TEST_F(ThePolicy, BelowADirectoryThatOthersCanWriteIsNotBelieved) {
  directory_.write("a/b/c/first.conf", kPolicy);
  const auto names = [this] {
    log_.clear();
    return Entitlements(directory_.path("a/b/c"), {::getuid(), directory_.path()}, log_)
        .entitlementsOfClient("org.example.App");
  };
  EXPECT_EQ(names(), given_);
  for (const std::string& directory : {std::string("a"), std::string("a/b"), std::string("a/b/c")}) {
    for (const mode_t mode : {mode_t{0775}, mode_t{0757}, mode_t{01777}}) {
      ASSERT_EQ(::chmod(directory_.path(directory).c_str(), mode), 0);
      EXPECT_EQ(names(), Names{}) << directory;
      EXPECT_EQ(log_.lines().size(), 1u);
    }
    ASSERT_EQ(::chmod(directory_.path(directory).c_str(), 0755), 0);
  }
  ASSERT_EQ(::chmod(directory_.path().c_str(), 0770), 0);
  EXPECT_EQ(names(), Names{});
}

TEST_F(ThePolicy, OfAnotherOwnerIsNotBelieved) {
  const Entitlements entitlements(
      directory_.path("entitlements.d"), {::getuid() + 1, directory_.path()}, log_);
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), Names{});
  EXPECT_EQ(log_.lines().size(), 1u);
}

TEST_F(ThePolicy, InAFileOrDirectoryGivenAwayIsNotBelieved) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can give files away";
  ASSERT_EQ(::chown(path("first.conf").c_str(), 12345, 0), 0);
  expectRefusal("file");
  ASSERT_EQ(::chown(path("first.conf").c_str(), 0, 12345), 0);
  EXPECT_EQ(namesAfterReading(), given_);
  ASSERT_EQ(::chown(directory_.path("entitlements.d").c_str(), 12345, 0), 0);
  expectRefusal("directory");
}

TEST_F(ThePolicy, BehindASymbolicLinkIsNotBelieved) {
  std::filesystem::rename(path("first.conf"), directory_.path("elsewhere"));
  std::filesystem::create_symlink(directory_.path("elsewhere"), path("first.conf"));
  expectRefusal("file");
  std::filesystem::remove(path("first.conf"));
  std::filesystem::rename(directory_.path("elsewhere"), path("first.conf"));
  std::filesystem::rename(directory_.path("entitlements.d"), directory_.path("moved"));
  std::filesystem::create_directory_symlink("moved", directory_.path("entitlements.d"));
  expectRefusal("directory");
}

TEST_F(ThePolicy, OfAPathThatGoesRoundIsNotBelieved) {
  for (const std::string& round : {directory_.path("entitlements.d/../entitlements.d"),
                                   directory_.path("./entitlements.d"),
                                   directory_.path() + "2/entitlements.d",
                                   std::string("entitlements.d"),
                                   std::string("/")}) {
    log_.clear();
    const Entitlements entitlements(round, {::getuid(), directory_.path()}, log_);
    EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), Names{}) << round;
    EXPECT_EQ(log_.lines().size(), 1u) << round;
  }
}

TEST_F(ThePolicy, OfOneBadFileLeavesTheOthersStanding) {
  directory_.write("entitlements.d/a.conf", "[x]\nEntitlements=c\nnonsense\n");
  directory_.write("entitlements.d/b.conf", "[x]\nEntitlement=c\n");
  directory_.write("entitlements.d/c.conf", "[x]\nEntitlements=c\n" + std::string(70000, '#') + "\n");
  directory_.write("entitlements.d/d.conf", "[x]\nEntitlements=\xff\n");
  ASSERT_EQ(::mkfifo(path("e.conf").c_str(), 0600), 0);
  ASSERT_EQ(::mkdir(path("f.conf").c_str(), 0700), 0);
  const Entitlements entitlements = read();
  EXPECT_EQ(entitlements.entitlementsOfClient("x"), Names{});
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), given_);
  EXPECT_EQ(log_.lines().size(), 6u);
}

TEST_F(ThePolicy, IsEitherTheOldOrTheNewOneWhileAFileIsReplaced) {
  const Entitlements entitlements = read();
  std::atomic<bool> isDone = false;
  std::thread replacer([this, &isDone] {
    for (int round = 0; round < 10'000; ++round) {
      directory_.write("next", round % 2 != 0 ? kPolicy : "[org.example.App]\nEntitlements=c;d\n");
      std::rename(directory_.path("next").c_str(), path("first.conf").c_str());
    }
    isDone = true;
  });
  const Names other{"c", "d"};
  do {
    const Names names = entitlements.entitlementsOfClient("org.example.App");
    EXPECT_TRUE(names == given_ || names == other);
  } while (!isDone);
  replacer.join();
  EXPECT_EQ(entitlements.entitlementsOfClient("org.example.App"), given_);
  EXPECT_TRUE(log_.lines().empty());
}

}  // namespace
