#include "daemon/rehearsal/Rehearsal.h"

#include <atomic>
#include <future>
#include <mutex>
#include <utility>

#include "daemon/log/Log.h"
#include "daemon/rehearsal/RehearsedStore.h"

namespace rehearsal {
namespace {

// Shows nothing: every alert is answered with the default button at once.
class UnseenAlerts final : public ZQUserNotificationService {
 public:
  ZQUserNotificationRef ZQUserNotificationCreate(const ZQAllocator*,
                                                 double,
                                                 unsigned long,
                                                 int* error,
                                                 const RVDictionary& dictionary) override {
    if (error != nullptr) *error = 0;
    const std::lock_guard lock(mutex_);
    if (!first_) first_ = dictionary;
    return reinterpret_cast<ZQUserNotificationRef>(this);  // opaque to everybody else
  }
  int ZQUserNotificationReceiveResponse(ZQUserNotificationRef notification,
                                        double,
                                        ZQResponseFlags* responseFlags) override {
    if (notification == nullptr) return 1;
    *responseFlags = 0;
    return 0;
  }
  void ZQRelease(ZQUserNotificationRef) override {}

  std::optional<RVDictionary> first() const {
    const std::lock_guard lock(mutex_);
    return first_;
  }

 private:
  mutable std::mutex mutex_;
  std::optional<RVDictionary> first_;
};

// Keeps the log's lines.
class Trail final : public logging::LogSink {
 public:
  void write(const logging::Entry& entry) override {
    const std::lock_guard lock(mutex_);
    lines_.push_back(logging::lineOf(entry));
  }
  std::vector<std::string> lines() const {
    const std::lock_guard lock(mutex_);
    return lines_;
  }

 private:
  mutable std::mutex mutex_;
  std::vector<std::string> lines_;
};

class NoAccessLog final : public RVDAccessLog {
 public:
  void RVDLogAccessRequest(std::string_view, const std::optional<std::string>&, bool, bool, double) override {
  }
};

struct Decision {
  bool granted;
  std::optional<RVError> error;
};

// The first answer counts; one that is never given breaks the promise.
RVDAccessCompletion completionOf(const std::shared_ptr<std::promise<Decision>>& promise) {
  const auto isAnswered = std::make_shared<std::atomic_flag>();
  return [promise, isAnswered](bool granted, const std::optional<RVError>& error) {
    if (!isAnswered->test_and_set()) promise->set_value({granted, error});
  };
}

// Ends the threads of the requests before the plug-in goes, whose code they run.
struct FinishedBeforePlugin {
  RehearsedRequests& requests;
  ~FinishedBeforePlugin() { requests.finish(); }
};

}  // namespace

Rehearsal rehearse(const Stage& stage, const PluginMaker& makePlugin, const Request& request) {
  const auto store = std::make_shared<RehearsedStore>(stage.store);
  RehearsedKeychain keychain(*stage.services.keychainManager);
  RehearsedRequests requests(stage.problemWithSending, stage.server);
  UnseenAlerts alerts;
  NoAccessLog accessLog;
  Trail trail;
  logging::Log log(trail);
  RVDHostServices services = stage.services;
  services.keychainManager = &keychain;
  services.facebookRequests = &requests;
  services.userNotifications = &alerts;
  services.log = &log;
  services.accessLog = &accessLog;

  Rehearsal result;
  {
    const auto plugin = makePlugin(services);
    const FinishedBeforePlugin finished{requests};
    auto promise = std::make_shared<std::promise<Decision>>();
    auto decision = promise->get_future();
    auto completion = completionOf(std::exchange(promise, nullptr));
    plugin->handleAccessRequestToAccountsOfType(
        request.accountType, request.client, request.options, store, true, std::move(completion));
    Decision decided = decision.get();
    result.granted = decided.granted;
    result.error = std::move(decided.error);
  }
  result.alert = alerts.first();
  result.description = requests.description();
  result.hasInventedDescription = requests.hasInventedDescription();
  result.authorization = requests.authorization();
  result.readRecord = store->readRecord();
  result.writtenRecord = store->writtenRecord();
  result.log = trail.lines();
  return result;
}

}  // namespace rehearsal
