#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <systemd/sd-daemon.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <string>

#include "base/File.h"
#include "base/Languages.h"
#include "daemon/Daemon.h"
#include "daemon/clients/InstalledApplications.h"
#include "daemon/http/ServerURL.h"
#include "daemon/log/Log.h"

namespace {

struct Options {
  std::string config;
  std::string stateDirectory;
  std::string pluginDirectory = RVD_PLUGIN_DIRECTORY;
  std::string entitlementsDirectory;
};

std::string environment(const char* name) {
  const char* value = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): there is one thread yet
  return value != nullptr ? value : "";
}

// The user's directory of a kind: the variable's where it names an absolute one, else that below HOME.
std::filesystem::path userDirectory(const char* variable, const char* belowHome) {
  const std::filesystem::path named(environment(variable));
  return named.is_absolute() ? named : std::filesystem::path(environment("HOME")) / belowHome;
}

// What is in memory is the user's secrets: no core file is written of it, and no other process of the
// user reads it. What is written to files is the user's alone.
void protectProcess() {
  ::prctl(PR_SET_DUMPABLE, 0);
  const rlimit none{0, 0};
  ::setrlimit(RLIMIT_CORE, &none);
  ::umask(077);
  ::unsetenv("SSLKEYLOGFILE");  // a file for the keys of connections
}

// SIGTERM and SIGINT, to be read instead of being delivered; called before there is a second thread.
base::FileDescriptor catchStopSignals() {
  std::signal(SIGPIPE, SIG_IGN);
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGTERM);
  sigaddset(&signals, SIGINT);
  ::pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  return base::FileDescriptor(::signalfd(-1, &signals, SFD_CLOEXEC | SFD_NONBLOCK));
}

rvd::Places placesFor(const Options& options) {
  rvd::Places places;
  places.stateDirectory = options.stateDirectory.empty()
                              ? userDirectory("XDG_STATE_HOME", ".local/state") / "rvd"
                              : std::filesystem::absolute(options.stateDirectory);
  places.pluginDirectory = std::filesystem::absolute(options.pluginDirectory).string();
  places.entitlementsDirectory = "/etc/rvd/entitlements.d";
  if (!options.entitlementsDirectory.empty()) {
    // Whoever starts the daemon with a directory of their own answers for what is above it.
    places.entitlementsDirectory = std::filesystem::absolute(options.entitlementsDirectory).string();
    places.entitlementsTrust = {::geteuid(), places.entitlementsDirectory};
  }
  if (const std::string credentials = environment("CREDENTIALS_DIRECTORY"); !credentials.empty()) {
    const auto key = std::filesystem::path(credentials) / "credentials.key";
    if (std::error_code error; std::filesystem::exists(key, error)) places.sealingKey = key;
  }
  places.applicationDirectories = clients::dataDirectories(
      environment("XDG_DATA_HOME"), environment("HOME"), environment("XDG_DATA_DIRS"));
  places.languages = base::languageChain(
      {environment("LANGUAGE"), environment("LC_ALL"), environment("LC_MESSAGES"), environment("LANG")});
  return places;
}

base::Result<config::Settings> settingsFor(const Options& options) {
  if (!options.config.empty())
    return config::readSettings({options.config}, true, http::problemWithServerURL);
  const auto own = userDirectory("XDG_CONFIG_HOME", ".config") / "rvd/rvd.conf";
  return config::readSettings({"/etc/rvd/rvd.conf", own.string()}, false, http::problemWithServerURL);
}

int fail(const base::Failure& failure) {
  std::cerr << "rvd: " << failure.message << '\n';
  return EXIT_FAILURE;
}

int runDaemon(const Options& options) {
  protectProcess();
  const auto stop = catchStopSignals();
  const auto settings = settingsFor(options);
  if (!settings) return fail(settings.failure());

  // Until the process ends: what a plug-in keeps for itself still logs when it is taken apart.
  static const auto sink = logging::makeDefaultSink();
  static logging::Log log(*sink);

  const auto daemon = rvd::Daemon::start(placesFor(options), *settings, log, stop.get());
  if (!daemon) return fail(daemon.failure());
  ::sd_notify(0, "READY=1");
  const bool wasStopped = (*daemon)->run();
  ::sd_notify(0, "STOPPING=1");
  return wasStopped ? EXIT_SUCCESS : EXIT_FAILURE;
}

}  // namespace

int main(int argc, char** argv) {
  Options options;
  CLI::App app("The accounts daemon: decides which applications may use the user's accounts.", "rvd");
  app.set_version_flag("--version", "rvd " RVD_VERSION);
  app.add_option("--config", options.config, "read this settings file instead of the usual ones");
  app.add_option("--state-dir", options.stateDirectory, "where accounts and decisions are kept");
  app.add_option("--plugin-dir", options.pluginDirectory, "where plug-ins are loaded from");
  app.add_option("--entitlements-dir", options.entitlementsDirectory, "where entitlements are read from");
  CLI11_PARSE(app, argc, argv);
  try {
    return runDaemon(options);
  } catch (const std::exception& exception) {
    std::cerr << "rvd: " << exception.what() << '\n';
    return EXIT_FAILURE;
  }
}
