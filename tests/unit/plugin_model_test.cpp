// Random sequences of requests, answers, server replies and revocations, each step compared with a small
// model of the decision rules. RVD_MODEL_SEQUENCES and RVD_MODEL_SEED choose another run; the seed of a
// run is printed with it.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <random>
#include <stdexcept>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "tests/fakes/FakeHost.h"
#include "tests/support/DecisionModel.h"

namespace {

using support::DecisionModel;
using support::ModelClient;
using support::ModelDescription;
using support::ModelOptions;
using support::ModelOutcome;
using support::ModelRecord;
using support::ModelReply;
using support::Names;
using Kind = ModelOptions::Kind;

const Names kPool =
    {"email", "user_photos", "friends_photos", "publish_stream", "publish", "manage_pages", "x_new"};

std::uint64_t numberFromEnvironment(const char* name, std::uint64_t otherwise) {
  const char* text = std::getenv(name);
  return text != nullptr ? std::strtoull(text, nullptr, 10) : otherwise;
}

// The one preference there is. Counts its reads and, unlike the fake, keeps no list of a million of them.
class OnePreference final : public ZQPreferences {
 public:
  std::optional<RVValue> ZQPreferencesCopyValue(std::string_view,
                                                std::string_view,
                                                ZQPreferencesUser,
                                                ZQPreferencesHost) override {
    ++reads;
    if (!cache_) cache_ = stored;
    return RVValue(*cache_);
  }
  bool ZQPreferencesAppSynchronize(std::string_view) override {
    cache_.reset();
    return true;
  }
  bool booleanValue(const RVValue& value) const override { return *value.boolean(); }

  std::uint64_t reads = 0;
  bool stored = false;

 private:
  std::optional<bool> cache_;
};

// Preferences are the process's own: the plug-in registers once, with the first host that it meets.
struct ProcessServices {
  OnePreference preferences;
  fakes::FakeSerialQueues serialQueues;
  fakes::FakeNotificationCenter notifications;
  bool read = false;  // what the layer keeps until it is synchronised
  bool cached = false;
  bool registered = false;
};

ProcessServices& process() {
  static auto* services = new ProcessServices;
  return *services;
}

RVArray listOf(const Names& names) {
  return RVArray(names.begin(), names.end());
}

class Dice {
 public:
  explicit Dice(std::uint64_t seed)
      : engine_(seed) {}
  std::uint64_t below(std::uint64_t bound) { return engine_() % bound; }
  bool once(std::uint64_t in) { return below(in) == 0; }
  Names names() {
    Names picked;
    for (const auto& name : kPool)
      if (once(3)) picked.insert(name);
    return picked;
  }
  Kind kind() { return once(12) ? Kind::kAbsent : once(12) ? Kind::kOther : Kind::kText; }
  ModelReply reply() {
    return once(2) ? ModelReply::kTokenAndList
                   : static_cast<ModelReply>(below(static_cast<int>(ModelReply::kThrown) + 1));
  }
  ModelDescription description() {
    return once(2) ? ModelDescription::kText
                   : static_cast<ModelDescription>(below(static_cast<int>(ModelDescription::kThrown) + 1));
  }
  ModelOptions options() {
    ModelOptions options;
    options.appIDKind = kind();
    options.appID = once(10) ? "" : once(4) ? "222" : "111";
    options.permissionsKind = kind();
    options.permissions = names();
    options.audienceKind = kind();
    options.audience = once(8) ? "the_neighbours" : once(3) ? "friends" : "everyone";
    return options;
  }

 private:
  std::mt19937_64 engine_;
};

// The plug-in over fakes, driven and looked at in the model's terms.
class Subject {
 public:
  Subject() {
    RVDHostServices services = host_.services();
    services.preferences = &process().preferences;
    services.serialQueues = &process().serialQueues;
    services.notifications = &process().notifications;
    plugin_ = std::make_unique<TKFacebookAccountAccessPlugin>(services);
    host_.journal->setRecording(false);
  }

  fakes::FakeHost& host() { return host_; }

