#include "agents/common/Alert.h"

#include "base/Text.h"

namespace agents {
namespace {

bool hasSomethingToSee(const std::string& text) {
  return !base::displayName(text, 1).empty();
}

std::string askedByLine(const Alert& alert) {
  if (!alert.clientID) return "Asked by a program that does not say which application it is.";
  const std::string client = base::visible(*alert.clientID);
  if (!alert.evidence) return "Asked by " + client + ".";
  if (*alert.evidence == "registered") return "Asked by " + client + ", as the program itself says.";
  return "Asked by " + client + " (known by: " + base::visible(*alert.evidence) + ").";
}

}  // namespace

bool canBeShown(const Alert& alert) {
  return hasSomethingToSee(alert.message) && hasSomethingToSee(alert.defaultButtonTitle) &&
         hasSomethingToSee(alert.alternateButtonTitle);
}

AlertText textOf(const Alert& alert) {
  return AlertText{base::visible(alert.header),
                   base::visible(alert.message),
                   base::visible(alert.defaultButtonTitle),
                   base::visible(alert.alternateButtonTitle),
                   askedByLine(alert)};
}

}  // namespace agents
