// What a plug-in is to the daemon, and what the daemon gives it.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "host/JSONReader.h"
#include "host/RVDAccountStore.h"
#include "host/RVDKeychainManager.h"
#include "host/RVLog.h"
#include "host/RVStringTable.h"
#include "host/TKFacebookRequests.h"
#include "host/Values.h"
#include "host/ZQPreferences.h"
#include "host/ZQUserNotification.h"

// Everything that a plug-in may touch. The services outlive every plug-in object; preferences, queues,
// notifications and the log are the process's own and stay valid until it ends.
struct RVDHostServices {
  RVDKeychainManager* keychainManager = nullptr;
  TKFacebookRequestFactory* facebookRequests = nullptr;
  ZQUserNotificationService* userNotifications = nullptr;
  ZQPreferences* preferences = nullptr;
  ZQSerialQueueFactory* serialQueues = nullptr;
  ZQNotificationCenter* notifications = nullptr;
  RVJSONReader* jsonReader = nullptr;
  RVStringTable* stringTable = nullptr;
  RVLogService* log = nullptr;
  RVDAccessLog* accessLog = nullptr;
};

// Called exactly once for each operation: granted (or succeeded), and why not, where there is a reason
// to give. On the calling thread before the operation returns, or later on the thread on which a server
// answer arrives.
using RVDAccessCompletion = std::function<void(bool granted, const std::optional<RVError>& error)>;

// Decides about access to the accounts of the types that it supports. One object serves all calls, from
// any number of threads at a time; calls may block for as long as the user or the server takes. What is
// handed to a call is kept alive until its completion has run; the object itself is destroyed only when
// every call has returned and its completion has run. An exception of a host service passes through to the
// caller, after the completion has been given as (false, no error).
class RVDAccountAccessPlugin {
 public:
  virtual ~RVDAccountAccessPlugin() = default;

  // A client asks for access. options: as the client sent them, unknown keys left out.
  virtual void handleAccessRequestToAccountsOfType(std::shared_ptr<const RVAccountType> accountType,
                                                   std::shared_ptr<const RVDClient> client,
                                                   const RVDictionary& options,
                                                   std::shared_ptr<RVDAccountStore> store,
                                                   bool allowUserInteraction,
                                                   RVDAccessCompletion completion) = 0;

  // Grants a client access without asking anybody.
  virtual void authorizeAccessToAccountsOfType(std::shared_ptr<const RVAccountType> accountType,
                                               std::shared_ptr<const RVDClient> client,
                                               std::shared_ptr<RVDAccountStore> store,
                                               RVDAccessCompletion completion) = 0;

  // Takes one client's access back and leaves a standing refusal.
  virtual void revokeAccessToAccountsOfType(std::shared_ptr<const RVAccountType> accountType,
                                            std::shared_ptr<const RVDClient> client,
                                            std::shared_ptr<RVDAccountStore> store,
                                            RVDAccessCompletion completion) = 0;

  // Takes every client's access back and forgets them all.
  virtual void revokeAllAccessToAccountsOfType(std::shared_ptr<const RVAccountType> accountType,
                                               std::shared_ptr<RVDAccountStore> store,
                                               RVDAccessCompletion completion) = 0;
};

// Changes with every change of a header in host/.
inline constexpr std::uint32_t kRVDAccountAccessPluginABIVersion = 1;

// The one symbol that a plug-in module exports. It is data, so that the daemon can look at the version
// before it runs any of the module's code; it calls nothing of a module of another version.
struct RVDAccountAccessPluginEntry {
  std::uint32_t abiVersion;
  const char* className;
  // Whether the class serves accounts of this type. An absent identifier is served by nobody.
  bool (*supportsAccountTypeWithIdentifier)(const std::optional<std::string>& identifier);
  // Makes the plug-in object; null where it could not be set up. The services are copied by reference.
  std::unique_ptr<RVDAccountAccessPlugin> (*init)(const RVDHostServices& services);
};

inline constexpr const char* kRVDAccountAccessPluginEntrySymbol = "RVDAccountAccessPluginEntryPoint";
