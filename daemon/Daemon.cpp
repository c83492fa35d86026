#include "daemon/Daemon.h"

#include <sdbus-c++/sdbus-c++.h>
#include <unistd.h>

#include <algorithm>
#include <exception>
#include <stdexcept>
#include <utility>

#include "daemon/alerts/AlertService.h"
#include "daemon/bus/AccountsService.h"
#include "daemon/bus/AgentConnections.h"
#include "daemon/bus/AgentManagerService.h"
#include "daemon/bus/BusLoop.h"
#include "daemon/bus/Dispatcher.h"
#include "daemon/bus/ManagementService.h"
#include "daemon/bus/Names.h"
#include "daemon/bus/Senders.h"
#include "daemon/credentials/Keychain.h"
#include "daemon/credentials/SealedStore.h"
#include "daemon/credentials/SecretServiceStore.h"
#include "daemon/credentials/StoreChoice.h"
#include "daemon/http/FacebookRequests.h"
#include "daemon/http/FacebookServer.h"
#include "daemon/http/JSONReader.h"
#include "daemon/http/Revocations.h"
#include "daemon/http/TransferThread.h"
#include "daemon/log/Log.h"
#include "daemon/preferences/NotificationCenter.h"
#include "daemon/preferences/PreferencesStore.h"
#include "daemon/preferences/SerialQueues.h"
#include "daemon/records/Account.h"
#include "daemon/records/Intents.h"
#include "daemon/records/Outbox.h"
#include "daemon/requests/WaitingLimits.h"
#include "daemon/state/Clock.h"
#include "daemon/state/Directory.h"
#include "daemon/state/RandomIdentifier.h"

namespace rvd {
namespace {

// Threads for calls that do not wait.
constexpr std::size_t kRunningThreads = 4;
// Threads beyond those for what the user's own tools have the daemon wait for, which no limit counts.
constexpr std::size_t kThreadsForTools = 16;
constexpr std::chrono::seconds kKeepIdleThreads{10};
// For looking at the processes of those who call: a file system of theirs may never answer.
constexpr std::chrono::seconds kInspectionDeadline{5};
constexpr std::size_t kMostInspections = 16;

// The name of an application that is not known.
constexpr const char* kUnknownApplication = "An unknown application";

http::FacebookServerSettings serverOf(const config::Settings& settings) {
  return {settings.serverURL, settings.transferTimeout, settings.caFile.value_or("")};
}

// The languages as the header Accept-Language lists them: best first, each a little less wanted.
std::string acceptLanguage(const std::vector<std::string>& languages) {
  std::vector<std::string> tags;
  const auto add = [&](std::string tag) {
    std::replace(tag.begin(), tag.end(), '_', '-');
    if (std::find(tags.begin(), tags.end(), tag) == tags.end()) tags.push_back(std::move(tag));
  };
  for (const std::string& language : languages) add(language.substr(0, language.find('@')));
  add("en");
  std::string header;
  int tenths = 10;
  for (const std::string& tag : tags) {
    if (!header.empty()) header += ", ";
    header += tag;
    if (tenths < 10) header += ";q=0." + std::to_string(tenths);
    tenths = std::max(tenths - 1, 1);
  }
  return header;
}

// The own token of an account, also of one that is not found any more; absent where it is not to be had
// again.
base::Result<std::optional<RVSecret>> ownToken(const std::string& account,
                                               credentials::CredentialStore& store) {
  const auto credential = store.read({account, std::nullopt});
  if (!credential && credential.failure().kind != base::FailureKind::kDamaged) return credential.failure();
  if (!credential || !*credential) return std::optional<RVSecret>();
  return std::optional<RVSecret>((*credential)->oauthToken());
}

// The token of the account that plug-ins work with: the first one of the type.
std::optional<RVSecret> masterToken(records::Accounts& accounts, RVDKeychainManager& keychain) {
  const auto list = accounts.listOfType(RVAccountTypeIdentifierFacebook);
  if (list.empty()) return std::nullopt;
  const auto credential =
      keychain.credentialForAccount(records::Account(list.front(), nullptr), std::nullopt);
  if (credential == nullptr) return std::nullopt;
  return credential->oauthToken();
}

}  // namespace

// What lasts.
struct Daemon::Storage {
  std::unique_ptr<state::Directory> directory;
  std::unique_ptr<records::Database> database;
  std::unique_ptr<records::Accounts> accounts;
  std::unique_ptr<records::AuthorizationRecords> records;
  std::unique_ptr<records::AccessLog> accessLog;
  std::unique_ptr<records::Intents> intents;
  std::unique_ptr<records::Outbox> outbox;
  std::vector<records::OwedRevocation> owedRevocations;  // at the start
  std::unique_ptr<credentials::CredentialStore> credentialStore;
  std::unique_ptr<credentials::Keychain> keychain;
  std::unique_ptr<preferences::PreferencesStore> preferences;
};

// The connection and those who are on it.
struct Daemon::Bus {
  Bus(const Places& places, RVLogService& log, int stopDescriptor)
      : connection(sdbus::createSessionBusConnection()),
        loop(*connection, stopDescriptor),
        senders(*connection),
        agents(*connection, loop),
        applications(places.applicationDirectories, places.languages),
        entitlements(places.entitlementsDirectory, places.entitlementsTrust, log),
        clients(applications, entitlements, kUnknownApplication),
        identities(
            senders,
            {clients::makeInspect(std::make_shared<clients::SystemProcesses>(),
                                  clients::ProcessInspector("/proc", ::geteuid()),
                                  applications),
             kInspectionDeadline,
             kMostInspections},
            applications,
            [this](auto work) { loop.post(std::move(work)); },
            ::geteuid(),
            log) {}

