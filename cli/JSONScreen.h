// What the terminal agent shows, as one JSON object a line.
#pragma once

#include "agents/terminal/Screen.h"
#include "cli/Json.h"
#include "cli/Output.h"

namespace cli {

// Each object has "event": "registered", "daemon_left", "alert", "prompt", "not_an_answer", "answered",
// "taken_down" or "typed_for_nothing".
class JSONScreen final : public terminal::Screen {
 public:
  // output: outlives this object.
  explicit JSONScreen(Output& output)
      : output_(output) {}

  void registered() override;
  void daemonLeft() override;
  void showAlert(const agents::Alert& alert) override;
  void askForAnswer() override;
  void notAnAnswer(const std::string& line) override;
  void answered(const agents::Alert& alert, agents::Answer answer) override;
  void takenDown() override;
  void typedForNothing() override;
  bool works() const override { return works_; }

 private:
  void print(const Json& event);

  Output& output_;
  bool works_ = true;
};

}  // namespace cli
