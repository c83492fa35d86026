// Upper-casing without a locale.
#pragma once

#include <string>
#include <string_view>

// The text in upper case by the full Unicode default mapping: the same in every language, and longer than
// the text where one letter becomes several. text: UTF-8; bytes that are none stay as they are.
std::string upperCased(std::string_view text);
