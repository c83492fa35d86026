// Random records, policies and requests: what an explanation says is what the request then does, and
// explaining leaves every stored byte as it is. RVD_REHEARSAL_CASES and RVD_REHEARSAL_SEED choose another
// run; the seed of a run is printed with it.
#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <future>
#include <iostream>
#include <map>
#include <random>

#include "tests/fakes/FakeHost.h"
#include "tests/support/StoredState.h"
#include "tests/unit/rehearsal_fixture.h"

namespace {

using rehearsal::Explanation;
using rehearsal::Verdict;

constexpr const char* kClientID = "org.example.PhotoApp";
constexpr const char* kServersWords = "do something new";
const std::vector<std::string> kPool = {"email",
                                        "friends",
                                        "user_photos",
                                        "friends_photos",
                                        "publish_stream",
                                        "publish",
                                        "manage_pages",
                                        "x_new",
                                        "x_odd"};

std::uint64_t numberFromEnvironment(const char* name, std::uint64_t otherwise) {
  const char* text = std::getenv(name);
  return text != nullptr ? std::strtoull(text, nullptr, 10) : otherwise;
}

class Dice {
 public:
  explicit Dice(std::uint64_t seed)
      : engine_(seed) {}
  bool once(std::uint64_t in) { return engine_() % in == 0; }
  template <typename T>
  T oneOf(const std::vector<T>& choices) {
    return choices[engine_() % choices.size()];
  }
  RVPermissionSet names() {
    RVPermissionSet picked;
    for (const auto& name : kPool)
      if (once(3)) picked.insert(name);
    return picked;
  }
  // A value in its place most of the time, else nothing or something of another type.
  void put(RVDictionary& options, std::string_view key, const RVValue& value) {
    if (!once(25)) options.emplace(key, once(12) ? RVValue(4711) : value);
  }
  RVDictionary options() {
    const RVPermissionSet permissions = names();
    RVDictionary options;
    put(options, RVFacebookAppIdKey, oneOf<std::string>({"111", "111", "111", "222", "222", "111", ""}));
    put(options, RVFacebookPermissionsKey, RVArray(permissions.begin(), permissions.end()));
    put(options, RVFacebookAudienceKey, oneOf<std::string>({"everyone", "friends", "friends", "neighbours"}));
    return options;
  }

 private:
  std::mt19937_64 engine_;
};

// The one preference there is.
class OnePreference final : public ZQPreferences {
 public:
  std::optional<RVValue> ZQPreferencesCopyValue(std::string_view,
                                                std::string_view,
                                                ZQPreferencesUser,
                                                ZQPreferencesHost) override {
    return RVValue(stored.load());
  }
  bool ZQPreferencesAppSynchronize(std::string_view) override { return true; }
  bool booleanValue(const RVValue& value) const override { return *value.boolean(); }

  std::atomic<bool> stored = false;
};

// The plug-in keeps the first preferences and queues of the process.
struct ProcessServices {
  OnePreference preferences;
  fakes::FakeSerialQueues serialQueues;
  fakes::FakeNotificationCenter notifications;
};

ProcessServices& process() {
  static auto* services = new ProcessServices;
  return *services;
}

std::map<std::string, std::string> bytesIn(const std::string& directory) {
  std::map<std::string, std::string> content;
  for (const auto& entry : std::filesystem::recursive_directory_iterator(directory))
    if (entry.is_regular_file()) content[entry.path()] = support::contentOf(entry.path());
  return content;
}

// A user and a server that are made of nothing, over what is stored.
class Device {
 public:
  explicit Device(support::StoredState& state)
      : stored(state) {
    services = {stored.keychain.get(),
                &server,
                &user,
                &process().preferences,
                &process().serialQueues,
                &process().notifications,
                &reader,
                nullptr,
                &log,
                &stored.accessLog};
  }

  void set(Dice& dice) {
    const bool wantsAccount = !dice.once(6);
    const auto accounts = stored.accounts->list();
    if (wantsAccount && accounts.empty()) stored.addAccount();
    if (!wantsAccount)
      for (const auto& account : accounts) support::succeed(stored.accounts->remove(account.identifier));
    if (dice.once(3)) {
      support::succeed(stored.records->removeAll(std::string(RVAccountTypeIdentifierFacebook)));
    } else if (dice.once(2)) {
      records::AuthorizationRecord record{
          std::string(RVAccountTypeIdentifierFacebook), kClientID, !dice.once(4), {}, {}, {}};
      if (!dice.once(4)) record.permissions = dice.names();
      if (!dice.once(4)) {
        record.options = dice.options();
        record.options->erase(std::string(RVFacebookPermissionsKey));
      }
      support::succeed(stored.records->put(record));
    }
    process().preferences.stored = dice.once(6);
  }

