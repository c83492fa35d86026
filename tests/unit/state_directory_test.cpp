#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "daemon/state/Directory.h"
#include "tests/support/StoredState.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using ::testing::HasSubstr;

mode_t modeOf(const std::string& path) {
  struct stat status {};
  return ::lstat(path.c_str(), &status) == 0 ? status.st_mode & 07777 : 0;
}

class Umask {
 public:
  explicit Umask(mode_t mask)
      : before_(::umask(mask)) {}
  ~Umask() { ::umask(before_); }

 private:
  const mode_t before_;
};

class AStateDirectory : public ::testing::Test {
 protected:
  std::string refusal(const std::string& path) {
    const auto opened = state::Directory::open(path);
    if (opened) return "(opened)";
    EXPECT_EQ(opened.failure().kind, base::FailureKind::kRefused);
    return opened.failure().message;
  }

  support::TemporaryDirectory temporary_;
  const std::string path_ = temporary_.path("rvd");
};

TEST_F(AStateDirectory, IsMadeForItsOwnerAloneUnderAnyUmask) {
  for (const mode_t mask : {0000, 0022, 0077, 0777}) {
    const Umask set(mask);
    const std::string path = temporary_.path(std::to_string(mask)) + "/state/rvd";
    ASSERT_TRUE(state::Directory::open(path));
    EXPECT_EQ(modeOf(path), 0700U);
    EXPECT_EQ(modeOf(temporary_.path(std::to_string(mask)) + "/state"), 0700U);
    EXPECT_EQ(modeOf(path + "/lock"), 0600U);
  }
}

TEST_F(AStateDirectory, ThatOthersCanEnterIsRefusedAndNotMended) {
  for (const mode_t mode : {0750, 0705, 0710, 0701, 0777}) {
    std::filesystem::create_directory(path_);
    ASSERT_EQ(::chmod(path_.c_str(), mode), 0);
    EXPECT_THAT(refusal(path_), HasSubstr("chmod 700 " + path_));
    EXPECT_EQ(modeOf(path_), mode);
    EXPECT_TRUE(std::filesystem::is_empty(path_));
  }
}

TEST_F(AStateDirectory, OfAnotherUserIsRefused) {
  std::filesystem::create_directory(path_);
  ASSERT_EQ(::chmod(path_.c_str(), 0700), 0);
  if (::chown(path_.c_str(), 65534, 65534) != 0) GTEST_SKIP() << "only root can give a directory away";
  EXPECT_THAT(refusal(path_), HasSubstr("belongs to user 65534"));
}

TEST_F(AStateDirectory, ThatIsASymbolicLinkIsRefused) {
  std::filesystem::create_directory(temporary_.path("elsewhere"));
  std::filesystem::create_symlink(temporary_.path("elsewhere"), path_);
  EXPECT_THAT(refusal(path_), HasSubstr("symbolic link"));
  EXPECT_THAT(refusal(path_ + "/"), HasSubstr("symbolic link"));
  EXPECT_TRUE(std::filesystem::is_empty(temporary_.path("elsewhere")));
}

TEST_F(AStateDirectory, ThatIsNoDirectoryCannotBeOpened) {
  temporary_.write("rvd", "text", 0600);
  EXPECT_FALSE(state::Directory::open(path_));
  EXPECT_EQ(support::contentOf(path_), "text");
}

TEST_F(AStateDirectory, BelowASymbolicLinkIsKnownByItsRealPath) {
  std::filesystem::create_directory(temporary_.path("real"));
  std::filesystem::create_symlink("real", temporary_.path("alias"));
  const auto opened = state::Directory::open(temporary_.path("alias/rvd/"));
  ASSERT_TRUE(opened);
  EXPECT_EQ((*opened)->path(), temporary_.path("real/rvd"));
}

TEST_F(AStateDirectory, IsHeldByOneAtATime) {
  {
    const auto first = state::Directory::open(path_);
    ASSERT_TRUE(first);
    EXPECT_THAT(refusal(path_), HasSubstr("in use by another rvd"));
  }
  EXPECT_TRUE(state::Directory::open(path_));
}

class AStateFile : public ::testing::Test {
 protected:
  void write(const std::string& name, const std::string& content, mode_t mode = 0600) {
    temporary_.write("rvd/" + name, content, mode);
  }
  bool isRefused(const std::string& name) {
    const auto checked = directory_->checkFile(name);
    const auto opened = directory_->openFile(name);
    const auto read = directory_->readFile(name, 100);
    return !checked && checked.failure().kind == base::FailureKind::kRefused && !opened && !read;
  }

