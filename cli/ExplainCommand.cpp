// rvctl explain
#include <nlohmann/json.hpp>

#include "base/Text.h"
#include "cli/Commands.h"

namespace cli {
namespace {

constexpr std::size_t kLabelWidth = 13;

std::string labelled(const std::string& label, const std::string& text) {
  return label + std::string(label.size() < kLabelWidth ? kLabelWidth - label.size() : 1, ' ') + text + "\n";
}

std::string textOf(const Json& explanation, const char* key) {
  return base::visible(explanation.value(key, ""));
}

std::string decisionText(const Json& explanation) {
  const std::string decision = explanation.value("decision", "");
  if (decision != "would_ask") return decision + " at once";
  return explanation.contains("message") ? "would ask the user" : "would ask the server";
}

// "com.zentor.accounts, code 6"
std::string errorText(const Json& error) {
  std::string text = textOf(error, "domain") + ", code " + valueText(error.value("code", Json(0)));
  if (error.contains("description")) text += ": " + textOf(error, "description");
  return text;
}

std::string exchangeText(const Json& exchange) {
  std::string text = textOf(exchange, "exchange");
  for (const auto& [key, value] : exchange.items())
    if (key != "exchange")
      text +=
          "  " + base::visible(key) + "=" + (value.is_array() ? listText(value, "none") : valueText(value));
  return text;
}

// As the terminal agent shows it.
std::string alertText(const Json& explanation) {
  const std::string message = base::visible(base::withoutIsolates(explanation.value("message", "")));
  std::string text = "\n    " + textOf(explanation, "header") + "\n    " + message + "\n    [" +
                     textOf(explanation, "alternate_button_title") + "] [" +
                     textOf(explanation, "default_button_title") + "]\n\n";
  if (!explanation.value("described", true))
    text += labelled("", "The server's words are not known; ask it for them with: --online");
  return text;
}

// A line of the log without the place in the source that it ends with.
std::string withoutPlace(const std::string& line) {
  return line.substr(0, line.rfind(" ["));
}

std::string explanationText(const Json& explanation) {
  std::string text = labelled("decision", decisionText(explanation));
  text += labelled("reason", textOf(explanation, "reason"));
  if (explanation.contains("error")) text += labelled("error", errorText(explanation["error"]));
  if (explanation.contains("new_permissions"))
    text += labelled("new", listText(explanation["new_permissions"], "none"));
  if (explanation.contains("message")) text += alertText(explanation);
  for (const char* key : {"description_request", "server_request"})
    if (explanation.contains(key)) text += labelled("sent", exchangeText(explanation[key]));
  const char* label = "log";
  for (const Json& line : explanation.value("log", Json::array())) {
    text += labelled(label, base::visible(withoutPlace(line.get<std::string>())));
    label = "";
  }
  return text;
}

}  // namespace

ExitStatus explainAccess(Session& session, const std::string& clientID, const ExplainOptions& options) {
  const auto explanation = session.service.explain(clientID, options);
  if (!explanation) return session.output.failed(explanation.failure());
  if (session.output.wantsJSON())
    session.output.print(*explanation);
  else
    session.output.print(explanationText(*explanation));
  return (*explanation)["decision"] == "refused" ? ExitStatus::kRefused : ExitStatus::kDone;
}

}  // namespace cli
