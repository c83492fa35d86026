// Texts from outside, made fit to be read by a person.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace base {

bool isUTF8(std::string_view text);

// The text on one line with nothing hidden in it, for logs and terminals: control, format, bidirectional
// and line-separating characters and what is no UTF-8 are written as escapes ("\n", "\x1b", "\u{202e}").
std::string visible(std::string_view text);

// A name for display, made from a text that nobody vouches for: one line of UTF-8 without control, format,
// bidirectional and other invisible characters, runs of blanks made one blank, none at either end, no pile
// of combining marks, and at most `limit` grapheme clusters (the last one is then "…"). Empty where nothing
// is left that could be seen.
std::string displayName(std::string_view text, std::size_t limit);

// The text between two characters that keep the direction of its writing from reaching what stands around it.
std::string isolated(std::string_view text);

// The text without the characters that isolated() has put there, where nothing else is isolated in between.
// Any other such character stays.
std::string withoutIsolates(std::string text);

// At most `limit` bytes of the text, cut between characters, with a mark that says how long it was.
std::string shortened(std::string_view text, std::size_t limit);

}  // namespace base
