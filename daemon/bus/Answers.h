// How outcomes and values are put into answers.
#pragma once

#include <sdbus-c++/sdbus-c++.h>

#include <map>
#include <optional>
#include <string>

#include "daemon/bus/Call.h"
#include "daemon/requests/RequestTable.h"
#include "host/Values.h"

namespace bus {

// The entries of an error's a{sv}: "domain", "code" and, where it has one, "description".
std::map<std::string, sdbus::Variant> errorEntries(const RVError& error);

// Answers with (b, a{sv}): the decision and its error.
void answerDecision(Call& call, bool granted, const std::optional<RVError>& error) noexcept;

// Answers with the decision, with (false, {}) for a request that became void, or with an error.
void answerOutcome(Call& call, const requests::Outcome& outcome) noexcept;

}  // namespace bus
