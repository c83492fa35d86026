// An alert as an agent is given it, and as a person reads it.
#pragma once

#include <optional>
#include <string>

namespace agents {

// As the daemon sends it: text from outside, which may hold anything.
struct Alert {
  std::string header;
  std::string message;
  std::string defaultButtonTitle;
  std::string alternateButtonTitle;
  std::optional<std::string> clientID;  // absent where the client has none
  std::optional<std::string> evidence;  // how the client is known; absent where the daemon does not say
};

// The same for a person: each is one line with nothing hidden in it.
struct AlertText {
  std::string header;
  std::string message;
  std::string defaultButtonTitle;
  std::string alternateButtonTitle;
  std::string askedBy;  // who asks and how that is known: a sentence of the agent, never of the client
};

// Whether there is something to see in the message and in both titles. Nobody can decide on a blank alert,
// so an agent answers one with an error and shows nothing.
bool canBeShown(const Alert& alert);

AlertText textOf(const Alert& alert);

}  // namespace agents