  std::shared_ptr<const RVDClient> client(const ModelClient& client) {
    std::set<std::string, std::less<>> entitlements;
    if (client.allAccounts) entitlements.emplace(kRVDAllAccountsAccessEntitlement);
    if (client.defaultAccess) entitlements.emplace(kRVDFacebookAccountsDefaultAccessEntitlement);
    return host_.makeClient(client.id, entitlements);
  }

  ModelOutcome request(const ModelClient& who,
                       const ModelOptions& options,
                       bool allows,
                       ModelReply reply,
                       const Names& granted,
                       ModelDescription description) {
    host_.userNotifications.answerWith({allows ? 0UL : 1UL});
    host_.facebookRequests.replyToAuthorizations({replyOf(reply, granted)});
    host_.facebookRequests.replyToDescriptions({replyOf(description)});
    return observe([&](const RVDAccessCompletion& completion) {
      plugin_->handleAccessRequestToAccountsOfType(
          host_.accountType, client(who), dictionaryOf(options), host_.store, true, completion);
    });
  }
  ModelOutcome authorize(const ModelClient& who, ModelReply reply, const Names& granted) {
    host_.facebookRequests.replyToAuthorizations({replyOf(reply, granted)});
    return observe([&](const RVDAccessCompletion& completion) {
      plugin_->authorizeAccessToAccountsOfType(host_.accountType, client(who), host_.store, completion);
    });
  }
  ModelOutcome revoke(const ModelClient& who) {
    return observe([&](const RVDAccessCompletion& completion) {
      plugin_->revokeAccessToAccountsOfType(host_.accountType, client(who), host_.store, completion);
    });
  }
  ModelOutcome revokeAll() {
    return observe([&](const RVDAccessCompletion& completion) {
      plugin_->revokeAllAccessToAccountsOfType(host_.accountType, host_.store, completion);
    });
  }

  std::optional<ModelRecord> record(const std::string& id) {
    const auto stored = host_.store->records().record(id, RVAccountTypeIdentifierFacebook);
    if (!stored) return std::nullopt;
    ModelRecord record;
    record.granted = stored->isGranted();
    if (stored->grantedPermissions())
      record.permissions = Names(stored->grantedPermissions()->begin(), stored->grantedPermissions()->end());
    if (stored->options()) {
      record.hasOptions = true;
      record.appID = *RVValueForKey(*stored->options(), RVFacebookAppIdKey)->string();
      if (const RVValue* audience = RVValueForKey(*stored->options(), RVFacebookAudienceKey)) {
        record.audienceIsOther = audience->string() == nullptr;
        if (audience->string() != nullptr) record.audience = *audience->string();
      }
    }
    return record;
  }
  bool hasCredential(const std::string& id) { return host_.keychain.stored("account-1", id) != nullptr; }

  std::vector<DecisionModel::Logged> log() {
    std::vector<DecisionModel::Logged> entries;
    for (const auto& entry : host_.accessLog.entries())
      entries.push_back({entry.clientID, entry.granted, entry.requested});
    return entries;
  }

 private:
  static RVDictionary dictionaryOf(const ModelOptions& options) {
    RVDictionary dictionary;
    const auto put = [&](std::string_view key, Kind kind, const RVValue& value) {
      if (kind != Kind::kAbsent) dictionary.emplace(key, kind == Kind::kText ? value : RVValue(4711));
    };
    RVArray names = listOf(options.permissions);
    names.push_back(13);  // names nothing
    names.insert(names.end(), options.permissions.begin(), options.permissions.end());
    put(RVFacebookAppIdKey, options.appIDKind, options.appID);
    put(RVFacebookPermissionsKey, options.permissionsKind, names);
    put(RVFacebookAudienceKey, options.audienceKind, options.audience);
    return dictionary;
  }

