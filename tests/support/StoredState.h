// The services of what lasts, over a state directory of their own.
#pragma once

#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>

#include "daemon/credentials/Keychain.h"
#include "daemon/credentials/SealedStore.h"
#include "daemon/records/AccessLog.h"
#include "daemon/records/Accounts.h"
#include "daemon/records/AuthorizationRecords.h"
#include "daemon/records/Database.h"
#include "daemon/records/Intents.h"
#include "daemon/records/Outbox.h"
#include "daemon/records/RequestStore.h"
#include "daemon/state/Directory.h"
#include "tests/fakes/FakeClient.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/TemporaryDirectory.h"

namespace support {

// The value, or an exception that says why there is none.
template <typename Value>
Value valueOf(base::Result<Value> result) {
  if (!result) throw std::runtime_error(result.failure().message);
  return *std::move(result);
}

inline void succeed(const base::Result<void>& result) {
  if (!result) throw std::runtime_error(result.failure().message);
}

inline std::string contentOf(const std::filesystem::path& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

// The services as main() wires them. Throws where one cannot be opened.
class StoredState {
 public:
  // makeStore: makes the store of credentials.
  using MakeStore = std::function<std::unique_ptr<credentials::CredentialStore>(StoredState&)>;

  explicit StoredState(const std::filesystem::path& path, const MakeStore& makeStore = sealedStore)
      : directory(valueOf(state::Directory::open(path))),
        database(valueOf(records::Database::open(*directory, log))),
        accounts(valueOf(records::Accounts::load(*database, state::randomIdentifier))),
        records(valueOf(records::AuthorizationRecords::load(*database, log, clock))),
        accessLog(
            *database,
            log,
            [this] { return now; },
            kKeepAccessLog),
        intents(*database),
        outbox(*database, clock),
        credentialStore(makeStore(*this)),
        keychain(std::make_unique<credentials::Keychain>(*database, *credentialStore, log)) {}

  static std::unique_ptr<credentials::CredentialStore> sealedStore(StoredState& state) {
    return valueOf(
        credentials::SealedStore::open(*state.database, *state.directory, std::nullopt, state.log));
  }

  // What a start does before anybody is served.
  void reconcile() {
    succeed(intents.completeInterrupted(*records, *accounts, outbox, log));
    succeed(outbox.eraseSettledAccounts(*accounts, log));
    succeed(keychain->reconcile());
  }

  std::shared_ptr<records::RequestStore> storeFor(std::shared_ptr<requests::RequestContext> request) {
    return std::make_shared<records::RequestStore>(*records, *accounts, std::move(request), client, log);
  }

  // One account of the Facebook type, with a master token.
  std::string addAccount(const std::string& token = "master") {
    const std::string id =
        valueOf(accounts->add(std::string(RVAccountTypeIdentifierFacebook), "me")).identifier;
    succeed(keychain->setMasterCredential(id, RVSecret(token)));
    succeed(accounts->finishSetUp(id));
    return id;
  }

  // The account as a request sees it.
  std::shared_ptr<RVAccount> account(std::shared_ptr<requests::RequestContext> request = nullptr) {
    return storeFor(std::move(request))
        ->accountsWithAccountTypeIdentifier(RVAccountTypeIdentifierFacebook)
        .at(0);
  }

  // A record that the user made.
  void put(const std::string& clientId, bool granted, std::optional<RVDictionary> options = {}) {
    succeed(records->putForUser(
        {std::string(RVAccountTypeIdentifierFacebook), clientId, granted, {}, std::move(options), {}}));
  }

  std::optional<RVError> storeCredential(const std::string& clientId,
                                         const std::string& token,
                                         std::shared_ptr<requests::RequestContext> request = nullptr) {
    const auto carrier = account(std::move(request));
    carrier->setCredential(
        std::make_shared<const RVAccountCredential>(RVSecret(token), RVSecret(), kRVDistantFuture));
    return keychain->setCredentialForAccount(*carrier, clientId);
  }

  static std::shared_ptr<const RVDClient> client(const std::string& clientId) {
    return std::make_shared<fakes::FakeClient>(clientId, clientId);
  }
  static std::chrono::sys_seconds clock() {
    return std::chrono::sys_seconds(std::chrono::seconds(1'700'000'000));
  }

  static constexpr std::chrono::days kKeepAccessLog{30};

  std::chrono::sys_seconds now = clock();  // for the access log
  fakes::FakeLog log;
  std::unique_ptr<state::Directory> directory;
  std::unique_ptr<records::Database> database;
  std::unique_ptr<records::Accounts> accounts;
  std::unique_ptr<records::AuthorizationRecords> records;
  records::AccessLog accessLog;
  records::Intents intents;
  records::Outbox outbox;
  std::unique_ptr<credentials::CredentialStore> credentialStore;
  std::unique_ptr<credentials::Keychain> keychain;
};

inline std::shared_ptr<requests::RequestContext> newRequest(
    clients::Evidence evidence = clients::Evidence::kUnknown) {
  return std::make_shared<requests::RequestContext>(
      "org.example.PhotoApp", nullptr, RVDictionary(), evidence);
}

}  // namespace support
