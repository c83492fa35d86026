#include "daemon/rehearsal/Explanation.h"

#include <utility>

namespace rehearsal {
namespace {

// The preferences of a user who has set none.
class NoPreferences final : public ZQPreferences {
 public:
  std::optional<RVValue> ZQPreferencesCopyValue(std::string_view,
                                                std::string_view,
                                                ZQPreferencesUser,
                                                ZQPreferencesHost) override {
    return std::nullopt;
  }
  bool ZQPreferencesAppSynchronize(std::string_view) override { return true; }
  bool booleanValue(const RVValue&) const override { return false; }
};

std::optional<Exchange> sentOf(const std::optional<RehearsedRequests::Prepared>& prepared) {
  return prepared && prepared->isSent ? std::optional(prepared->exchange) : std::nullopt;
}

bool hasStandingRefusal(const Rehearsal& rehearsal) {
  return rehearsal.readRecord && !rehearsal.readRecord->isGranted();
}

// Nothing came of the request though nobody refused it.
bool isIgnored(const Rehearsal& rehearsal) {
  return !rehearsal.granted && !rehearsal.error && !rehearsal.authorization && !hasStandingRefusal(rehearsal);
}

std::string reasonForGrant(const Rehearsal& rehearsal, const RVDClient& client) {
  if (client.hasEntitlement(kRVDAllAccountsAccessEntitlement))
    return "The device's policy gives the application access to all accounts.";
  if (rehearsal.writtenRecord)
    return "The device's policy gives the application access, and without an account no server is asked.";
  return "The application holds a grant that covers everything it asks for.";
}

std::string reasonForRefusal(const Rehearsal& rehearsal) {
  if (isIgnored(rehearsal)) return "The user's preference has requests for new access ignored.";
  if (hasStandingRefusal(rehearsal))
    return "The user's refusal of the application stands until it is forgotten.";
  if (rehearsal.authorization)
    return "The device's policy spares the user the question, but the server cannot be asked.";
  if (rehearsal.description)
    return std::string(
               "There is no description of the permissions that are unknown here, so the user is not asked") +
           (rehearsal.writtenRecord ? ", and the application counts as refused." : ".");
  const auto isAccessError = [&](int code) {
    return rehearsal.error && rehearsal.error->domain == RVErrorDomain && rehearsal.error->code == code;
  };
  if (isAccessError(kRVErrorNoAccount)) return "No account of this type is set up.";
  if (isAccessError(kRVErrorInvalidOptions))
    return "The options are unusable: an app ID is needed, permissions have to be a list, and permissions to "
           "post need an audience.";
  return "The request is refused without a question.";
}

std::string reasonForAlert(const Rehearsal& rehearsal) {
  if (isIgnored(rehearsal))
    return "The user is asked, but their preference has the request ignored, whatever they answer.";
  if (rehearsal.authorization && rehearsal.authorization->isSent)
    return "The user is asked and, once they have consented, the server.";
  return "The user is asked, but the server cannot be, so that nothing is granted.";
}

std::string textForKey(const RVDictionary& description, std::string_view key) {
  const RVValue* value = RVValueForKey(description, key);
  return value != nullptr && value->string() != nullptr ? *value->string() : "";
}

ExplainedAlert explainedAlert(const Rehearsal& rehearsal) {
  const RVDictionary& description = *rehearsal.alert;
  return {textForKey(description, kZQUserNotificationAlertHeaderKey),
          textForKey(description, kZQUserNotificationAlertMessageKey),
          textForKey(description, kZQUserNotificationDefaultButtonTitleKey),
          textForKey(description, kZQUserNotificationAlternateButtonTitleKey),
          !rehearsal.hasInventedDescription};
}

// The permissions that somebody is asked about are those that the server is asked for in the end. Where a
// preference is in the way of that, the request runs once more without it; by then the plug-in has met the
// real preferences, and the server need not be asked again.
std::optional<RVPermissionSet> newPermissionsOf(const Rehearsal& rehearsal,
                                                const Stage& stage,
                                                const PluginMaker& makePlugin,
                                                const Request& request) {
  if (rehearsal.authorization) return rehearsal.authorization->exchange.permissions;
  NoPreferences preferences;
  Stage unhindered = stage;
  unhindered.services.preferences = &preferences;
  unhindered.server.reset();
  const auto authorization = rehearse(unhindered, makePlugin, request).authorization;
  return authorization ? authorization->exchange.permissions : std::nullopt;
}

}  // namespace

std::string_view verdictText(Verdict verdict) {
  switch (verdict) {
    case Verdict::kGranted:
      return "granted";
    case Verdict::kWouldAsk:
      return "would_ask";
    case Verdict::kRefused:
      break;
  }
  return "refused";
}

Explanation explain(const Stage& stage, const PluginMaker& makePlugin, const Request& request) {
  Rehearsal rehearsal = rehearse(stage, makePlugin, request);
  Explanation explanation;
  explanation.isIgnored = isIgnored(rehearsal);
  explanation.error = rehearsal.error;
  explanation.description = sentOf(rehearsal.description);
  explanation.authorization = sentOf(rehearsal.authorization);
  if (rehearsal.alert) {
    explanation.verdict = Verdict::kWouldAsk;
    explanation.reason = reasonForAlert(rehearsal);
    explanation.alert = explainedAlert(rehearsal);
  } else if (explanation.authorization) {
    explanation.verdict = Verdict::kWouldAsk;
    explanation.reason = "The device's policy spares the user the question; the server alone is asked.";
  } else if (rehearsal.granted) {
    explanation.verdict = Verdict::kGranted;
    explanation.reason = reasonForGrant(rehearsal, *request.client);
  } else {
    explanation.reason = reasonForRefusal(rehearsal);
  }
  if (explanation.verdict == Verdict::kWouldAsk)
    explanation.newPermissions = newPermissionsOf(rehearsal, stage, makePlugin, request);
  explanation.log = std::move(rehearsal.log);
  return explanation;
}

}  // namespace rehearsal
