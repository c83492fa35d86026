#include <gtest/gtest.h>
#include <sys/stat.h>

#include "base/File.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using base::FailureKind;
using base::readFile;

class AFile : public testing::Test {
 protected:
  support::TemporaryDirectory directory_;
};

TEST_F(AFile, IsReadToItsEnd) {
  const std::string content(100000, 'x');
  const auto read = readFile(directory_.write("file", content), content.size());
  ASSERT_TRUE(read);
  EXPECT_EQ(*read, content);
}

TEST_F(AFile, ThatIsTooLargeIsNotRead) {
  const auto read = readFile(directory_.write("file", "12345"), 4);
  ASSERT_FALSE(read);
  EXPECT_EQ(read.failure().kind, FailureKind::kInvalid);
  EXPECT_EQ(read.failure().message, directory_.path("file") + ": is larger than 4 bytes");
}

TEST_F(AFile, ThatIsNotThereIsNotFound) {
  EXPECT_EQ(readFile(directory_.path("none"), 10).failure().kind, FailureKind::kNotFound);
}

TEST_F(AFile, ThatIsAPipeADeviceOrADirectoryIsNotWaitedFor) {
  ASSERT_EQ(::mkfifo(directory_.path("pipe").c_str(), 0600), 0);
  for (const std::string& path : {directory_.path("pipe"), std::string("/dev/zero"), directory_.path()})
    EXPECT_EQ(readFile(path, 10).failure().kind, FailureKind::kInvalid) << path;
}

}  // namespace
