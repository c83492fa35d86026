// rvctl agent
#include <sdbus-c++/sdbus-c++.h>
#include <signal.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <iostream>

#include "agents/terminal/TerminalAgent.h"
#include "agents/terminal/TextScreen.h"
#include "base/File.h"
#include "cli/Commands.h"
#include "cli/JSONScreen.h"
#include "cli/SessionBus.h"

namespace cli {
namespace {

// Becomes readable when the agent is to leave, instead of ending the process.
base::FileDescriptor leavingSignals() {
  sigset_t signals;
  sigemptyset(&signals);
  for (const int signal : {SIGINT, SIGTERM, SIGHUP}) sigaddset(&signals, signal);
  ::pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  return base::FileDescriptor(::signalfd(-1, &signals, SFD_CLOEXEC));
}

}  // namespace

ExitStatus runAgent(Output& output) {
  const base::FileDescriptor leave = leavingSignals();
  const auto connection = connectToSessionBus();
  if (!connection) return output.failed(connection.failure());
  JSONScreen events(output);
  terminal::TextScreen text(std::cout, STDOUT_FILENO);
  terminal::Screen& screen = output.wantsJSON() ? static_cast<terminal::Screen&>(events) : text;
  const auto served = terminal::serveAlerts(**connection, screen, STDIN_FILENO, leave.get());
  return served ? ExitStatus::kDone : output.failed(served.failure());
}

}  // namespace cli
