#include "agents/common/Alert.h"

#include "base/Text.h"

namespace agents {
namespace {

bool hasSomethingToSee(const std::string& text) {
  return !base::displayName(text, 1).empty();
}

// Names are isolated in the daemon's sentences. A terminal shows what does that as signs of their own.
std::string shown(const std::string& text) {
  return base::visible(base::withoutIsolates(text));
}

std::string askedByLine(const Alert& alert) {
  if (!alert.clientID) return "Asked by a program that does not say which application it is.";
  const std::string client = base::visible(*alert.clientID);
  if (!alert.evidence) return "Asked by " + client + ".";
  if (*alert.evidence == "registered") return "Asked by " + client + ", as the program itself says.";
  if (*alert.evidence == "scope") return "Asked by " + client + ", as which the session started it.";
  if (*alert.evidence == "sandbox") return "Asked by " + client + ", as its sandbox says.";
  return "Asked by " + client + " (known by: " + base::visible(*alert.evidence) + ").";
}

}  // namespace

bool canBeShown(const Alert& alert) {
  return hasSomethingToSee(alert.message) && hasSomethingToSee(alert.defaultButtonTitle) &&
         hasSomethingToSee(alert.alternateButtonTitle);
}

AlertText textOf(const Alert& alert) {
  return AlertText{shown(alert.header),
                   shown(alert.message),
                   shown(alert.defaultButtonTitle),
                   shown(alert.alternateButtonTitle),
                   askedByLine(alert)};
}

}  // namespace agents