  static fakes::FakeReply replyOf(ModelReply reply, const Names& granted) {
    std::string list;
    for (const auto& name : granted) list += "\"" + name + "\",";
    switch (reply) {
      case ModelReply::kTokenAndList:
        return fakes::FakeReply::withBody(R"({"access_token":"t","permissions":[)" + list + "1]}");
      case ModelReply::kTokenWithoutList:
        return fakes::FakeReply::withBody(R"({"access_token":""})");
      case ModelReply::kTokenAndNonsense:
        return fakes::FakeReply::withBody(R"({"access_token":"t","permissions":"email"})");
      case ModelReply::kErrorMessage:
        return fakes::FakeReply::withBody(R"({"error_msg":"no"})", 500);
      case ModelReply::kNeither:
        return fakes::FakeReply::withBody(R"({"access_token":7})");
      case ModelReply::kNoObject:
        return fakes::FakeReply::withBody(R"(["access_token"])");
      case ModelReply::kNoDocument:
        return fakes::FakeReply::withBody("<html>");
      case ModelReply::kTransportError:
        return fakes::FakeReply::withError({"com.zentor.transfer", 42, {}});
      case ModelReply::kNothing:
        return fakes::FakeReply::withoutAnything();
      case ModelReply::kDropped:
        return fakes::FakeReply::dropped();
      case ModelReply::kThrown:
        return fakes::FakeReply::thrown();
    }
    throw std::logic_error("no such reply");
  }

  static fakes::FakeReply replyOf(ModelDescription description) {
    switch (description) {
      case ModelDescription::kText:
        return fakes::FakeReply::withBody(R"("do something new")");
      case ModelDescription::kEmpty:
        return fakes::FakeReply::withBody(R"("")");
      case ModelDescription::kUnknown:
        return fakes::FakeReply::withBody(R"("API_EC_PARAM")");
      case ModelDescription::kNoString:
        return fakes::FakeReply::withBody("{}");
      case ModelDescription::kNoDocument:
        return fakes::FakeReply::withBody("\"");
      case ModelDescription::kTransportError:
        return fakes::FakeReply::withError({"com.zentor.transfer", 42, {}});
      case ModelDescription::kNothing:
        return fakes::FakeReply::withoutAnything();
      case ModelDescription::kDropped:
        return fakes::FakeReply::dropped();
      case ModelDescription::kThrown:
        return fakes::FakeReply::thrown();
    }
    throw std::logic_error("no such description");
  }

  template <typename Operation>
  ModelOutcome observe(const Operation& operation) {
    const std::size_t alerts = host_.userNotifications.alerts().size();
    const std::size_t authorizations = host_.facebookRequests.authorizations().size();
    const std::size_t descriptions = host_.facebookRequests.descriptions().size();
    const std::size_t revoked = host_.facebookRequests.revokedAppIDs().size();
    const std::uint64_t reads = process().preferences.reads;
    int answers = 0;
    ModelOutcome outcome;
    try {
      operation([&](bool granted, const std::optional<RVError>& error) {
        ++answers;
        outcome.granted = granted;
        if (error) {
          outcome.error = error->domain;
          if (error->domain != "com.zentor.json") outcome.error += " " + std::to_string(error->code);
        }
      });
    } catch (const std::runtime_error&) {  // what a host service threw
    }
    host_.facebookRequests.waitUntilDelivered();
    EXPECT_EQ(answers, 1);
    outcome.alertShown = host_.userNotifications.alerts().size() > alerts;
    outcome.authorizationAsked = host_.facebookRequests.authorizations().size() > authorizations;
    outcome.descriptionAsked = host_.facebookRequests.descriptions().size() > descriptions;
    outcome.tokensRevoked = static_cast<int>(host_.facebookRequests.revokedAppIDs().size() - revoked);
    preferenceWasRead = process().preferences.reads > reads;
    return outcome;
  }

  fakes::FakeHost host_;
  std::unique_ptr<TKFacebookAccountAccessPlugin> plugin_;

