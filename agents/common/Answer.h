// What a person's answer to an alert means.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace agents {

// The values are the response flags of com.zentor.rvd.Agent1.
enum class Answer : std::uint64_t {
  kDefaultButton = 0,
  kAlternateButton = 1,
  kNoButton = 2,  // the alert ended in another way: it was closed or taken down
};

// The words that stand for the buttons where there is nothing to press.
inline constexpr std::string_view kWordForDefaultButton = "allow";
inline constexpr std::string_view kWordForAlternateButton = "refuse";

// The answer that a typed line is: the whole word, in any case, with or without blanks around it. Nothing
// for every other line; an empty one chooses no button.
std::optional<Answer> answerFor(std::string_view line);

}  // namespace agents