  std::shared_ptr<const RVDClient> client(Dice& dice) {
    std::set<std::string, std::less<>> entitlements;
    if (dice.once(12)) entitlements.emplace(kRVDAllAccountsAccessEntitlement);
    if (dice.once(5)) entitlements.emplace(kRVDFacebookAccountsDefaultAccessEntitlement);
    return std::make_shared<fakes::FakeClient>(kClientID, "Photo App", entitlements);
  }

  support::StoredState& stored;
  fakes::FakeUserNotifications user;
  fakes::FakeJSONReader reader;
  fakes::FakeLog log;
  fakes::FakeFacebookRequests server;  // last: its thread ends first
  RVDHostServices services;
  const std::shared_ptr<const RVAccountType> accountType =
      std::make_shared<const RVAccountType>(std::string(RVAccountTypeIdentifierFacebook));
};

// What a request really came to, where the user allows it.
struct Reality {
  bool granted = false;
  std::optional<RVError> error;
  std::vector<fakes::FakeAlert> alerts;
  std::vector<fakes::FakeAuthorizationExchange> authorizations;
  bool isDescriptionAsked = false;
};

Reality request(Device& device, const std::shared_ptr<const RVDClient>& client, const RVDictionary& options) {
  const std::size_t descriptions = device.server.descriptions().size();
  Reality reality;
  const auto plugin = rehearsal_tests::makePlugin(device.services);
  std::promise<void> answered;
  plugin->handleAccessRequestToAccountsOfType(device.accountType,
                                              client,
                                              options,
                                              device.stored.storeFor(support::newRequest()),
                                              true,
                                              [&](bool granted, const std::optional<RVError>& error) {
                                                reality.granted = granted;
                                                reality.error = error;
                                                answered.set_value();
                                              });
  answered.get_future().get();
  device.server.waitUntilDelivered();
  reality.alerts = device.user.alerts();
  reality.authorizations = device.server.authorizations();
  reality.isDescriptionAsked = device.server.descriptions().size() > descriptions;
  return reality;
}

std::string textOf(const fakes::FakeAlert& alert, std::string_view key) {
  return *RVValueForKey(alert.description, key)->string();
}

// As it would read with the server's words in place of ours.
std::string messageOf(const Explanation& explanation) {
  std::string message = explanation.alert->message;
  if (explanation.alert->isDescribed) return message;
  const std::size_t start = message.find("[the server's description of ");
  return message.replace(start, message.find(']', start) + 1 - start, kServersWords);
}

void expectSame(const Explanation& said, const Reality& seen, bool canSend) {
  const bool isSent = canSend && !seen.authorizations.empty();
  EXPECT_EQ(said.alert.has_value(), !seen.alerts.empty());
  EXPECT_EQ(said.authorization.has_value(), isSent);
  EXPECT_EQ(said.description.has_value(), canSend && seen.isDescriptionAsked);
  EXPECT_EQ(said.verdict == Verdict::kWouldAsk, !seen.alerts.empty() || isSent);
  // Where the server has the last word, nothing is said about what it will be.
  if (!isSent) {
    EXPECT_EQ(said.verdict == Verdict::kGranted, seen.granted);
    EXPECT_EQ(said.error, seen.error);
  } else {
    EXPECT_FALSE(said.error);
  }
  EXPECT_TRUE(!said.isIgnored || (process().preferences.stored && !seen.granted && !seen.error));
  EXPECT_TRUE(!process().preferences.stored || seen.alerts.empty() || said.isIgnored);
  EXPECT_EQ(said.newPermissions.has_value(), said.verdict == Verdict::kWouldAsk);
  EXPECT_FALSE(said.reason.empty() || said.log.empty());
  if (said.alert && !seen.alerts.empty()) {
    const auto& alert = seen.alerts.front();
    EXPECT_EQ(said.alert->header, textOf(alert, kZQUserNotificationAlertHeaderKey));
    EXPECT_EQ(messageOf(said), textOf(alert, kZQUserNotificationAlertMessageKey));
    EXPECT_EQ(said.alert->defaultButtonTitle, textOf(alert, kZQUserNotificationDefaultButtonTitleKey));
    EXPECT_EQ(said.alert->alternateButtonTitle, textOf(alert, kZQUserNotificationAlternateButtonTitleKey));
  }
  if (!seen.authorizations.empty()) {
    const auto& sent = seen.authorizations.front();
    EXPECT_TRUE(!said.newPermissions || said.newPermissions == sent.permissions);
    if (isSent && said.authorization) {
      EXPECT_TRUE(
          (*said.authorization ==
           rehearsal::Exchange{"authorize", sent.appId, sent.bundleId, sent.permissions, sent.audience}));
    }
  }
}

TEST(AnExplanationOfAnyRequest, SaysWhatTheRequestThenDoesAndLeavesEveryStoredByteAsItIs) {
#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)
  const std::uint64_t usual = 500;
#else
  const std::uint64_t usual = 2'000;
#endif
  const std::uint64_t cases = numberFromEnvironment("RVD_REHEARSAL_CASES", usual);
  const std::uint64_t seed = numberFromEnvironment("RVD_REHEARSAL_SEED", std::random_device()());
  std::cout << "seed " << seed << ", " << cases << " cases\n";
  // Nobody wants to wait for a disk at each of the thousands of commits.
  if (std::filesystem::exists("/dev/shm")) ::setenv("TMPDIR", "/dev/shm", 1);
  const support::TemporaryDirectory directory;
  support::StoredState stored(directory.path("state"));
  const RVError cannotSend{std::string(kRVTransferErrorDomain), 10, {}};
  std::map<Verdict, std::uint64_t> verdicts;
  std::uint64_t ignored = 0;
  for (std::uint64_t i = 0; i < cases; ++i) {
    Dice dice(seed + i);
    Device device(stored);
    device.set(dice);
    const auto client = device.client(dice);
    const RVDictionary options = dice.options();
    const bool canSend = !dice.once(10);
    const bool isOnline = dice.once(2);
    const bool isDescribed = !isOnline || !dice.once(4);
    device.server.replyToDescriptions(
        {!canSend ? fakes::FakeReply::withError(cannotSend)
                  : fakes::FakeReply::withBody(isDescribed ? "\"" + std::string(kServersWords) + "\""
                                                           : R"("API_EC_PARAM")")});
    device.server.replyToAuthorizations(
        {canSend ? fakes::FakeReply::withBody(R"({"access_token":"t","permissions":["email","user_photos"]})")
                 : fakes::FakeReply::withError(cannotSend)});

    rehearsal::Stage stage{device.services,
                           device.stored.storeFor(support::newRequest()),
                           [&](const auto&) { return canSend ? std::nullopt : std::optional(cannotSend); },
                           std::nullopt};
    if (isOnline)
      stage.server = {{std::shared_ptr<TKFacebookRequestFactory>(), &device.server},
                      [] { return RVSecret("t"); }};
    const auto before = bytesIn(directory.path());
    const Explanation said =
        rehearsal::explain(stage, rehearsal_tests::makePlugin, {device.accountType, client, options});
    EXPECT_EQ(bytesIn(directory.path()), before);
    EXPECT_TRUE(device.server.authorizations().empty() && device.user.alerts().empty());
    EXPECT_TRUE(isOnline || device.server.descriptions().empty());
    EXPECT_TRUE(device.log.lines().empty());

    expectSame(said, request(device, client, options), canSend);
    ++verdicts[said.verdict];
    ignored += said.isIgnored ? 1 : 0;
    if (testing::Test::HasFailure()) FAIL() << "in case " << i << " of the run with seed " << seed;
  }
  std::cout << verdicts[Verdict::kGranted] << " granted, " << verdicts[Verdict::kRefused] << " refused, "
            << verdicts[Verdict::kWouldAsk] << " would ask; " << ignored << " ignored\n";
  for (const auto& [verdict, count] : verdicts)
    EXPECT_GT(count, cases / 50) << rehearsal::verdictText(verdict)
                                 << " hardly ever: the cases are not worth much";
}

}  // namespace
