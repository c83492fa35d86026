// The desktop's keyring, on a message bus of a test's own.
#pragma once

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

#include "tests/support/PrivateBus.h"
#include "tests/support/TemporaryDirectory.h"

namespace support {

// Runs gnome-keyring with a home of its own, unlocked. While the object lives, its bus is this process's
// session bus. What the keyring holds survives stop() and kill().
class DesktopKeyring {
 public:
  DesktopKeyring() {
    if (const char* address = std::getenv(kAddress)) earlierAddress_ = address;
    ::setenv(kAddress, bus_.address().c_str(), 1);
    start();
  }
  DesktopKeyring(const DesktopKeyring&) = delete;
  DesktopKeyring& operator=(const DesktopKeyring&) = delete;
  ~DesktopKeyring() {
    kill();
    if (earlierAddress_)
      ::setenv(kAddress, earlierAddress_->c_str(), 1);
    else
      ::unsetenv(kAddress);
  }

  // Starts it, unlocked; returns once it is on the bus.
  void start() {
    int ends[2];
    if (::pipe2(ends, O_CLOEXEC) != 0) throw std::runtime_error("no pipe for the keyring's password");
    process_ = spawn({"setpriv",
                      "--pdeathsig",
                      "KILL",
                      "gnome-keyring-daemon",
                      "--foreground",
                      "--unlock",
                      "--components=secrets"},
                     ends[0]);
    const bool isWritten = ::write(ends[1], "password", 8) == 8;
    ::close(ends[0]);
    ::close(ends[1]);
    if (!isWritten || run({"gdbus", "wait", "--session", "--timeout=30", "org.freedesktop.secrets"}) != 0) {
      kill();
      throw std::runtime_error("the keyring did not start");
    }
  }

  // It stays locked until it is ended and started again.
  void lock() {
    if (run({"gdbus",
             "call",
             "--session",
             "--dest=org.freedesktop.secrets",
             "--object-path=/org/freedesktop/secrets",
             "--method=org.freedesktop.Secret.Service.Lock",
             "['/org/freedesktop/secrets/collection/login']"}) != 0)
      throw std::runtime_error("the keyring was not locked");
  }

  void signal(int number) const { ::kill(process_, number); }

  // Ends it, also where it was stopped by a signal.
  void kill() {
    if (process_ == 0) return;
    signal(SIGKILL);
    ::waitpid(process_, nullptr, 0);
    process_ = 0;
  }

  void restart() {
    kill();
    start();
  }

  // Everything that the keyring has written.
  std::string home() const { return home_.path(); }

 private:
  static constexpr const char* kAddress = "DBUS_SESSION_BUS_ADDRESS";

  // standardInput: -1 for none.
  pid_t spawn(std::vector<std::string> arguments, int standardInput) const {
    std::vector<std::string> environment{std::string("PATH=") + std::getenv("PATH"),
                                         "HOME=" + home_.path(),
                                         "XDG_RUNTIME_DIR=" + home_.path(),
                                         std::string(kAddress) + "=" + bus_.address()};
    const auto pointers = [](std::vector<std::string>& texts) {
      std::vector<char*> all;
      for (std::string& text : texts) all.push_back(text.data());
      all.push_back(nullptr);
      return all;
    };
    posix_spawn_file_actions_t actions;
    ::posix_spawn_file_actions_init(&actions);
    if (standardInput >= 0)
      ::posix_spawn_file_actions_adddup2(&actions, standardInput, STDIN_FILENO);
    else
      ::posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    ::posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
    pid_t process = 0;
    const int error = ::posix_spawnp(&process,
                                     arguments[0].c_str(),
                                     &actions,
                                     nullptr,
                                     pointers(arguments).data(),
                                     pointers(environment).data());
    ::posix_spawn_file_actions_destroy(&actions);
    if (error != 0) throw std::runtime_error(arguments[0] + " did not start");
    return process;
  }

  int run(std::vector<std::string> arguments) const {
    int status = 0;
    ::waitpid(spawn(std::move(arguments), -1), &status, 0);
    return status;
  }

  const TemporaryDirectory home_;
  const PrivateBus bus_;
  std::optional<std::string> earlierAddress_;
  pid_t process_ = 0;
};

}  // namespace support
