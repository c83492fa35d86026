#include "agents/common/Answer.h"

#include <algorithm>

namespace agents {
namespace {

bool isSameWord(std::string_view typed, std::string_view word) {
  const auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; };
  return std::equal(
      typed.begin(), typed.end(), word.begin(), word.end(), [&](char a, char b) { return lower(a) == b; });
}

}  // namespace

std::optional<Answer> answerFor(std::string_view line) {
  constexpr std::string_view kBlanks = " \t\r";
  const std::size_t begin = line.find_first_not_of(kBlanks);
  if (begin == std::string_view::npos) return std::nullopt;
  const std::string_view word = line.substr(begin, line.find_last_not_of(kBlanks) + 1 - begin);
  if (isSameWord(word, kWordForDefaultButton)) return Answer::kDefaultButton;
  if (isSameWord(word, kWordForAlternateButton)) return Answer::kAlternateButton;
  return std::nullopt;
}

}  // namespace agents
