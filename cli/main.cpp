// rvctl: the command line of rvd.
#include <sdbus-c++/sdbus-c++.h>
#include <signal.h>
#include <sys/resource.h>

#include <iostream>

#include "cli/CommandLine.h"
#include "cli/SessionBus.h"

int main(int argc, char** argv) {
  // Whoever reads our output may stop; that is seen where it is written.
  ::signal(SIGPIPE, SIG_IGN);
  // Tokens pass through this process.
  const rlimit none{0, 0};
  ::setrlimit(RLIMIT_CORE, &none);
  cli::Output output(std::cout, std::cerr);
  cli::Service service(cli::connectToSessionBus);
  cli::Session session{service, output};
  return static_cast<int>(cli::run(argc, argv, session));
}
