// What the contract suites run over: the recording fakes and the daemon's own services, told apart by
// nothing that a plug-in sees.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "daemon/preferences/NotificationCenter.h"
#include "daemon/preferences/PreferencesStore.h"
#include "daemon/preferences/SerialQueues.h"
#include "tests/fakes/FakeAccountStore.h"
#include "tests/fakes/FakeKeychain.h"
#include "tests/fakes/FakePreferences.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/StoredState.h"

namespace contract {

struct LoggedDecision {
  std::string accountType;
  std::optional<std::string> clientId;
  bool granted = false;
  bool requested = false;
  friend bool operator==(const LoggedDecision&, const LoggedDecision&) = default;
};

class FakeServices {
 public:
  RVDAccountStore& store() { return store_; }
  RVDKeychainManager& keychain() { return keychain_; }
  RVDAccessLog& accessLog() { return accessLog_; }
  ZQPreferences& preferences() { return preferences_; }
  ZQSerialQueueFactory& serialQueues() { return queues_; }
  ZQNotificationCenter& notifications() { return notifications_; }

  std::string addAccount(const std::string& accountType) {
    std::string id = "account-" + std::to_string(++accounts_);
    store_.addAccount(id, accountType);
    return id;
  }
  void setMasterToken(const std::string& accountId, const std::string& token) {
    keychain_.setMasterToken(accountId, token);
  }
  // Oldest first.
  std::vector<LoggedDecision> logged() {
    std::vector<LoggedDecision> all;
    for (const auto& entry : accessLog_.entries())
      all.push_back({entry.accountTypeIdentifier, entry.clientID, entry.granted, entry.requested});
    return all;
  }
  void storePreference(std::string_view application, std::string_view key, const RVValue& value) {
    preferences_.store(key, application, value);
  }
  void post(std::string_view name) { notifications_.post(name); }

 private:
  int accounts_ = 0;
  fakes::FakeAccountStore store_;
  fakes::FakeKeychain keychain_;
  fakes::FakeAccessLog accessLog_;
  fakes::FakePreferences preferences_;
  fakes::FakeSerialQueues queues_;
  fakes::FakeNotificationCenter notifications_;
};

class DaemonServices {
 public:
  explicit DaemonServices(
      const support::StoredState::MakeStore& makeStore = support::StoredState::sealedStore)
      : state_(directory_.path("rvd"), makeStore) {}

  RVDAccountStore& store() { return *store_; }
  RVDKeychainManager& keychain() { return *state_.keychain; }
  RVDAccessLog& accessLog() { return state_.accessLog; }
  ZQPreferences& preferences() { return preferences_; }
  ZQSerialQueueFactory& serialQueues() { return queues_; }
  ZQNotificationCenter& notifications() { return notifications_; }

  std::string addAccount(const std::string& accountType) {
    const std::string id = support::valueOf(state_.accounts->add(accountType, "me")).identifier;
    support::succeed(state_.accounts->finishSetUp(id));
    return id;
  }
  void setMasterToken(const std::string& accountId, const std::string& token) {
    support::succeed(state_.keychain->setMasterCredential(accountId, RVSecret(token)));
  }
  std::vector<LoggedDecision> logged() {
    std::vector<LoggedDecision> all;
    for (const auto& entry : support::valueOf(state_.accessLog.newest(1000)))
      all.insert(all.begin(), {entry.accountType, entry.clientId, entry.granted, entry.requested});
    return all;
  }
  void storePreference(std::string_view application, std::string_view key, const RVValue& value) {
    support::succeed(preferences_.set(application, key, value));
  }
  void post(std::string_view name) { notifications_.post(name); }

 private:
  support::TemporaryDirectory directory_;
  support::StoredState state_;
  std::shared_ptr<records::RequestStore> store_ = state_.storeFor(support::newRequest());
  preferences::PreferencesStore preferences_{*state_.directory, state_.log};
  preferences::SerialQueues queues_{state_.log};
  preferences::NotificationCenter notifications_;
};

}  // namespace contract
