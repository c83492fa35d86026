#include "agents/terminal/Conversation.h"

#include <utility>

namespace terminal {

Conversation::Conversation(Screen& screen, std::function<void()> discardInput)
    : screen_(screen),
      discardInput_(std::move(discardInput)) {
}

bool Conversation::show(const std::string& id, const agents::Alert& alert, Answered answered) {
  if (open_ || !agents::canBeShown(alert)) return false;
  open_ = Open{id, alert, std::move(answered)};
  screen_.showAlert(alert);
  // Whatever was typed before the person could read the alert was meant for something else.
  discardInput_();
  screen_.askForAnswer();
  return true;
}

void Conversation::dismiss(const std::string& id) {
  if (!open_ || open_->id != id) return;
  const Open ended = *std::exchange(open_, std::nullopt);
  screen_.takenDown();
  ended.answered(agents::Answer::kNoButton);
}

void Conversation::take(const std::string& line) {
  if (!open_) return screen_.typedForNothing();
  const std::optional<agents::Answer> answer = agents::answerFor(line);
  if (!answer) {
    screen_.notAnAnswer(line);
    return screen_.askForAnswer();
  }
  const Open ended = *std::exchange(open_, std::nullopt);
  screen_.answered(ended.alert, *answer);
  ended.answered(*answer);
}

void Conversation::abandon() {
  if (!std::exchange(open_, std::nullopt)) return;
  screen_.takenDown();
}

}  // namespace terminal
