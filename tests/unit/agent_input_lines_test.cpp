#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pty.h>
#include <sys/mman.h>
#include <unistd.h>

#include <array>
#include <vector>

#include "agents/terminal/InputLines.h"
#include "base/File.h"

namespace {

using Lines = std::vector<std::string>;

void write(const base::FileDescriptor& file, const std::string& text) {
  ASSERT_EQ(::write(file.get(), text.data(), text.size()), static_cast<ssize_t>(text.size()));
}

class LinesOfAPipe : public testing::Test {
 protected:
  LinesOfAPipe() {
    std::array<int, 2> ends{};
    EXPECT_EQ(::pipe2(ends.data(), O_CLOEXEC), 0);
    reading = base::FileDescriptor(ends[0]);
    writing = base::FileDescriptor(ends[1]);
    input.emplace(reading.get());
  }

  // What one reading gives.
  Lines read() {
    Lines lines;
    hasEnded = !input->read([&](const std::string& line) { lines.push_back(line); });
    return lines;
  }

  base::FileDescriptor reading;
  base::FileDescriptor writing;
  std::optional<terminal::InputLines> input;
  bool hasEnded = false;
};

TEST_F(LinesOfAPipe, AreGivenWhenTheyAreComplete) {
  write(writing, "one\ntwo\n\nthr");
  EXPECT_EQ(read(), (Lines{"one", "two", ""}));
  write(writing, "ee\n");
  EXPECT_EQ(read(), (Lines{"three"}));
}

TEST_F(LinesOfAPipe, AreNotWaitedFor) {
  EXPECT_EQ(read(), Lines{});
  EXPECT_FALSE(hasEnded);
}

TEST_F(LinesOfAPipe, AreCutWhereTheyAreTooLong) {
  for (int i = 0; i < 4; ++i) {
    write(writing, std::string(2000, 'x'));
    EXPECT_EQ(read(), Lines{});
  }
  write(writing, "\nnext\n");
  EXPECT_EQ(read(), (Lines{std::string(4096, 'x'), "next"}));
}

TEST_F(LinesOfAPipe, EndWithoutTheOneThatWasOnlyBegun) {
  write(writing, "one\nallow");
  writing = base::FileDescriptor();
  EXPECT_EQ(read(), (Lines{"one"}));
  EXPECT_FALSE(hasEnded);
  EXPECT_EQ(read(), Lines{});
  EXPECT_TRUE(hasEnded);
}

TEST_F(LinesOfAPipe, ThatWereThereAreDiscardedWhole) {
  write(writing, "allow\nallow\nal");
  EXPECT_EQ(read().size(), 2u);
  write(writing, std::string(10000, 'x') + "\nallow\nallo");
  input->discard();
  EXPECT_EQ(read(), Lines{});
  write(writing, "w\nrefuse\n");
  EXPECT_EQ(read(), (Lines{"w", "refuse"}));
}

TEST(LinesOfAFile, AreDiscardedToItsEnd) {
  const base::FileDescriptor file(::memfd_create("lines", MFD_CLOEXEC));
  write(file, "allow\nallow\n");
  ASSERT_EQ(::lseek(file.get(), 0, SEEK_SET), 0);
  terminal::InputLines input(file.get());
  input.discard();
  EXPECT_FALSE(input.read([](const std::string&) { FAIL(); }));
}

TEST(LinesOfNothing, HaveEnded) {
  terminal::InputLines input(-1);
  input.discard();
  const base::FileDescriptor null(::open("/dev/null", O_RDONLY | O_CLOEXEC));
  EXPECT_FALSE(terminal::InputLines(null.get()).read([](const std::string&) { FAIL(); }));
}

TEST(LinesOfATerminal, ThatWereThereAreDiscardedWhole) {
  int keyboardEnd = -1;
  int programEnd = -1;
  ASSERT_EQ(::openpty(&keyboardEnd, &programEnd, nullptr, nullptr, nullptr), 0);
  const base::FileDescriptor keyboard(keyboardEnd);
  const base::FileDescriptor program(programEnd);
  terminal::InputLines input(program.get());
  write(keyboard, "allow\nallow\nallo");
  // The terminal has the last of it when it has shown it.
  std::string echo;
  while (!echo.ends_with("allo")) {
    std::array<char, 256> chunk;
    const ssize_t size = ::read(keyboard.get(), chunk.data(), chunk.size());
    ASSERT_GT(size, 0);
    echo.append(chunk.data(), static_cast<std::size_t>(size));
  }
  input.discard();
  write(keyboard, "w\n");
  pollfd polled{program.get(), POLLIN, 0};
  ASSERT_EQ(::poll(&polled, 1, 60'000), 1);
  Lines lines;
  EXPECT_TRUE(input.read([&](const std::string& line) { lines.push_back(line); }));
  EXPECT_EQ(lines, (Lines{"w"}));
}

}  // namespace