  const std::unique_ptr<sdbus::IConnection> connection;
  bus::BusLoop loop;
  bus::Senders senders;
  bus::AgentConnections agents;
  const clients::InstalledApplications applications;
  const config::Entitlements entitlements;
  const clients::ClientDirectory clients;
  clients::Identities identities;
};

// What answers requests.
struct Daemon::Work {
  Work(const Places& places, const config::Settings& settings, Storage& storage, Bus& bus, RVLogService& log)
      : queues(log),
        transfers(log),
        server(transfers, serverOf(settings), acceptLanguage(places.languages)),
        revocations(storage.owedRevocations,
                    {*storage.outbox, *storage.accounts, *storage.records},
                    meansOfRevocations(storage),
                    log),
        facebookRequests(server, revocations),
        alerts(bus.agents, state::randomIdentifier, alerts::AlertService::growingPause),
        rate(settings.callsPerSecond, std::chrono::steady_clock::now),
        pool(kRunningThreads,
             kRunningThreads + settings.waitingRequests + kThreadsForTools,
             kKeepIdleThreads),
        table(pool,
              {[&log](const std::string& reason) {
                 logging::error(log, "A plug-in's call failed: %@", {reason});
               },
               [this, &storage](const auto& request) {
                 if (request->isVoid()) storage.keychain->requestEnded(request);
                 alerts.requestEnded(request);
               }}) {}

  http::Revocations::Means meansOfRevocations(Storage& storage) {
    return {
        [&storage](const std::string& account) { return ownToken(account, *storage.credentialStore); },
        [&storage](const std::string& account) { storage.keychain->eraseAccount(account); },
        [this](const std::string& appID, std::optional<RVSecret> token, TKFacebookRequestHandler handler) {
          server.beginRevocation(appID, std::move(token), std::move(handler));
        },
        [this](auto pause, auto work) { transfers.after(pause, std::move(work)); },
        [this](auto work) { return pool.submit(std::move(work)); },
        http::Revocations::growingPause};
  }

  preferences::NotificationCenter notifications;
  preferences::SerialQueues queues;
  http::JSONReader jsonReader;
  http::TransferThread transfers;
  http::FacebookServer server;
  http::Revocations revocations;
  http::FacebookRequests facebookRequests;
  alerts::AlertService alerts;
  requests::RateLimit rate;
  requests::RequestPool pool;
  requests::RequestTable table;
  std::vector<std::unique_ptr<plugins::PluginModule>> plugins;
  bus::RehearsalParts rehearsal;

