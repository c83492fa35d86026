// Lists of words for the user.
#pragma once

#include <string>
#include <string_view>

// The words in the order of the container, with the separator between every two of them.
template <typename Words>
std::string joined(const Words& words, std::string_view separator) {
  std::string text;
  for (auto word = words.begin(); word != words.end(); ++word) {
    if (word != words.begin()) text += separator;
    text += *word;
  }
  return text;
}
