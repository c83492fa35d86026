#include "daemon/bus/Answers.h"

#include <algorithm>
#include <cstdint>
#include <limits>

#include "daemon/bus/Names.h"
#include "daemon/bus/Values.h"

namespace bus {

std::map<std::string, sdbus::Variant> errorEntries(const RVError& error) {
  using Limits = std::numeric_limits<std::int32_t>;
  std::map<std::string, sdbus::Variant> entries;
  entries.emplace("domain", busText(error.domain));
  entries.emplace(
      "code", static_cast<std::int32_t>(std::clamp<std::int64_t>(error.code, Limits::min(), Limits::max())));
  if (const auto description = error.localizedDescription())
    entries.emplace("description", busText(*description));
  return entries;
}

void answerDecision(Call& call, bool granted, const std::optional<RVError>& error) noexcept {
  call.reply([&](sdbus::MethodReply& reply) {
    reply << granted << (error ? errorEntries(*error) : std::map<std::string, sdbus::Variant>());
  });
}

void answerOutcome(Call& call, const requests::Outcome& outcome) noexcept {
  using Kind = requests::Outcome::Kind;
  switch (outcome.kind) {
    case Kind::kDecided:
      return answerDecision(call, outcome.granted, outcome.error);
    case Kind::kVoid:
      return answerDecision(call, false, std::nullopt);
    case Kind::kLimitReached:
      return call.fail(kLimitsExceeded, "Too many requests are waiting");
    case Kind::kFailed:
      return call.fail(kFailed, "The request could not be handled");
  }
}

}  // namespace bus
