#include "daemon/plugins/PluginModule.h"

#include <dlfcn.h>

#include <algorithm>
#include <exception>
#include <filesystem>
#include <string_view>
#include <system_error>
#include <utility>

#include "daemon/log/Log.h"

namespace plugins {
namespace {

using base::Failure;
using base::FailureKind;

std::string linkerMessage() {
  const char* message = ::dlerror();
  return message != nullptr ? message : "no reason given";
}

// Runs nothing of the module but what its loading runs.
base::Result<const RVDAccountAccessPluginEntry*> entryOf(const std::string& path) {
  // Never unloaded: a handler that the plug-in has registered for the life of the process is its code.
  void* module = ::dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
  if (module == nullptr)
    return Failure{FailureKind::kFailed, path + ": cannot be loaded: " + linkerMessage()};
  const auto* entry =
      static_cast<const RVDAccountAccessPluginEntry*>(::dlsym(module, kRVDAccountAccessPluginEntrySymbol));
  const std::string reason = entry == nullptr ? linkerMessage() : "";
  ::dlclose(module);
  if (entry == nullptr) return Failure{FailureKind::kInvalid, path + ": is no plug-in: " + reason};
  if (entry->abiVersion != kRVDAccountAccessPluginABIVersion)
    return Failure{FailureKind::kInvalid,
                   path + ": has ABI version " + std::to_string(entry->abiVersion) + ", the daemon has " +
                       std::to_string(kRVDAccountAccessPluginABIVersion)};
  if (entry->className == nullptr || entry->supportsAccountTypeWithIdentifier == nullptr ||
      entry->init == nullptr)
    return Failure{FailureKind::kInvalid, path + ": its entry point is incomplete"};
  return entry;
}

std::string moduleOf(const std::string& bundle) {
  return bundle + "/" + std::filesystem::path(bundle).filename().string() + ".so";
}

}  // namespace

PluginModule::PluginModule(std::string bundle,
                           const RVDAccountAccessPluginEntry& entry,
                           std::unique_ptr<StringTable> stringTable,
                           std::unique_ptr<RVDAccountAccessPlugin> plugin)
    : bundle_(std::move(bundle)),
      entry_(entry),
      className_(entry.className),
      stringTable_(std::move(stringTable)),
      plugin_(std::move(plugin)) {
}

base::Result<std::unique_ptr<PluginModule>> PluginModule::load(const std::string& bundle,
                                                               const RVDHostServices& services,
                                                               const std::vector<std::string>& languages) {
  const auto entry = entryOf(moduleOf(bundle));
  if (!entry) return entry.failure();
  return make(bundle, **entry, services, languages);
}

base::Result<std::unique_ptr<PluginModule>> PluginModule::another(
    const RVDHostServices& services,
    const std::vector<std::string>& languages) const {
  return make(bundle_, entry_, services, languages);
}

base::Result<std::unique_ptr<PluginModule>> PluginModule::make(const std::string& bundle,
                                                               const RVDAccountAccessPluginEntry& entry,
                                                               const RVDHostServices& services,
                                                               const std::vector<std::string>& languages) {
  const std::string path = moduleOf(bundle);
  auto stringTable = std::make_unique<StringTable>(bundle + "/resources", languages, *services.log);
  RVDHostServices own = services;
  own.stringTable = stringTable.get();
  std::unique_ptr<RVDAccountAccessPlugin> plugin;
  try {
    plugin = entry.init(own);
  } catch (const std::exception& exception) {
    return Failure{FailureKind::kFailed, path + ": could not be set up: " + exception.what()};
  } catch (...) {
    return Failure{FailureKind::kFailed, path + ": could not be set up"};
  }
  if (plugin == nullptr) return Failure{FailureKind::kFailed, path + ": could not be set up"};
  return std::unique_ptr<PluginModule>(
      new PluginModule(bundle, entry, std::move(stringTable), std::move(plugin)));
}

bool PluginModule::supportsAccountType(const std::optional<std::string>& identifier) const {
  return entry_.supportsAccountTypeWithIdentifier(identifier);
}

std::vector<std::unique_ptr<PluginModule>> loadPlugins(const std::string& directory,
                                                       const RVDHostServices& services,
                                                       const std::vector<std::string>& languages) {
  std::vector<std::unique_ptr<PluginModule>> modules;
  if (!directory.starts_with('/')) {
    logging::error(*services.log, "No plug-in is loaded: %@ is no absolute path.", {directory});
    return modules;
  }
  std::vector<std::string> bundles;
  std::error_code error;
  for (std::filesystem::directory_iterator entry(directory, error), end; !error && entry != end;
       entry.increment(error))
    if (std::error_code ignored; entry->is_directory(ignored)) bundles.push_back(entry->path());
  if (error)
    logging::error(*services.log, "The plug-ins in %@ cannot be listed: %@.", {directory, error.message()});
  std::sort(bundles.begin(), bundles.end());
  for (const std::string& bundle : bundles) {
    auto module = PluginModule::load(bundle, services, languages);
    if (!module) {
      logging::error(*services.log, "A plug-in is left out: %@.", {module.failure().message});
      continue;
    }
    logging::debug(*services.log, "Plug-in %@ is loaded from %@.", {(*module)->className(), bundle});
    modules.push_back(std::move(*module));
  }
  return modules;
}

}  // namespace plugins
