#include "tests/support/DecisionModel.h"

namespace support {
namespace {

using Kind = ModelOptions::Kind;

constexpr auto kDenied = "com.zentor.accounts 7";

}  // namespace

bool DecisionModel::write(const ModelClient& client, const ModelRecord& record) {
  if (!client.id || storeIsBroken) return false;
  records[*client.id] = record;
  return true;
}

std::optional<Names> DecisionModel::ask(const ModelClient& client,
                                        ModelReply reply,
                                        const Names& granted,
                                        ModelOutcome& outcome) {
  if (!client.id) {
    outcome.error = "com.zentor.accounts 16";
    return std::nullopt;
  }
  outcome.authorizationAsked = true;
  switch (reply) {
    case ModelReply::kTokenAndList:
    case ModelReply::kTokenWithoutList:
    case ModelReply::kTokenAndNonsense:
      credentials.insert(*client.id);
      return reply == ModelReply::kTokenAndList ? granted : Names{};
    case ModelReply::kErrorMessage:
    case ModelReply::kNeither:
    case ModelReply::kNoObject:
      outcome.error = kDenied;
      return std::nullopt;
    case ModelReply::kNoDocument:
      outcome.error = "com.zentor.json";
      return std::nullopt;
    case ModelReply::kTransportError:
      outcome.error = "com.zentor.transfer 42";
      return std::nullopt;
    case ModelReply::kNothing:
    case ModelReply::kDropped:
    case ModelReply::kThrown:
      return std::nullopt;
  }
  return std::nullopt;
}

ModelOutcome DecisionModel::request(const ModelClient& client,
                                    const ModelOptions& options,
                                    bool allows,
                                    ModelReply reply,
                                    const Names& granted,
                                    ModelDescription description) {
  preferenceWasRead = false;
  ModelOutcome outcome;
  if (client.allAccounts) {
    outcome.granted = true;
    return outcome;
  }
  if (!client.defaultAccess && !hasAccount) {
    outcome.error = "com.zentor.accounts 6";
    return outcome;
  }
  const Names requested = options.permissionsKind == Kind::kText ? options.permissions : Names{};
  bool writes = false;
  bool unknown = false;
  for (const auto& name : requested) writes = writes || isWrite(name);
  if (options.appIDKind != Kind::kText || options.appID.empty() || options.permissionsKind == Kind::kOther ||
      (writes && options.audienceKind != Kind::kText)) {
    outcome.error = "com.zentor.accounts 8";
    return outcome;
  }

  Names existing;
  bool held = false;
  if (const auto found = client.id ? records.find(*client.id) : records.end(); found != records.end()) {
    const ModelRecord& record = found->second;
    if (!record.granted) return outcome;
    held = true;
    if (record.hasOptions && record.appID == options.appID && record.permissions)
      existing = *record.permissions;
    if (record.hasOptions && writes && record.audience != options.audience) std::erase_if(existing, isWrite);
    bool everything = !existing.empty();
    for (const auto& name : requested) everything = everything && existing.contains(name);
    if (everything) {
      outcome.granted = true;
      return outcome;
    }
  }
  Names wanted;
  for (const auto& name : requested)
    if (!existing.contains(name)) wanted.insert(name);

  bool yes = true;
  if (!client.defaultAccess) {
    for (const auto& name : wanted) unknown = unknown || isUnknown(name);
    outcome.descriptionAsked = unknown;
    if (unknown && description == ModelDescription::kThrown) return outcome;
    outcome.alertShown = !unknown || description == ModelDescription::kText;
    yes = outcome.alertShown && allows;
    log.push_back({client.id, yes, true});
  }
  return answered(client, options, yes, held, existing, wanted, reply, granted, outcome);
}

ModelOutcome DecisionModel::answered(const ModelClient& client,
                                     const ModelOptions& options,
                                     bool yes,
                                     bool held,
                                     const Names& existing,
                                     const Names& wanted,
                                     ModelReply reply,
                                     const Names& granted,
                                     ModelOutcome outcome) {
  preferenceWasRead = true;
  if (ignorePreference) return outcome;
  ModelRecord record;
  record.hasOptions = true;
  record.appID = options.appID;
  if (options.audienceKind == Kind::kText) record.audience = options.audience;
  record.audienceIsOther = options.audienceKind == Kind::kOther;
  if (!yes) {
    if (!held) write(client, record);
    outcome.error = kDenied;
    return outcome;
  }
  std::optional<Names> now;
  if (client.defaultAccess && !hasAccount) {
    now = existing;
    now->insert(wanted.begin(), wanted.end());
  } else {
    now = ask(client, reply, granted, outcome);
  }
  if (!now) return outcome;
  record.granted = true;
  record.permissions = now;
  write(client, record);
  outcome.granted = true;
  return outcome;
}

ModelOutcome DecisionModel::authorize(const ModelClient& client, ModelReply reply, const Names& granted) {
  ModelOutcome outcome;
  if (!hasAccount) return outcome;
  ModelRecord record;
  if (const auto found = client.id ? records.find(*client.id) : records.end(); found != records.end()) {
    record = found->second;
    record.permissions.reset();
    if (record.hasOptions) {
      record.permissions = ask(client, reply, granted, outcome).value_or(Names{});
      if (reply == ModelReply::kThrown) return outcome;
      outcome.error.clear();
    }
  }
  record.granted = true;
  outcome.granted = write(client, record);
  if (!outcome.granted) outcome.error = storeIsBroken ? "store 1" : "com.zentor.accounts 16";
  log.push_back({client.id, true, false});
  return outcome;
}

ModelOutcome DecisionModel::revoke(const ModelClient& client) {
  ModelOutcome outcome;
  outcome.granted = true;
  const auto found = client.id ? records.find(*client.id) : records.end();
  if (!hasAccount || found == records.end()) return outcome;
  ModelRecord record = found->second;
  if (record.hasOptions) {
    outcome.tokensRevoked = 1;
    credentials.erase(*client.id);
  }
  record.granted = false;
  record.permissions.reset();
  write(client, record);
  log.push_back({client.id, false, false});
  return outcome;
}

ModelOutcome DecisionModel::revokeAll() {
  ModelOutcome outcome;
  outcome.granted = true;
  if (!hasAccount) return outcome;
  for (const auto& [id, record] : records) {
    if (!record.hasOptions) continue;
    ++outcome.tokensRevoked;
    credentials.erase(id);
  }
  records.clear();
  return outcome;
}

}  // namespace support
