// Whose turn it is to be shown.
#pragma once

#include <algorithm>
#include <cstdint>
#include <map>
#include <string>

namespace alerts {

// Gives out turns, lower ones first, so that whoever has many waiting delays another by one at most. Used
// under the alert service's lock.
class Turns {
 public:
  // The turn of one more of this owner's.
  std::uint64_t join(const std::string& owner) {
    // Who has had no turn later than the present one need not be remembered.
    std::erase_if(next_, [this](const auto& entry) { return entry.second <= now_; });
    auto& next = next_[owner];
    const std::uint64_t turn = std::max(now_, next);
    next = turn + 1;
    return turn;
  }

  // One of this turn is being shown.
  void reach(std::uint64_t turn) { now_ = std::max(now_, turn); }

 private:
  std::uint64_t now_ = 0;
  std::map<std::string, std::uint64_t> next_;  // by owner
};

}  // namespace alerts
