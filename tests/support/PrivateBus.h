// A message bus of a test's own.
#pragma once

#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <stdexcept>
#include <string>

#include "tests/support/TemporaryDirectory.h"

// Runs a session bus that nobody else knows of, and that starts no services; it ends with the object.
class PrivateBus {
 public:
  PrivateBus() {
    int ends[2];
    if (::pipe(ends) != 0) throw std::runtime_error("no pipe for the bus's address");
    // It dies with the test, whatever becomes of that.
    std::string wrapper = "setpriv";
    std::string onParentsDeath = "--pdeathsig";
    std::string kill = "KILL";
    std::string program = "dbus-daemon";
    std::string configuration = "--config-file=" + directory_.write("bus.conf", kConfiguration);
    std::string stay = "--nofork";
    std::string print = "--print-address=" + std::to_string(ends[1]);
    char* const arguments[] = {wrapper.data(),
                               onParentsDeath.data(),
                               kill.data(),
                               program.data(),
                               configuration.data(),
                               stay.data(),
                               print.data(),
                               nullptr};
    const int error = ::posix_spawnp(&process_, "setpriv", nullptr, nullptr, arguments, environ);
    ::close(ends[1]);
    for (char byte = 0; error == 0 && ::read(ends[0], &byte, 1) == 1 && byte != '\n';) address_ += byte;
    ::close(ends[0]);
    if (address_.empty()) throw std::runtime_error("the bus did not start");
  }
  PrivateBus(const PrivateBus&) = delete;
  PrivateBus& operator=(const PrivateBus&) = delete;
  ~PrivateBus() {
    ::kill(process_, SIGTERM);
    ::waitpid(process_, nullptr, 0);
  }

  const std::string& address() const { return address_; }

 private:
  static constexpr const char* kConfiguration =
      "<busconfig><type>session</type><listen>unix:tmpdir=/tmp</listen><auth>EXTERNAL</auth>"
      "<policy context=\"default\"><allow send_destination=\"*\" eavesdrop=\"true\"/>"
      "<allow eavesdrop=\"true\"/><allow own=\"*\"/></policy></busconfig>";

  const support::TemporaryDirectory directory_;
  pid_t process_ = 0;
  std::string address_;
};
