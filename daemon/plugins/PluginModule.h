// The plug-ins that the daemon has loaded.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/Result.h"
#include "daemon/plugins/StringTable.h"
#include "host/RVDAccountAccessPlugin.h"

namespace plugins {

// One plug-in and the string tables of its bundle. Its code stays in the process until that ends, as
// handlers that the plug-in registered may still run. Used from any thread.
class PluginModule {
 public:
  // Loads "<bundle>/<the bundle's last name>.so" and makes its plug-in object. services: as they are for
  // every plug-in; the string table is replaced by the bundle's own. languages: see base::languageChain.
  // Nothing of a module whose ABI version is not the daemon's is called. The failure's message names the
  // file.
  static base::Result<std::unique_ptr<PluginModule>> load(const std::string& bundle,
                                                          const RVDHostServices& services,
                                                          const std::vector<std::string>& languages);

  // One more plug-in object of the module, with services, words and a string table of its own; as load
  // otherwise. This object need not outlive it.
  base::Result<std::unique_ptr<PluginModule>> another(const RVDHostServices& services,
                                                      const std::vector<std::string>& languages) const;

  const std::string& className() const { return className_; }
  bool supportsAccountType(const std::optional<std::string>& identifier) const;
  // Lives as long as the module.
  RVDAccountAccessPlugin& plugin() const { return *plugin_; }
  const StringTable& stringTable() const { return *stringTable_; }

 private:
  PluginModule(std::string bundle,
               const RVDAccountAccessPluginEntry& entry,
               std::unique_ptr<StringTable> stringTable,
               std::unique_ptr<RVDAccountAccessPlugin> plugin);
  static base::Result<std::unique_ptr<PluginModule>> make(const std::string& bundle,
                                                          const RVDAccountAccessPluginEntry& entry,
                                                          const RVDHostServices& services,
                                                          const std::vector<std::string>& languages);

  const std::string bundle_;
  const RVDAccountAccessPluginEntry& entry_;  // lives until the process ends
  const std::string className_;
  const std::unique_ptr<StringTable> stringTable_;  // outlives the plug-in object
  const std::unique_ptr<RVDAccountAccessPlugin> plugin_;
};

// Loads every bundle of the directory, in byte order of their names. directory: an absolute path, so that
// no search path decides what is loaded. What cannot be loaded is left out, with a line in the log that
// says why.
std::vector<std::unique_ptr<PluginModule>> loadPlugins(const std::string& directory,
                                                       const RVDHostServices& services,
                                                       const std::vector<std::string>& languages);

}  // namespace plugins
