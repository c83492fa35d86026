// The daemon as a whole: what it is made of, its start and its stop.
#pragma once

#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/Result.h"
#include "daemon/config/Entitlements.h"
#include "daemon/config/Settings.h"
#include "host/RVDAccountAccessPlugin.h"
#include "host/RVLog.h"

namespace bus {
struct RehearsalParts;
}

namespace rvd {

// Where things are.
struct Places {
  std::filesystem::path stateDirectory;
  std::string pluginDirectory;        // absolute
  std::string entitlementsDirectory;  // absolute
  config::PolicyTrust entitlementsTrust;
  std::optional<std::filesystem::path> sealingKey;  // handed in by the service manager
  std::vector<std::string> applicationDirectories;  // see clients::dataDirectories
  std::vector<std::string> languages;               // the user's, see base::languageChain
};

class Daemon {
 public:
  // Opens what lasts, brings to its end what an earlier run left unfinished, loads the plug-ins, and takes
  // the daemon's name on the session bus. The log outlives the daemon, and the process's plug-ins.
  // stopDescriptor: ends run() when it becomes readable.
  static base::Result<std::unique_ptr<Daemon>> start(const Places& places,
                                                     const config::Settings& settings,
                                                     RVLogService& log,
                                                     int stopDescriptor);
  Daemon(const Daemon&) = delete;
  Daemon& operator=(const Daemon&) = delete;
  ~Daemon();

  // Serves until it is stopped, then makes what is on its way void, answers it, and ends all threads. False
  // where it was the bus that went away.
  bool run();

 private:
  struct Storage;
  struct Work;
  struct Bus;

  Daemon(const config::Settings& settings, RVLogService& log);
  base::Result<void> openStorage(const Places& places);
  base::Result<void> openCredentials(const Places& places);
  void serve(const Places& places);
  bus::RehearsalParts rehearsalParts(const Places& places, const RVDHostServices& services);
  void connectionLeft(const std::string& uniqueName);
  void stop();

  const config::Settings settings_;
  RVLogService& log_;
  // In the order in which they are made; each uses those before it.
  std::unique_ptr<Storage> storage_;
  std::unique_ptr<Bus> bus_;
  std::unique_ptr<Work> work_;
};

}  // namespace rvd
