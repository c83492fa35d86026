// Lists of words and sets of names.
#pragma once

#include <algorithm>
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

// Whether the two sets have a member in common.
template <typename Names>
bool intersects(const Names& names, const Names& others) {
  return std::any_of(names.begin(), names.end(), [&](const auto& name) { return others.contains(name); });
}
