#include "agents/terminal/TextScreen.h"

#include <termios.h>

#include <ostream>

#include "base/Text.h"

namespace terminal {
namespace {

constexpr std::size_t kShownOfALine = 80;  // bytes

}  // namespace

TextScreen::TextScreen(std::ostream& out, int descriptor)
    : out_(out),
      descriptor_(descriptor) {
}

void TextScreen::registered() {
  out_ << "Ready: alerts are shown here. Ctrl-C leaves." << std::endl;
}

void TextScreen::daemonLeft() {
  out_ << "rvd has stopped. Waiting for it to come back." << std::endl;
}

void TextScreen::showAlert(const agents::Alert& alert) {
  const agents::AlertText text = agents::textOf(alert);
  out_ << "\n----------------------------------------\n"
       << text.header << "\n\n"
       << text.message << "\n\n"
       << text.askedBy << "\n\n"
       << "  " << agents::kWordForDefaultButton << "   for the button: " << text.defaultButtonTitle << "\n"
       << "  " << agents::kWordForAlternateButton << "  for the button: " << text.alternateButtonTitle << "\n"
       << std::endl;
  ::tcdrain(descriptor_);
}

void TextScreen::askForAnswer() {
  out_ << "Type " << agents::kWordForDefaultButton << " or " << agents::kWordForAlternateButton
       << ", then Enter: " << std::flush;
}

void TextScreen::notAnAnswer(const std::string& line) {
  if (!line.empty())
    out_ << "\"" << base::visible(base::shortened(line, kShownOfALine)) << "\" is no answer. ";
}

void TextScreen::answered(const agents::Alert& alert, agents::Answer answer) {
  const agents::AlertText text = agents::textOf(alert);
  out_ << "Answered: "
       << (answer == agents::Answer::kDefaultButton ? text.defaultButtonTitle : text.alternateButtonTitle)
       << std::endl;
}

void TextScreen::takenDown() {
  out_ << "\nThe alert was withdrawn. Nothing was answered." << std::endl;
}

void TextScreen::typedForNothing() {
  out_ << "Nothing is being asked; that was not an answer to anything." << std::endl;
}

bool TextScreen::works() const {
  return out_.good();
}

}  // namespace terminal
