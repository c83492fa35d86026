#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <string>

#include "base/File.h"
#include "daemon/bus/Token.h"

namespace bus {
namespace {

base::FileDescriptor fileWith(const std::string& content) {
  base::FileDescriptor file(::memfd_create("token", MFD_CLOEXEC));
  EXPECT_EQ(::write(file.get(), content.data(), content.size()), static_cast<ssize_t>(content.size()));
  ::lseek(file.get(), 0, SEEK_SET);
  return file;
}

base::Result<RVSecret> read(const std::string& content) {
  return readToken(fileWith(content).get(), [] { return true; });
}

TEST(AToken, IsReadToItsEndWithoutOneTrailingNewline) {
  EXPECT_EQ((*read("abc")).reveal(), "abc");
  EXPECT_EQ((*read("abc\n")).reveal(), "abc");
  const std::string longest(kLongestToken, 'x');
  EXPECT_EQ((*read(longest)).reveal(), longest);
}

TEST(AToken, ThatIsEmptyOverlongOrNoTextIsInvalid) {
  const std::string zero("a\0b", 3);
  for (const std::string& content :
       {std::string(), std::string("\n"), std::string(kLongestToken + 1, 'x'), std::string("a\n\n"), zero}) {
    const auto token = read(content);
    ASSERT_FALSE(token) << content.size();
    EXPECT_EQ(token.failure().kind, base::FailureKind::kInvalid);
  }
}

TEST(AToken, ThatNeverEndsIsInvalidAsSoonAsItIsTooLong) {
  const base::FileDescriptor zeros(::open("/dev/zero", O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(readToken(zeros.get(), [] { return true; }).failure().kind, base::FailureKind::kInvalid);
}

TEST(AToken, ThatCannotBeReadIsInvalid) {
  const base::FileDescriptor directory(::open("/", O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(readToken(directory.get(), [] { return true; }).failure().kind, base::FailureKind::kInvalid);
}

TEST(AToken, IsGivenUpWhenNobodyWantsItAnyMore) {
  int ends[2];
  ASSERT_EQ(::pipe2(ends, O_CLOEXEC), 0);
  const base::FileDescriptor reading(ends[0]);
  const base::FileDescriptor writing(ends[1]);
  int asked = 0;
  EXPECT_EQ(readToken(reading.get(), [&] { return ++asked < 3; }).failure().kind, base::FailureKind::kFailed);
  EXPECT_EQ(asked, 3);
}

}  // namespace
}  // namespace bus