  support::TemporaryDirectory temporary_;
  const std::string path_ = temporary_.path("rvd");
  std::unique_ptr<state::Directory> directory_ = support::valueOf(state::Directory::open(path_));
};

TEST_F(AStateFile, ThatIsNotThereIsAbsent) {
  EXPECT_FALSE(support::valueOf(directory_->checkFile("file")));
  EXPECT_FALSE(support::valueOf(directory_->readFile("file", 100)));
}

TEST_F(AStateFile, IsReadUpToTheLimit) {
  write("file", "0123456789");
  EXPECT_EQ(support::valueOf(directory_->readFile("file", 10)), "0123456789");
  const auto tooLong = directory_->readFile("file", 9);
  ASSERT_FALSE(tooLong);
  EXPECT_EQ(tooLong.failure().kind, base::FailureKind::kInvalid);
}

TEST_F(AStateFile, ThatOthersCanGetAtIsRefused) {
  for (const mode_t mode : {0640, 0604, 0620, 0602, 0666, 0610}) {
    write("file", "x", mode);
    EXPECT_TRUE(isRefused("file")) << std::oct << mode;
    EXPECT_EQ(modeOf(path_ + "/file"), mode);
  }
  write("file", "x", 0600);
  EXPECT_FALSE(isRefused("file"));
}

TEST_F(AStateFile, OfAnotherUserIsRefused) {
  write("file", "x");
  if (::chown((path_ + "/file").c_str(), 65534, 65534) != 0) GTEST_SKIP() << "only root can give a file away";
  EXPECT_TRUE(isRefused("file"));
}

TEST_F(AStateFile, ThatIsNoPlainFileWithASingleNameIsRefused) {
  const std::string outside = temporary_.write("outside", "x", 0600);
  std::filesystem::create_symlink(outside, path_ + "/symlink");
  std::filesystem::create_symlink("nowhere", path_ + "/dangling");
  std::filesystem::create_hard_link(outside, path_ + "/hardlink");
  std::filesystem::create_directory(path_ + "/directory");
  ASSERT_EQ(::mkfifo((path_ + "/pipe").c_str(), 0600), 0);
  for (const char* name : {"symlink", "dangling", "hardlink", "directory", "pipe"})
    EXPECT_TRUE(isRefused(name)) << name;
}

TEST_F(AStateFile, IsReplacedAsAWholeAndForItsOwnerAlone) {
  for (const mode_t mask : {0000, 0077, 0777}) {
    const Umask set(mask);
    for (const std::string content : {"", "one", "another"}) {
      support::succeed(directory_->replaceFile("file", content));
      EXPECT_EQ(support::valueOf(directory_->readFile("file", 100)), content);
      EXPECT_EQ(modeOf(path_ + "/file"), 0600U);
      EXPECT_FALSE(std::filesystem::exists(path_ + "/file.new"));
    }
  }
}

TEST_F(AStateFile, IsNeverWrittenThroughALink) {
  const std::string outside = temporary_.write("outside", "untouched", 0600);
  std::filesystem::create_symlink(outside, path_ + "/file.new");
  std::filesystem::create_symlink(outside, path_ + "/file");
  support::succeed(directory_->replaceFile("file", "content"));
  EXPECT_EQ(support::contentOf(outside), "untouched");
  EXPECT_EQ(support::valueOf(directory_->readFile("file", 100)), "content");
}

TEST_F(AStateFile, IsSetAsideUnderTheFirstFreeName) {
  for (const std::string number : {"1", "2", "3"}) {
    write("file", number);
    EXPECT_EQ(support::valueOf(directory_->setAside("file")), "file.damaged-" + number);
  }
  EXPECT_EQ(support::contentOf(path_ + "/file.damaged-2"), "2");
  EXPECT_FALSE(std::filesystem::exists(path_ + "/file"));
}

TEST_F(AStateFile, ThatIsNotThereIsRemovedWithSuccess) {
  write("file", "x");
  EXPECT_TRUE(directory_->removeFile("file"));
  EXPECT_TRUE(directory_->removeFile("file"));
  EXPECT_FALSE(std::filesystem::exists(path_ + "/file"));
}

}  // namespace
