// rvctl preference
#include <nlohmann/json.hpp>

#include "cli/Commands.h"

namespace cli {
namespace {

// What is stored takes effect when everybody who keeps preferences has read them anew; so that follows
// every change.
ExitStatus announce(Session& session, const std::string& key, const Json& value) {
  const auto announced = session.service.announcePreferences();
  if (!announced) return session.output.failed(announced.failure());
  if (session.output.wantsJSON())
    session.output.print(Json::object({{"key", key}, {"value", value}}));
  else
    session.output.print(std::string(value.is_null() ? "Preference reset.\n" : "Preference set.\n"));
  return ExitStatus::kDone;
}

}  // namespace

ExitStatus getPreference(Session& session, const std::string& applicationID, const std::string& key) {
  const auto value = session.service.preference(applicationID, key);
  if (!value) return session.output.failed(value.failure());
  if (session.output.wantsJSON())
    session.output.print(Json::object({{"key", key}, {"value", *value}}));
  else
    session.output.print(value->is_null() ? std::string("Not set.\n") : valueText(*value) + "\n");
  return ExitStatus::kDone;
}

ExitStatus setPreference(Session& session,
                         const std::string& applicationID,
                         const std::string& key,
                         const std::string& valueText) {
  Json value = Json::parse(valueText, nullptr, false);
  if (value.is_discarded()) value = valueText;
  const auto stored = session.service.setPreference(applicationID, key, value);
  if (!stored) return session.output.failed(stored.failure());
  return announce(session, key, value);
}

ExitStatus resetPreference(Session& session, const std::string& applicationID, const std::string& key) {
  const auto reset = session.service.resetPreference(applicationID, key);
  if (!reset) return session.output.failed(reset.failure());
  return announce(session, key, nullptr);
}

}  // namespace cli
