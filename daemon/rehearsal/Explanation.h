// Why a request for access would end as it would.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "daemon/rehearsal/Rehearsal.h"

namespace rehearsal {

enum class Verdict {
  kGranted,
  kRefused,
  kWouldAsk,  // the user, where the explanation has an alert, and the server, where it has an authorization
};

// "granted", "refused", "would_ask".
std::string_view verdictText(Verdict verdict);

struct ExplainedAlert {
  std::string header;
  std::string message;
  std::string defaultButtonTitle;
  std::string alternateButtonTitle;
  bool isDescribed = true;  // false: a text of ours stands in the message in place of the server's
};

struct Explanation {
  Verdict verdict = Verdict::kRefused;
  std::string reason;  // one sentence
  std::optional<RVError>
      error;               // what the client would get with a refusal, or in spite of the user's consent
  bool isIgnored = false;  // the user's preference has the request come to nothing
  std::optional<RVPermissionSet> newPermissions;  // where somebody would be asked
  std::optional<ExplainedAlert> alert;            // where the user would be asked
  std::optional<Exchange> description;            // what is sent before anybody is asked
  std::optional<Exchange> authorization;          // what is sent once the user has consented
  std::vector<std::string> log;                   // the plug-in's lines
};

// Rehearses the request (see rehearse; throws as it does) and says what came of it.
Explanation explain(const Stage& stage, const PluginMaker& makePlugin, const Request& request);

}  // namespace rehearsal
