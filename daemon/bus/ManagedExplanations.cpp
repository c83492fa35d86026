#include <sdbus-c++/sdbus-c++.h>

#include <algorithm>
#include <map>
#include <optional>
#include <utility>

#include "base/Languages.h"
#include "daemon/bus/Answers.h"
#include "daemon/bus/ManagementService.h"
#include "daemon/bus/Names.h"
#include "daemon/bus/RequestOptions.h"
#include "daemon/bus/Values.h"
#include "daemon/rehearsal/Explanation.h"

namespace bus {
namespace {

using Entries = std::map<std::string, sdbus::Variant>;

constexpr std::string_view kOnlineKey = "online";

// Whose words are asked for, best language first.
struct Wording {
  std::vector<std::string> languages;
  bool isChosen;  // false: the user's own
};

Wording readWording(Call& call, const RehearsalParts& parts, SizeLimit& limit) {
  const std::string language = readString(call.message(), limit);
  if (language.empty()) return {parts.languages, false};
  Wording wording{base::chainOfLanguage(language), true};
  if (wording.languages.empty()) throw sdbus::Error(kInvalidArgs, "This is no language");
  return wording;
}

bool takeOnline(RVDictionary& options) {
  const auto entry = options.find(kOnlineKey);
  if (entry == options.end()) return false;
  const bool* online = entry->second.boolean();
  if (online == nullptr) throw sdbus::Error(kInvalidArgs, "The option \"online\" has to be a boolean");
  const bool isOnline = *online;
  options.erase(entry);
  return isOnline;
}

// Makes plug-in objects of the module. The object that a rehearsal is given keeps its string table alive.
rehearsal::PluginMaker makerOf(const plugins::PluginModule& module, const Wording& wording) {
  return [&module, wording](const RVDHostServices& services) -> std::shared_ptr<RVDAccountAccessPlugin> {
    auto made = module.another(services, wording.languages);
    if (!made) throw sdbus::Error(kFailed, made.failure().message);
    const std::shared_ptr<plugins::PluginModule> another = *std::move(made);
    const auto hasWords = [&](const std::string& name) { return another->stringTable().hasLanguage(name); };
    if (wording.isChosen && std::none_of(wording.languages.begin(), wording.languages.end(), hasWords))
      throw sdbus::Error(kInvalidArgs, "There are no words in this language");
    return {another, &another->plugin()};
  };
}

std::vector<std::string> namesOf(const RVPermissionSet& permissions) {
  std::vector<std::string> names;
  for (const std::string& permission : permissions) names.push_back(busText(permission));
  return names;
}

Entries entriesOf(const rehearsal::Exchange& exchange) {
  Entries entries{{"exchange", exchange.name}};
  if (exchange.appID) entries.emplace("app_id", busText(*exchange.appID));
  if (exchange.bundleID) entries.emplace("bundle_id", busText(*exchange.bundleID));
  if (exchange.permissions) entries.emplace("permissions", namesOf(*exchange.permissions));
  if (exchange.audience) entries.emplace("audience", busText(*exchange.audience));
  return entries;
}

Entries entriesOf(const rehearsal::Explanation& explanation) {
  std::vector<std::string> log;
  for (const std::string& line : explanation.log) log.push_back(busText(line));
  Entries entries{{"decision", std::string(verdictText(explanation.verdict))},
                  {"reason", explanation.reason},
                  {"ignored", explanation.isIgnored},
                  {"log", log}};
  if (explanation.error) entries.emplace("error", errorEntries(*explanation.error));
  if (explanation.newPermissions) entries.emplace("new_permissions", namesOf(*explanation.newPermissions));
  if (const auto& alert = explanation.alert) {
    entries.emplace("header", busText(alert->header));
    entries.emplace("message", busText(alert->message));
    entries.emplace("default_button_title", busText(alert->defaultButtonTitle));
    entries.emplace("alternate_button_title", busText(alert->alternateButtonTitle));
    entries.emplace("described", alert->isDescribed);
  }
  if (explanation.description) entries.emplace("description_request", entriesOf(*explanation.description));
  if (explanation.authorization) entries.emplace("server_request", entriesOf(*explanation.authorization));
  return entries;
}

}  // namespace

void ManagementService::explainAccess(SharedCall call) {
  SizeLimit limit{parts_.settings.messageBytes};
  const std::string accountType = readString(call->message(), limit);
  const std::string clientID = readString(call->message(), limit);
  checkClientID(clientID);
  RVDictionary options = readRequestOptions(call->message(), limit, parts_.settings, {kOnlineKey});
  const bool isOnline = takeOnline(options);
  const Wording wording = readWording(*call, parts_.rehearsal, limit);
  const auto& module = moduleForAccountType(parts_, accountType);

  auto explain = [this, accountType, clientID, options = std::move(options), isOnline, wording, &module] {
    const RehearsalParts& parts = parts_.rehearsal;
    rehearsal::Stage stage{parts.services, makeStore(parts_), parts.problemWithSending, std::nullopt};
    if (isOnline) stage.server = parts.serverSpeaking(wording.languages);
    return rehearsal::explain(stage,
                              makerOf(module, wording),
                              {std::make_shared<const RVAccountType>(accountType),
                               parts.clientNamed(clientID, wording.languages),
                               options});
  };
  // A request of its own, because a server may be asked: it ends when its caller leaves.
  auto work = [this, call, explain = std::move(explain)](const RVDAccessCompletion& completion) {
    dispatcher_.guarded(*call, [&] {
      const rehearsal::Explanation explanation = explain();
      // What a server did not come to say is not what it would have said.
      if (requests::RequestContext::current()->isVoid())
        throw sdbus::Error(kFailed, "The explanation was given up");
      call->reply([&](sdbus::MethodReply& reply) { reply << entriesOf(explanation); });
    });
    completion(true, std::nullopt);
  };
  parts_.requests.submitAlone(
      {call->sender(), "", {}, {}, {}, {}},
      {call->sender(), [call](const auto&) { call->fail(kFailed, "The explanation was given up"); }},
      parts_.noLimits,
      std::move(work));
}

}  // namespace bus
