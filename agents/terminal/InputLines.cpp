#include "agents/terminal/InputLines.h"

#include <poll.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>

namespace terminal {
namespace {

constexpr std::size_t kLongestLine = 4096;

bool isReadable(int descriptor) {
  pollfd polled{descriptor, POLLIN, 0};
  return ::poll(&polled, 1, 0) == 1;
}

}  // namespace

bool InputLines::read(const std::function<void(const std::string& line)>& take) {
  // Asked again, because what the caller's poll saw may have been discarded since.
  if (!isReadable(descriptor_)) return true;
  std::array<char, 4096> chunk;
  const ssize_t size = ::read(descriptor_, chunk.data(), chunk.size());
  if (size < 0) return errno == EINTR || errno == EAGAIN;
  if (size == 0) return false;
  add({chunk.data(), static_cast<std::size_t>(size)}, take);
  return true;
}

void InputLines::discard() {
  begun_.clear();
  if (::tcflush(descriptor_, TCIFLUSH) == 0) return;
  int waiting = 0;
  if (::ioctl(descriptor_, FIONREAD, &waiting) != 0) return;
  std::array<char, 4096> chunk;
  while (waiting > 0 && isReadable(descriptor_)) {
    const std::size_t wanted = std::min(static_cast<std::size_t>(waiting), chunk.size());
    const ssize_t size = ::read(descriptor_, chunk.data(), wanted);
    if (size <= 0) return;
    waiting -= static_cast<int>(size);
  }
}

void InputLines::add(std::string_view typed, const std::function<void(const std::string& line)>& take) {
  for (const char c : typed) {
    if (c == '\n') {
      std::string line;
      line.swap(begun_);
      take(line);
    } else if (begun_.size() < kLongestLine) {
      begun_ += c;
    }
  }
}

}  // namespace terminal
