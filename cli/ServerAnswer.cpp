#include "cli/ServerAnswer.h"

#include <algorithm>
#include <chrono>
#include <nlohmann/json.hpp>

#include "base/Text.h"

namespace cli {
namespace {

constexpr std::chrono::seconds kPatience{5};

const ServerAnswer::Report kUnknown{
    "unknown",
    "Whether the server has been told is not known. See: rvctl list --pending"};

std::string notYet(const std::string& reason) {
  return "The server has not been told yet" + (reason.empty() ? std::string(".") : ": " + reason) +
         "\nrvd goes on trying. See: rvctl list --pending";
}

}  // namespace

ServerAnswer::ServerAnswer(Service& service, std::optional<std::string> clientID)
    : service_(service),
      clientID_(std::move(clientID)) {
  const auto isWatched = service_.watchAuthorizations();
  const auto authorizations = service_.authorizations();
  const auto owed = pending();
  if (!isWatched || !authorizations || !owed) return;
  isKnown_ = true;
  before_ = attemptsOf(*owed);
  isThereSomethingToTell_ =
      !owed->empty() || std::any_of(authorizations->begin(), authorizations->end(), [&](const Json& record) {
        return concerns(Json::array({record.value("client_id", "")})) &&
               record.value("options", Json::object()).contains("app_id");
      });
}

bool ServerAnswer::concerns(const Json& clientIDs) const {
  return !clientID_ || std::find(clientIDs.begin(), clientIDs.end(), *clientID_) != clientIDs.end();
}

base::Result<Json> ServerAnswer::pending() {
  auto all = service_.pendingRevocations();
  if (!all) return all;
  Json ours = Json::array();
  for (const Json& one : *all)
    if (concerns(one.value("client_ids", Json::array()))) ours.push_back(one);
  return ours;
}

ServerAnswer::Attempts ServerAnswer::attemptsOf(const Json& pending) {
  Attempts attempts;
  for (const Json& one : pending)
    attempts[{one.value("app_id", ""), one.value("since", std::int64_t{0})}] +=
        one.value("attempts", std::int64_t{0});
  return attempts;
}

ServerAnswer::Report ServerAnswer::wait() {
  const auto until = std::chrono::steady_clock::now() + kPatience;
  while (isKnown_) {
    const auto owed = pending();
    if (!owed) break;
    if (owed->empty()) {
      if (isThereSomethingToTell_) return {"told", "The server has been told."};
      return {"nothing", "There was nothing to tell the server."};
    }
    for (const auto& [key, attempts] : attemptsOf(*owed)) {
      const auto earlier = before_.find(key);
      if (attempts <= (earlier == before_.end() ? 0 : earlier->second)) continue;
      return {"pending", notYet(base::visible(owed->front().value("failure", "")))};
    }
    const auto changed = service_.waitForAuthorizations(until);
    if (!changed) break;
    if (!*changed) return {"pending", notYet("")};
  }
  return kUnknown;
}

}  // namespace cli
