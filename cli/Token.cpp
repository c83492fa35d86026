#include "cli/Token.h"

#include <poll.h>
#include <signal.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/signalfd.h>
#include <termios.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <string>
#include <string_view>

namespace cli {
namespace {

constexpr std::size_t kLongestToken = 64 * 1024;
constexpr std::size_t kLongestTypedLine = 4095;  // what a terminal passes on of one line, with its newline

base::Failure invalid(const char* message) {
  return {base::FailureKind::kInvalid, message};
}

base::Failure failed(const char* message) {
  return {base::FailureKind::kFailed, message};
}

// Wiped when it goes.
struct Chunk {
  std::array<char, 4096> bytes{};
  Chunk() = default;
  Chunk(const Chunk&) = delete;
  Chunk& operator=(const Chunk&) = delete;
  ~Chunk() { ::explicit_bzero(bytes.data(), bytes.size()); }
};

// The token's copy, that the daemon reads.
class TokenFile {
 public:
  TokenFile()
      : file_(::memfd_create("token", MFD_CLOEXEC)) {}

  base::Result<void> add(std::string_view part) {
    size_ += part.size();
    if (size_ > kLongestToken) return invalid("The token is longer than 64 KiB");
    if (!part.empty()) endsWithNewline_ = part.back() == '\n';
    while (!part.empty()) {
      const ssize_t written = ::write(file_.get(), part.data(), part.size());
      if (written < 0) return failed("The token cannot be kept in memory");
      part.remove_prefix(static_cast<std::size_t>(written));
    }
    return {};
  }

  base::Result<base::FileDescriptor> finish() {
    if (size_ == 0 || (size_ == 1 && endsWithNewline_)) return invalid("No token was given");
    if (::lseek(file_.get(), 0, SEEK_SET) != 0) return failed("The token cannot be kept in memory");
    return std::move(file_);
  }

 private:
  base::FileDescriptor file_;
  std::size_t size_ = 0;
  bool endsWithNewline_ = false;
};

// While this exists the terminal shows nothing that is typed, and the signals by which a person ends or stops
// a program wait: they take effect when the terminal is as it was before.
class HiddenTyping {
 public:
  explicit HiddenTyping(int terminal)
      : terminal_(terminal) {
    sigset_t signals;
    sigemptyset(&signals);
    for (const int signal : {SIGINT, SIGTERM, SIGHUP, SIGQUIT, SIGTSTP}) sigaddset(&signals, signal);
    ::pthread_sigmask(SIG_BLOCK, &signals, &formerMask_);
    signals_ = base::FileDescriptor(::signalfd(-1, &signals, SFD_CLOEXEC));
    isHidden_ = ::tcgetattr(terminal, &former_) == 0;
    termios hidden = former_;
    hidden.c_lflag &= ~static_cast<tcflag_t>(ECHO | ECHONL);
    isHidden_ = isHidden_ && ::tcsetattr(terminal, TCSAFLUSH, &hidden) == 0;
  }
  ~HiddenTyping() {
    if (isHidden_) ::tcsetattr(terminal_, TCSAFLUSH, &former_);
    ::pthread_sigmask(SIG_SETMASK, &formerMask_, nullptr);
  }
  HiddenTyping(const HiddenTyping&) = delete;
  HiddenTyping& operator=(const HiddenTyping&) = delete;

  bool isHidden() const { return isHidden_ && signals_.isOpen(); }

  // False where one of the signals came first.
  bool waitForLine() const {
    std::array<pollfd, 2> polled{{{terminal_, POLLIN, 0}, {signals_.get(), POLLIN, 0}}};
    while (::poll(polled.data(), polled.size(), -1) < 0)
      if (errno != EINTR) return false;
    return polled[1].revents == 0;
  }

 private:
  const int terminal_;
  sigset_t formerMask_{};
  termios former_{};
  base::FileDescriptor signals_;
  bool isHidden_ = false;
};

void ask(std::string_view text) {
  [[maybe_unused]] const auto written = ::write(STDERR_FILENO, text.data(), text.size());
}

base::Result<base::FileDescriptor> typedToken(int terminal) {
  Chunk line;
  ssize_t size = 0;
  {
    const HiddenTyping hidden(terminal);
    if (!hidden.isHidden()) return failed("The terminal cannot be kept from showing the token");
    ask("Token (it is not shown): ");
    if (!hidden.waitForLine()) size = -1;
    if (size == 0) size = ::read(terminal, line.bytes.data(), line.bytes.size());
    ask("\n");
  }
  if (size < 0) return failed("No token was typed");
  if (static_cast<std::size_t>(size) >= kLongestTypedLine)
    return invalid("A terminal passes on no line of this length. Give the token through a pipe or a file");
  TokenFile token;
  const auto added = token.add({line.bytes.data(), static_cast<std::size_t>(size)});
  if (!added) return added.failure();
  return token.finish();
}

}  // namespace

base::Result<base::FileDescriptor> tokenFrom(int descriptor) {
  if (::isatty(descriptor) == 1) return typedToken(descriptor);
  TokenFile token;
  Chunk chunk;
  for (;;) {
    const ssize_t size = ::read(descriptor, chunk.bytes.data(), chunk.bytes.size());
    if (size < 0 && errno == EINTR) continue;
    if (size < 0) return invalid("The token's file descriptor cannot be read");
    if (size == 0) return token.finish();
    const auto added = token.add({chunk.bytes.data(), static_cast<std::size_t>(size)});
    if (!added) return added.failure();
  }
}

}  // namespace cli