 public:
  bool preferenceWasRead = false;
};

const std::vector<ModelClient> kClients = {{"org.example.A"},
                                           {"org.example.B"},
                                           {"org.example.Default", false, true},
                                           {"org.example.All", true, true},
                                           {std::nullopt}};

// One step in both worlds; what came of it in each.
std::pair<ModelOutcome, ModelOutcome> step(Dice& dice, DecisionModel& model, Subject& subject) {
  const ModelClient& client = kClients[dice.below(kClients.size())];
  const Names granted = dice.names();
  const ModelReply reply = dice.reply();
  switch (dice.below(12)) {
    case 0:
      return {model.authorize(client, reply, granted), subject.authorize(client, reply, granted)};
    case 1:
      return {model.revoke(client), subject.revoke(client)};
    case 2:
      if (!dice.once(3)) break;
      return {model.revokeAll(), subject.revokeAll()};
    case 3:
      model.hasAccount = !dice.once(3);
      subject.host().store->removeAccounts();
      if (model.hasAccount) subject.host().store->addAccount("account-1");
      return {};
    case 4:
      process().preferences.stored = dice.once(4);
      return {};
    case 5:
      process().notifications.post(TKFacebookEnvironmentDidChangeNotification);
      if (process().registered) process().cached = false;
      return {};
    case 6:
      if (!dice.once(3)) break;
      model.storeIsBroken = dice.once(2);
      subject.host().store->records().failWritesWith(
          model.storeIsBroken ? std::optional(RVError{"store", 1, {}}) : std::nullopt);
      return {};
    default:
      break;
  }
  const ModelOptions options = dice.options();
  const ModelDescription description = dice.description();
  const bool allows = !dice.once(3);
  model.ignorePreference = process().cached ? process().read : process().preferences.stored;
  const ModelOutcome expected = model.request(client, options, allows, reply, granted, description);
  if (model.preferenceWasRead) {
    process().registered = true;
    process().cached = true;
    process().read = model.ignorePreference;
  }
  const ModelOutcome seen = subject.request(client, options, allows, reply, granted, description);
  EXPECT_EQ(subject.preferenceWasRead, model.preferenceWasRead);
  return {expected, seen};
}

void expectSameState(const DecisionModel& model, Subject& subject) {
  for (const ModelClient& client : kClients) {
    if (!client.id) continue;
    const auto found = model.records.find(*client.id);
    const std::optional<ModelRecord> expected =
        found != model.records.end() ? std::optional(found->second) : std::nullopt;
    EXPECT_TRUE(subject.record(*client.id) == expected) << "record of " << *client.id;
    EXPECT_EQ(subject.hasCredential(*client.id), model.credentials.contains(*client.id)) << *client.id;
  }
  EXPECT_TRUE(subject.log() == model.log) << "access log";
}

std::string text(const ModelOutcome& outcome) {
  return std::string(outcome.granted ? "granted" : "not granted") + " [" + outcome.error + "] alert " +
         std::to_string(outcome.alertShown) + " authorization " + std::to_string(outcome.authorizationAsked) +
         " description " + std::to_string(outcome.descriptionAsked) + " revoked " +
         std::to_string(outcome.tokensRevoked);
}

TEST(ThePlugin, DecidesRecordsAndReportsAsTheModelDoesOverRandomSequences) {
#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)
  const std::uint64_t usual = 2'000;
#else
  const std::uint64_t usual = 100'000;
#endif
  const std::uint64_t sequences = numberFromEnvironment("RVD_MODEL_SEQUENCES", usual);
  const std::uint64_t seed = numberFromEnvironment("RVD_MODEL_SEED", std::random_device()());
  std::cout << "seed " << seed << ", " << sequences << " sequences\n";
  std::uint64_t granted = 0;
  std::uint64_t steps = 0;
  for (std::uint64_t sequence = 0; sequence < sequences; ++sequence) {
    Dice dice(seed + sequence);
    DecisionModel model;
    Subject subject;
    for (std::uint64_t i = 3 + dice.below(10); i > 0; --i) {
      const auto [expected, seen] = step(dice, model, subject);
      EXPECT_EQ(text(seen), text(expected));
      expectSameState(model, subject);
      ++steps;
      granted += seen.granted ? 1 : 0;
      if (HasFailure()) FAIL() << "in sequence " << sequence << " of the run with seed " << seed;
    }
  }
  std::cout << steps << " steps, " << granted << " of them granted\n";
  EXPECT_GT(granted, steps / 20) << "hardly anything was granted: the steps are not worth much";
}

}  // namespace
