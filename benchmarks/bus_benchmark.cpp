// A held grant through the bus, beside an echo of the same shape through the same bus in the same run.
//
// bus_benchmark APP_ID FACEBOOK_APP_ID [CALLS]: expects rvd with an account, the echo service and an
// installed application APP_ID on the session bus. Plays the agent for the first request, allows it,
// and then measures the two calls in turn.
#include <sdbus-c++/sdbus-c++.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <string>
#include <vector>

namespace {

using Dictionary = std::map<std::string, sdbus::Variant>;
using Clock = std::chrono::steady_clock;

constexpr auto kDaemon = "com.zentor.rvd";
constexpr auto kDaemonPath = "/com/zentor/rvd";
constexpr auto kAgentPath = "/benchmark/agent";

double microseconds(std::vector<double>& sorted, double fraction) {
  return sorted[static_cast<std::size_t>(fraction * static_cast<double>(sorted.size() - 1))];
}

template <typename Call>
double timed(const Call& call) {
  const auto begin = Clock::now();
  call();
  return std::chrono::duration<double, std::micro>(Clock::now() - begin).count();
}

void report(const char* name, std::vector<double>& samples) {
  std::sort(samples.begin(), samples.end());
  std::printf("%-22s median %8.1f us   90th %8.1f us   99th %8.1f us\n",
              name,
              microseconds(samples, 0.5),
              microseconds(samples, 0.9),
              microseconds(samples, 0.99));
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 3) {
    std::fprintf(stderr, "usage: bus_benchmark APP_ID FACEBOOK_APP_ID [CALLS]\n");
    return 2;
  }
  const int calls = argc > 3 ? std::atoi(argv[3]) : 5000;

  auto agentConnection = sdbus::createSessionBusConnection();
  auto agent = sdbus::createObject(*agentConnection, kAgentPath);
  agent->registerMethod("ShowAlert")
      .onInterface("com.zentor.rvd.Agent1")
      .implementedAs([](const std::string&, const Dictionary&) { return std::uint64_t{0}; });
  agent->finishRegistration();
  agentConnection->enterEventLoopAsync();
  auto manager = sdbus::createProxy(*agentConnection, kDaemon, kDaemonPath);
  manager->callMethod("RegisterAgent")
      .onInterface("com.zentor.rvd.AgentManager1")
      .withArguments(sdbus::ObjectPath(kAgentPath), std::string("terminal"));

  auto daemon = sdbus::createProxy(sdbus::createSessionBusConnection(), kDaemon, kDaemonPath);
  daemon->callMethod("Register").onInterface("com.zentor.rvd.Accounts1").withArguments(std::string(argv[1]));
  const Dictionary options{{"app_id", std::string(argv[2])},
                           {"permissions", std::vector<std::string>{"email", "user_photos"}}};
  const auto heldGrant = [&] {
    bool granted = false;
    Dictionary error;
    daemon->callMethod("RequestAccess")
        .onInterface("com.zentor.rvd.Accounts1")
        .withArguments(std::string("com.zentor.facebook"), options, true)
        .storeResultsTo(granted, error);
    if (!granted) {
      std::fprintf(stderr, "bus_benchmark: the request was not granted\n");
      std::exit(1);
    }
  };
  auto echo =
      sdbus::createProxy(sdbus::createSessionBusConnection(), "com.zentor.rvd.Echo", "/com/zentor/rvd/echo");
  const auto echoed = [&] {
    bool granted = false;
    Dictionary error;
    echo->callMethod("Echo")
        .onInterface("com.zentor.rvd.Echo")
        .withArguments(std::string("com.zentor.facebook"), options, true)
        .storeResultsTo(granted, error);
  };

  for (int i = 0; i < 100; ++i) {
    heldGrant();
    echoed();
  }
  std::vector<double> held;
  std::vector<double> echoes;
  for (int i = 0; i < calls; ++i) {
    held.push_back(timed(heldGrant));
    echoes.push_back(timed(echoed));
  }
  report("held grant", held);
  report("echo", echoes);
  std::printf("%-22s %.2f\n", "ratio of the medians", microseconds(held, 0.5) / microseconds(echoes, 0.5));
  return 0;
}
