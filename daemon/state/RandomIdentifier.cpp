#include "daemon/state/RandomIdentifier.h"

#include <sodium.h>

#include <array>
#include <cstdlib>

namespace state {

std::string randomIdentifier() {
  if (sodium_init() < 0) std::abort();  // makes the generator safe for threads; fails only without one
  std::array<unsigned char, 16> bytes;
  randombytes_buf(bytes.data(), bytes.size());
  std::array<char, 2 * bytes.size() + 1> digits;
  return sodium_bin2hex(digits.data(), digits.size(), bytes.data(), bytes.size());
}

}  // namespace state
