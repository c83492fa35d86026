#include "cli/JSONScreen.h"

#include <cstdint>
#include <nlohmann/json.hpp>

namespace cli {

void JSONScreen::registered() {
  print(Json::object({{"event", "registered"}}));
}

void JSONScreen::daemonLeft() {
  print(Json::object({{"event", "daemon_left"}}));
}

void JSONScreen::showAlert(const agents::Alert& alert) {
  Json event = Json::object({{"event", "alert"},
                             {"header", alert.header},
                             {"message", alert.message},
                             {"default_button_title", alert.defaultButtonTitle},
                             {"alternate_button_title", alert.alternateButtonTitle}});
  if (alert.clientID) event["client_id"] = *alert.clientID;
  if (alert.evidence) event["evidence"] = *alert.evidence;
  print(event);
}

void JSONScreen::askForAnswer() {
  print(Json::object({{"event", "prompt"},
                      {"default_button", agents::kWordForDefaultButton},
                      {"alternate_button", agents::kWordForAlternateButton}}));
}

void JSONScreen::notAnAnswer(const std::string& line) {
  print(Json::object({{"event", "not_an_answer"}, {"line", line}}));
}

void JSONScreen::answered(const agents::Alert&, agents::Answer answer) {
  print(Json::object({{"event", "answered"}, {"response_flags", static_cast<std::uint64_t>(answer)}}));
}

void JSONScreen::takenDown() {
  print(Json::object({{"event", "taken_down"}}));
}

void JSONScreen::typedForNothing() {
  print(Json::object({{"event", "typed_for_nothing"}}));
}

void JSONScreen::print(const Json& event) {
  output_.printLine(event);
  works_ = output_.flush() && works_;
}

}  // namespace cli
