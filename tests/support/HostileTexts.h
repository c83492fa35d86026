// Texts that were made to mislead whoever reads them.
#pragma once

#include <string>
#include <vector>

namespace support {

// Several hundred: every hidden character and broken byte sequence that is known to have fooled somebody,
// at the beginning, in the middle and at the end of a harmless name, and well-known attacks. The same ones in
// the same order on every run.
std::vector<std::string> hostileTexts();

// Whether a person sees every character of it, on one line: valid UTF-8 in which no character is a control,
// a format, a separator of lines, a default-ignorable one or a control of direction. Judged by ICU.
bool hidesNothing(const std::string& text);

}  // namespace support
