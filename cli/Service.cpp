#include "cli/Service.h"

#include <poll.h>
#include <sdbus-c++/sdbus-c++.h>

#include <algorithm>
#include <cerrno>
#include <limits>
#include <map>
#include <nlohmann/json.hpp>
#include <tuple>
#include <utility>

#include "base/BusNames.h"
#include "cli/Values.h"
#include "interfaces/Accounts1Proxy.h"
#include "interfaces/Management1Proxy.h"

namespace cli {
namespace {

constexpr const char* kAccountType = "com.zentor.facebook";
constexpr const char* kPreferencesChanged = "TKFacebookEnvironmentDidChangeNotification";

using Dictionary = std::map<std::string, sdbus::Variant>;

std::string busError(const char* name) {
  return std::string("org.freedesktop.DBus.Error.") + name;
}

base::Failure failureFor(const sdbus::Error& error) {
  using base::FailureKind;
  const std::string& name = error.getName();
  const std::string& message = error.getMessage();
  if (name == busError("ServiceUnknown") || name == busError("NameHasNoOwner"))
    return {FailureKind::kFailed, "rvd is not running. Start it with: systemctl --user start rvd"};
  if (name == busError("NoReply") || name == busError("Disconnected"))
    return {FailureKind::kFailed, "rvd stopped before it answered"};
  if (name == base::kAccessDenied)
    return {
        FailureKind::kFailed,
        "rvd does not answer this caller: it answers its own user, and is managed from outside any sandbox"};
  if (name == base::kNoAccess)
    return {FailureKind::kRefused,
            "There is no access to hand a credential out for. Ask with: rvctl request"};
  if (name == base::kUnknownApplication)
    return {FailureKind::kFailed, "No application of this ID is installed: it has no desktop entry"};
  if (name == base::kUnsupportedAccountType)
    return {FailureKind::kFailed, "rvd has no plug-in for Facebook accounts. See its log and --plugin-dir"};
  if (name == base::kLimitsExceeded) return {FailureKind::kFailed, "rvd's limits are exceeded: " + message};
  if (name == base::kInvalidArgs) return {FailureKind::kFailed, "rvd cannot take this: " + message};
  return {FailureKind::kFailed, "rvd could not do it: " + message};
}

Json documentOf(const std::vector<Dictionary>& dictionaries) {
  Json document = Json::array();
  for (const Dictionary& dictionary : dictionaries) document.push_back(jsonFrom(dictionary));
  return document;
}

Decision decisionFrom(const std::tuple<bool, Dictionary>& answer) {
  Decision decision{std::get<0>(answer), std::nullopt};
  const Json error = jsonFrom(std::get<1>(answer));
  if (error.empty()) return decision;
  AccessError& reason = decision.error.emplace();
  if (error.contains("domain") && error["domain"].is_string()) reason.domain = error["domain"];
  if (error.contains("code") && error["code"].is_number_integer()) reason.code = error["code"];
  if (error.contains("description") && error["description"].is_string())
    reason.description = error["description"];
  return decision;
}

Dictionary dictionaryOf(const RequestOptions& options) {
  Dictionary sent;
  if (options.appID) sent.emplace("app_id", *options.appID);
  if (options.permissions) sent.emplace("permissions", *options.permissions);
  if (options.audience) sent.emplace("audience", *options.audience);
  return sent;
}

}  // namespace

// Listens to signals only once it is registered for them.
class Service::Proxy final
    : public sdbus::ProxyInterfaces<com::zentor::rvd::Accounts1_proxy, com::zentor::rvd::Management1_proxy> {
 public:
  explicit Proxy(sdbus::IConnection& connection)
      : ProxyInterfaces(connection, base::kServiceName, base::kObjectPath) {}

  bool haveAuthorizationsChanged = false;

 private:
  void onAccessChanged(const std::string&) override {}
  void onAccountsChanged() override {}
  void onAuthorizationsChanged(const std::string& accountType) override {
    if (accountType == kAccountType) haveAuthorizationsChanged = true;
  }
};

Service::Service(Connect connect)
    : connect_(std::move(connect)) {
}

Service::~Service() = default;

template <typename Call>
auto Service::call(const Call& body) -> base::Result<decltype(body(std::declval<Proxy&>()))> {
  using Value = decltype(body(std::declval<Proxy&>()));
  try {
    if (!connection_) {
      auto connection = connect_();
      if (!connection) return connection.failure();
      connection_ = *std::move(connection);
      connection_->setMethodCallTimeout(std::numeric_limits<std::uint64_t>::max());
      proxy_ = std::make_unique<Proxy>(*connection_);
    }
    if constexpr (std::is_void_v<Value>) {
      body(*proxy_);
      return {};
    } else {
      return body(*proxy_);
    }
  } catch (const sdbus::Error& error) {
    return failureFor(error);
  }
}

base::Result<void> Service::registerAs(const std::string& appID) {
  return call([&](Proxy& rvd) { rvd.Register(appID); });
}

base::Result<Decision> Service::requestAccess(const RequestOptions& options) {
  return call(
      [&](Proxy& rvd) { return decisionFrom(rvd.RequestAccess(kAccountType, dictionaryOf(options), true)); });
}

base::Result<Json> Service::access() {
  return call([](Proxy& rvd) {
    const auto [state, permissions, options] = rvd.GetAccess(kAccountType);
    return Json::object({{"state", state}, {"permissions", permissions}, {"options", jsonFrom(options)}});
  });
}

base::Result<Json> Service::credential() {
  return call([](Proxy& rvd) { return jsonFrom(rvd.GetCredential(kAccountType)); });
}

base::Result<std::string> Service::addAccount(const std::string& username, int token) {
  return call([&](Proxy& rvd) { return rvd.AddAccount(kAccountType, username, sdbus::UnixFd(token)); });
}

base::Result<void> Service::removeAccount(const std::string& accountID) {
  return call([&](Proxy& rvd) { rvd.RemoveAccount(accountID); });
}

base::Result<Json> Service::accounts() {
  return call([](Proxy& rvd) { return documentOf(rvd.ListAccounts()); });
}

base::Result<Json> Service::authorizations() {
  return call([](Proxy& rvd) { return documentOf(rvd.ListAuthorizations(kAccountType)); });
}

base::Result<Decision> Service::authorize(const std::string& clientID) {
  return call([&](Proxy& rvd) { return decisionFrom(rvd.AuthorizeAccess(kAccountType, clientID)); });
}

base::Result<Decision> Service::revoke(const std::string& clientID) {
  return call([&](Proxy& rvd) { return decisionFrom(rvd.RevokeAccess(kAccountType, clientID)); });
}

base::Result<Decision> Service::revokeAll() {
  return call([](Proxy& rvd) { return decisionFrom(rvd.RevokeAllAccess(kAccountType)); });
}

base::Result<Json> Service::pendingRevocations() {
  return call([](Proxy& rvd) { return documentOf(rvd.ListPendingRevocations(kAccountType)); });
}

base::Result<void> Service::watchAuthorizations() {
  return call([](Proxy& rvd) { rvd.registerProxy(); });
}

base::Result<bool> Service::waitForAuthorizations(std::chrono::steady_clock::time_point until) {
  return call([&](Proxy& rvd) {
    for (;;) {
      while (connection_->processPendingRequest()) continue;
      if (std::exchange(rvd.haveAuthorizationsChanged, false)) return true;
      const auto left =
          std::chrono::ceil<std::chrono::milliseconds>(until - std::chrono::steady_clock::now());
      if (left.count() <= 0) return false;
      const auto bus = connection_->getEventLoopPollData();
      const int ownTime = bus.getPollTimeout();
      const int time = static_cast<int>(left.count());
      pollfd polled{bus.fd, bus.events, 0};
      if (::poll(&polled, 1, ownTime < 0 ? time : std::min(time, ownTime)) < 0 && errno != EINTR)
        throw sdbus::Error(busError("Disconnected"), "poll");
    }
  });
}

base::Result<void> Service::forgetRefusal(const std::string& clientID) {
  return call([&](Proxy& rvd) { rvd.ForgetRefusal(kAccountType, clientID); });
}

base::Result<Json> Service::accessLog(std::uint32_t limit) {
  return call([&](Proxy& rvd) { return documentOf(rvd.ListAccessLog(limit)); });
}

base::Result<Json> Service::explain(const std::string& clientID, const ExplainOptions& options) {
  Dictionary sent = dictionaryOf(options.request);
  if (options.online) sent.emplace("online", true);
  return call([&](Proxy& rvd) {
    return jsonFrom(rvd.ExplainAccess(kAccountType, clientID, sent, options.language));
  });
}

base::Result<Json> Service::preference(const std::string& applicationID, const std::string& key) {
  return call([&](Proxy& rvd) {
    const auto values = rvd.GetPreference(applicationID, key);
    return values.empty() ? Json() : jsonFrom(values.front());
  });
}

base::Result<void> Service::setPreference(const std::string& applicationID,
                                          const std::string& key,
                                          const Json& value) {
  const auto variant = variantFrom(value);
  if (!variant) return variant.failure();
  return call([&](Proxy& rvd) { rvd.SetPreference(applicationID, key, *variant); });
}

base::Result<void> Service::resetPreference(const std::string& applicationID, const std::string& key) {
  return call([&](Proxy& rvd) { rvd.ResetPreference(applicationID, key); });
}

base::Result<void> Service::announcePreferences() {
  return call([](Proxy& rvd) { rvd.PostNotification(kPreferencesChanged); });
}

}  // namespace cli
