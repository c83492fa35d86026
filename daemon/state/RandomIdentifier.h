// Names that nobody can guess.
#pragma once

#include <functional>
#include <string>

namespace state {

// Gives a new name at each call. Called from any thread.
using IdentifierSource = std::function<std::string()>;

// 128 random bits of the kernel's generator as 32 hexadecimal digits.
std::string randomIdentifier();

}  // namespace state
