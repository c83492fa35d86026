#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"

#include <utility>

namespace {

constexpr std::string_view kSourceFile = "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin";
constexpr std::string_view kPreferencesQueueLabel = "com.zentor.tessel.facebook.preferencesQueue";
constexpr std::string_view kStringTable = "Localizable";

}  // namespace

bool TKFacebookAccountAccessPlugin::supportsAccountTypeWithIdentifier(
    const std::optional<std::string>& identifier) {
  return identifier == RVAccountTypeIdentifierFacebook;
}

std::unique_ptr<TKFacebookAccountAccessPlugin> TKFacebookAccountAccessPlugin::init(
    const RVDHostServices& services) {
  const auto [keychainManager,
              facebookRequests,
              userNotifications,
              preferences,
              serialQueues,
              notifications,
              jsonReader,
              stringTable,
              logService,
              accessLog] = services;
  const void* const needed[] = {keychainManager,
                                facebookRequests,
                                userNotifications,
                                preferences,
                                serialQueues,
                                notifications,
                                jsonReader,
                                stringTable,
                                logService,
                                accessLog};
  for (const void* service : needed) {
    if (service == nullptr) return nullptr;
  }
  return std::make_unique<TKFacebookAccountAccessPlugin>(services);
}

TKFacebookAccountAccessPlugin::TKFacebookAccountAccessPlugin(const RVDHostServices& services)
    : services_(services),
      permissionCategories_{std::string(TKFacebookPermissionCategoryBasicRead),
                            std::string(TKFacebookPermissionCategoryExtendedRead),
                            std::string(TKFacebookPermissionCategoryWrite),
                            std::string(TKFacebookPermissionCategoryManage)} {
}

std::shared_ptr<RVAccount> TKFacebookAccountAccessPlugin::_accountOfType(
    const std::shared_ptr<const RVAccountType>& type,
    RVDAccountStore& store) const {
  const auto accounts = store.accountsWithAccountTypeIdentifier(type->identifier());
  if (accounts.empty()) return nullptr;
  accounts.front()->setAccountType(type);
  return accounts.front();
}

bool TKFacebookAccountAccessPlugin::_shouldIgnoreAccessRequest() const {
  PreferencesState& state = *preferencesState();
  {
    const std::lock_guard lock(state.mutex);
    if (state.queue == nullptr)
      state.queue = services_.serialQueues->createSerialQueue(kPreferencesQueueLabel);
    if (!state.registrationToken) {
      state.registrationToken = services_.notifications->registerForNotification(
          TKFacebookEnvironmentDidChangeNotification, state.queue, [preferences = services_.preferences] {
            preferences->ZQPreferencesAppSynchronize(TKFacebookPreferencesAppID);
          });
    }
  }
  std::optional<RVValue> value;
  state.queue->dispatchSync([&] {
    value = services_.preferences->ZQPreferencesCopyValue(TKFacebookIgnoreAccessRequests,
                                                          TKFacebookPreferencesAppID,
                                                          kZQPreferencesCurrentUser,
                                                          kZQPreferencesAnyHost);
  });
  return value && services_.preferences->booleanValue(*value);
}

std::unique_ptr<TKFacebookAccountAccessPlugin::PreferencesState>&
TKFacebookAccountAccessPlugin::preferencesState() {
  // Not destroyed at the end of the process: the queue may still be at work then.
  static auto& state = *new std::unique_ptr<PreferencesState>(std::make_unique<PreferencesState>());
  return state;
}

void TKFacebookAccountAccessPlugin::log(int level,
                                        std::string_view functionName,
                                        std::string_view format,
                                        const Arguments& arguments,
                                        int line) const {
  services_.log->RVLog(level, kRVLogFacilityDaemon, kSourceFile, functionName, line, format, arguments);
}

RVError TKFacebookAccountAccessPlugin::accessError(int code,
                                                   std::optional<std::string> localizedDescription) {
  RVError error{std::string(RVErrorDomain), code, {}};
  if (localizedDescription)
    error.userInfo.emplace(kRVErrorLocalizedDescriptionKey, *std::move(localizedDescription));
  return error;
}

std::optional<std::string> TKFacebookAccountAccessPlugin::localized(std::string_view key) const {
  return services_.stringTable->textForKey(key, "", kStringTable);
}

std::string TKFacebookAccountAccessPlugin::localizedFormat(std::string_view key,
                                                           const Arguments& arguments) const {
  return services_.stringTable->stringWithFormat(localizedText(key), arguments);
}

// What the daemon finds when it loads the module.
extern "C" {
[[gnu::visibility("default")]] extern const RVDAccountAccessPluginEntry RVDAccountAccessPluginEntryPoint;
const RVDAccountAccessPluginEntry RVDAccountAccessPluginEntryPoint = {
    kRVDAccountAccessPluginABIVersion,
    "TKFacebookAccountAccessPlugin",
    &TKFacebookAccountAccessPlugin::supportsAccountTypeWithIdentifier,
    [](const RVDHostServices& services) -> std::unique_ptr<RVDAccountAccessPlugin> {
      return TKFacebookAccountAccessPlugin::init(services);
    }};
}