  std::unique_ptr<sdbus::IObject> object;
  std::unique_ptr<bus::Dispatcher> dispatcher;
  std::unique_ptr<bus::AccountsService> accountsService;
  std::unique_ptr<bus::ManagementService> managementService;
  std::unique_ptr<bus::AgentManagerService> agentManagerService;
};

Daemon::Daemon(const config::Settings& settings, RVLogService& log)
    : settings_(settings),
      log_(log) {
}

Daemon::~Daemon() {
  if (work_ != nullptr) stop();
}

base::Result<std::unique_ptr<Daemon>> Daemon::start(const Places& places,
                                                    const config::Settings& settings,
                                                    RVLogService& log,
                                                    int stopDescriptor) {
  std::unique_ptr<Daemon> daemon(new Daemon(settings, log));
  if (auto opened = daemon->openStorage(places); !opened) return opened.failure();
  try {
    daemon->bus_ = std::make_unique<Bus>(places, log, stopDescriptor);
    daemon->work_ = std::make_unique<Work>(places, settings, *daemon->storage_, *daemon->bus_, log);
    daemon->serve(places);
  } catch (const std::exception& exception) {
    return base::Failure{base::FailureKind::kFailed,
                         std::string("The session bus cannot be served: ") + exception.what()};
  }
  return daemon;
}

base::Result<void> Daemon::openStorage(const Places& places) {
  storage_ = std::make_unique<Storage>();
  Storage& storage = *storage_;
  const auto keep = [](auto& place, auto result) -> base::Result<void> {
    if (!result) return result.failure();
    place = *std::move(result);
    return {};
  };
  using records::AuthorizationRecords;
  if (auto kept = keep(storage.directory, state::Directory::open(places.stateDirectory)); !kept) return kept;
  if (auto kept = keep(storage.database, records::Database::open(*storage.directory, log_)); !kept)
    return kept;
  records::Database& database = *storage.database;
  if (auto kept = keep(storage.accounts, records::Accounts::load(database, state::randomIdentifier)); !kept)
    return kept;
  if (auto kept = keep(storage.records, AuthorizationRecords::load(database, log_, state::systemTime)); !kept)
    return kept;
  storage.accessLog = std::make_unique<records::AccessLog>(
      database, log_, state::systemTime, std::chrono::days(settings_.accessLogDays));
  if (auto pruned = storage.accessLog->prune(); !pruned) return pruned;
  storage.intents = std::make_unique<records::Intents>(database);
  storage.preferences = std::make_unique<preferences::PreferencesStore>(*storage.directory, log_);
  storage.outbox = std::make_unique<records::Outbox>(database, state::systemTime);
  if (auto done =
          storage.intents->completeInterrupted(*storage.records, *storage.accounts, *storage.outbox, log_);
      !done)
    return done;
  if (auto done = storage.outbox->eraseSettledAccounts(*storage.accounts, log_); !done) return done;
  if (auto kept = keep(storage.owedRevocations, storage.outbox->list()); !kept) return kept;
  return openCredentials(places);
}

// After what was interrupted has been brought to its end, so that nothing is moved that was taken away.
base::Result<void> Daemon::openCredentials(const Places& places) {
  using credentials::StoreKind;
  Storage& storage = *storage_;
  records::Database& database = *storage.database;
  auto choice = credentials::StoreChoice::read(database);
  if (!choice) return choice.failure();
  const bool isSealed = settings_.credentialStore == config::CredentialStore::kSealed;
  std::unique_ptr<credentials::CredentialStore> keyring =
      std::make_unique<credentials::SecretServiceStore>(choice->name);
  std::unique_ptr<credentials::CredentialStore> sealed;
  if (isSealed || choice->store == StoreKind::kSealed || choice->hasLeftovers) {
    auto opened = credentials::SealedStore::open(database, *storage.directory, places.sealingKey, log_);
    if (!opened) return opened.failure();
    sealed = *std::move(opened);
  }
  storage.credentialStore = std::move(isSealed ? sealed : keyring);
  const auto& other = isSealed ? keyring : sealed;
  if (auto kept = credentials::keepCredentialsIn(isSealed ? StoreKind::kSealed : StoreKind::kSecretService,
                                                 *storage.credentialStore,
                                                 other.get(),
                                                 database,
                                                 *std::move(choice),
                                                 log_);
      !kept)
    return kept;
  storage.keychain = std::make_unique<credentials::Keychain>(database, *storage.credentialStore, log_);
  auto done = storage.keychain->reconcile();
  if (done || isSealed) return done;
  // Everything else works without the keyring, which may be there later.
  logging::error(log_,
                 "Until the desktop's keyring can be used, no credential is handed out or stored: %@",
                 {RVValue(done.failure().message)});
  return {};
}

void Daemon::serve(const Places& places) {
  Storage& storage = *storage_;
  Work& work = *work_;
  const RVDHostServices services{storage.keychain.get(),
                                 &work.facebookRequests,
                                 &work.alerts,
                                 storage.preferences.get(),
                                 &work.queues,
                                 &work.notifications,
                                 &work.jsonReader,
                                 nullptr,
                                 &log_,
                                 storage.accessLog.get()};
  work.plugins = plugins::loadPlugins(places.pluginDirectory, services, places.languages);
  work.rehearsal = rehearsalParts(places, services);

  work.object = sdbus::createObject(*bus_->connection, bus::kObjectPath);
  work.dispatcher =
      std::make_unique<bus::Dispatcher>(*work.object, bus_->loop, bus_->identities, work.pool, log_);
  const bus::Parts parts{log_,
                         settings_,
                         *storage.accounts,
                         *storage.records,
                         *storage.accessLog,
                         *storage.intents,
                         work.revocations,
                         *storage.keychain,
                         *storage.preferences,
                         work.notifications,
                         bus_->identities,
                         bus_->clients,
                         work.plugins,
                         work.pool,
                         work.table,
                         work.rate,
                         std::make_shared<requests::WaitingLimits>(
                             work.pool, settings_.waitingRequestsPerClient, settings_.waitingRequests),
                         std::make_shared<requests::UnlimitedWaiting>(work.pool),
                         work.rehearsal};
  work.accountsService =
      std::make_unique<bus::AccountsService>(*work.object, *work.dispatcher, bus_->loop, parts);
  work.managementService = std::make_unique<bus::ManagementService>(
      *work.object, *work.dispatcher, bus_->loop, *work.accountsService, parts);
  work.agentManagerService =
      std::make_unique<bus::AgentManagerService>(*work.dispatcher, bus_->agents, work.alerts);
  work.object->finishRegistration();

  bus_->connection->addMatch(
      "type='signal',sender='org.freedesktop.DBus',interface='org.freedesktop.DBus',member='"
      "NameOwnerChanged'",
      [this](sdbus::Message& message) {
        std::string name;
        std::string oldOwner;
        std::string newOwner;
        message >> name >> oldOwner >> newOwner;
        if (newOwner.empty() && name.starts_with(':')) connectionLeft(name);
      },
      sdbus::floating_slot);
  try {
    bus_->connection->requestName(bus::kServiceName);
  } catch (const sdbus::Error& error) {
    throw std::runtime_error(std::string("the name ") + bus::kServiceName +
                             " was not to be had: " + error.getMessage());
  }
  work.revocations.start();
}

bus::RehearsalParts Daemon::rehearsalParts(const Places& places, const RVDHostServices& services) {
  const auto accountToken = [&storage = *storage_] {
    return masterToken(*storage.accounts, *storage.keychain);
  };
  return {services,
          [&requests = work_->facebookRequests](const auto& permissions) {
            return requests.problemWithSending(permissions);
          },
          [this, accountToken](const std::vector<std::string>& languages) -> rehearsal::Server {
            // The requests keep what they are made of.
            struct InLanguages {
              http::FacebookServer server;
              http::FacebookRequests requests;
              InLanguages(Work& work, http::FacebookServerSettings settings, const std::string& header)
                  : server(work.transfers, std::move(settings), header),
                    requests(server, work.revocations) {}
            };
            const auto own =
                std::make_shared<InLanguages>(*work_, serverOf(settings_), acceptLanguage(languages));
            return {std::shared_ptr<http::FacebookRequests>(own, &own->requests), accountToken};
          },
          [&entitlements = bus_->entitlements, directories = places.applicationDirectories](
              const std::string& id, const std::vector<std::string>& languages) {
            const clients::InstalledApplications applications(directories, languages);
            return clients::ClientDirectory(applications, entitlements, kUnknownApplication).clientForID(id);
          },
          places.languages};
}

void Daemon::connectionLeft(const std::string& uniqueName) {
  bus_->identities.forget(uniqueName);
  work_->table.callerLeft(uniqueName);
  work_->alerts.agentsLeft(uniqueName);
  bus_->agents.removeAllOf(uniqueName);
}

bool Daemon::run() {
  const auto end = bus_->loop.run();
  if (end == bus::BusLoop::End::kBusLost) logging::error(log_, "The session bus is gone");
  stop();
  return end == bus::BusLoop::End::kStopped;
}

void Daemon::stop() {
  // Requests that come now are void from the start. What waits for the user or the server stops waiting, so
  // the pool's threads can end; revocations that are on their way are given a moment to be answered.
  const auto barrier = work_->table.makeVoid(requests::VoidReason::kStopping,
                                             [](const requests::RequestKey&) { return true; });
  work_->pool.stop();
  work_->transfers.stop(http::kRevocationGrace);
}

}  // namespace rvd
