#include "cli/Decisions.h"

#include <nlohmann/json.hpp>

#include "base/Text.h"

namespace cli {
namespace {

constexpr const char* kAccessDomain = "com.zentor.accounts";

// What to do about the codes of the access domain.
std::string adviceFor(std::int64_t code) {
  switch (code) {
    case 6:
      return "No account is set up; add one with: rvctl account add";
    case 7:
      return "The user or the server refused";
    case 8:
      return "The options are unusable; look at --app-id, --permissions and --audience";
    case 16:
      return "rvd does not know which application asks; say so with: --as APP_ID";
    default:
      return "";
  }
}

std::string reasonText(const AccessError& error) {
  const std::string advice = error.domain == kAccessDomain ? adviceFor(error.code) : "";
  std::string text = advice;
  if (error.description) text += (text.empty() ? "" : ". ") + base::visible(*error.description);
  text += text.empty() ? "" : " ";
  return text + "(" + base::visible(error.domain) + ", code " + std::to_string(error.code) + ")";
}

Json documentOf(const AccessError& error) {
  Json document = Json::object({{"domain", error.domain}, {"code", error.code}});
  if (error.description) document["description"] = *error.description;
  return document;
}

}  // namespace

ExitStatus printDecision(Output& output,
                         const Decision& decision,
                         const char* key,
                         const std::string& done,
                         const char* notDone,
                         const std::vector<std::pair<std::string, std::string>>& others) {
  if (output.wantsJSON()) {
    Json document = Json::object({{key, decision.granted}, {"error", nullptr}});
    if (decision.error) document["error"] = documentOf(*decision.error);
    for (const auto& [name, value] : others) document[name] = value;
    output.print(document);
  } else if (decision.granted) {
    output.print(done + "\n");
  } else {
    output.print(notDone + (decision.error ? " " + reasonText(*decision.error) : std::string()) + "\n");
  }
  if (decision.granted) return ExitStatus::kDone;
  const bool wasDecided = !decision.error || decision.error->domain == kAccessDomain;
  return wasDecided ? ExitStatus::kRefused : ExitStatus::kImpossible;
}

}  // namespace cli
