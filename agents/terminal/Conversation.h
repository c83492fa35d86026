// One alert at a time, and the lines that may answer it.
#pragma once

#include <functional>
#include <optional>
#include <string>

#include "agents/common/Alert.h"
#include "agents/common/Answer.h"
#include "agents/terminal/Screen.h"

namespace terminal {

// Knows neither bus nor terminal. Not thread-safe.
class Conversation {
 public:
  // screen: outlives this object. discardInput: throws away what has been typed so far.
  Conversation(Screen& screen, std::function<void()> discardInput);

  using Answered = std::function<void(agents::Answer)>;

  // Shows the alert. answered: called once when it is answered or taken down, and never when it is
  // abandoned. Returns false, without calling it, where an alert is open already or nothing of this one
  // could be seen.
  bool show(const std::string& id, const agents::Alert& alert, Answered answered);

  // Takes the alert down, which answers kNoButton; nothing where it is not the open one.
  void dismiss(const std::string& id);

  // A line was typed.
  void take(const std::string& line);

  // Takes the open alert down, where there is one, without an answer to anybody.
  void abandon();

 private:
  struct Open {
    std::string id;
    agents::Alert alert;
    Answered answered;
  };

  Screen& screen_;
  const std::function<void()> discardInput_;
  std::optional<Open> open_;
};

}  // namespace terminal
