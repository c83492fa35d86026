#include "daemon/bus/Token.h"

#include <poll.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <string_view>
#include <vector>

namespace bus {
namespace {

constexpr int kLookUpEvery = 100;  // milliseconds

// Wiped when it goes.
struct Buffer {
  std::vector<char> bytes = std::vector<char>(kLongestToken + 1);
  Buffer() = default;
  Buffer(const Buffer&) = delete;
  Buffer& operator=(const Buffer&) = delete;
  ~Buffer() { RVSecret::wipe(bytes.data(), bytes.size()); }
};

base::Failure invalid(const char* message) {
  return {base::FailureKind::kInvalid, message};
}

}  // namespace

base::Result<RVSecret> readToken(int descriptor, const std::function<bool()>& mayGoOn) {
  Buffer buffer;
  std::size_t size = 0;
  for (;;) {
    if (!mayGoOn()) return base::Failure{base::FailureKind::kFailed, "The token is not wanted any more"};
    pollfd polled{descriptor, POLLIN, 0};
    if (::poll(&polled, 1, kLookUpEvery) <= 0) continue;
    // Without waiting: somebody else who holds the descriptor may have read what poll has seen.
    const iovec room{buffer.bytes.data() + size, buffer.bytes.size() - size};
    ssize_t count = ::preadv2(descriptor, &room, 1, -1, RWF_NOWAIT);
    if (count < 0 && errno == EOPNOTSUPP) count = ::readv(descriptor, &room, 1);
    if (count < 0 && (errno == EINTR || errno == EAGAIN)) continue;
    if (count < 0) return invalid("The token cannot be read");
    if (count == 0) break;
    size += static_cast<std::size_t>(count);
    if (size > kLongestToken) return invalid("The token is too long");
  }
  std::string_view token(buffer.bytes.data(), size);
  if (token.ends_with('\n')) token.remove_suffix(1);
  if (token.empty()) return invalid("The token is empty");
  // It is to travel in a header of HTTP, which can carry none of these.
  const auto isControl = [](unsigned char byte) { return byte < 0x20 || byte == 0x7F; };
  if (std::any_of(token.begin(), token.end(), isControl))
    return invalid("The token holds control characters");
  return RVSecret(token);
}

}  // namespace bus
