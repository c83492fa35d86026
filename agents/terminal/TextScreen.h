// The terminal agent's lines for a person.
#pragma once

#include <iosfwd>

#include "agents/terminal/Screen.h"

namespace terminal {

class TextScreen final : public Screen {
 public:
  // out: outlives this object. descriptor: the terminal that it writes to, whose last line has reached the
  // person before the answer is asked for; any other file, or -1, is not waited for.
  TextScreen(std::ostream& out, int descriptor);

  void registered() override;
  void daemonLeft() override;
  void showAlert(const agents::Alert& alert) override;
  void askForAnswer() override;
  void notAnAnswer(const std::string& line) override;
  void answered(const agents::Alert& alert, agents::Answer answer) override;
  void takenDown() override;
  void typedForNothing() override;
  bool works() const override;

 private:
  std::ostream& out_;
  const int descriptor_;
};

}  // namespace terminal
