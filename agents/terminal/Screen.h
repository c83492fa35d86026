// Where the terminal agent shows what happens.
#pragma once

#include <string>

#include "agents/common/Alert.h"
#include "agents/common/Answer.h"

namespace terminal {

// Called on the agent's one thread.
class Screen {
 public:
  virtual ~Screen() = default;

  // The daemon's alerts come here from now on.
  virtual void registered() = 0;
  // The daemon has left the bus; the agent waits for the next one.
  virtual void daemonLeft() = 0;

  // Everything about the alert. Returns when all of it has been written.
  virtual void showAlert(const agents::Alert& alert) = 0;
  // What is typed from now on may answer the alert.
  virtual void askForAnswer() = 0;
  // The alert stays open.
  virtual void notAnAnswer(const std::string& line) = 0;
  virtual void answered(const agents::Alert& alert, agents::Answer answer) = 0;
  // The alert was withdrawn without an answer.
  virtual void takenDown() = 0;
  // Something was typed while no alert was open.
  virtual void typedForNothing() = 0;

  // Whether everything so far could be written.
  virtual bool works() const = 0;
};

}  // namespace terminal
