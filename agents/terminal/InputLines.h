// Lines that somebody types, or that come from a pipe.
#pragma once

#include <functional>
#include <string>
#include <string_view>

namespace terminal {

// Never waits for input: its owner polls the descriptor.
class InputLines {
 public:
  // descriptor: stays the caller's, and open.
  explicit InputLines(int descriptor)
      : descriptor_(descriptor) {}

  // Takes what is there and gives each line that is complete, without its newline. A line of more than 4096
  // bytes is given cut. Returns false where the input has ended; what had been typed of a line then is none.
  bool read(const std::function<void(const std::string& line)>& take);

  // Throws away everything that had been entered before this call and was not taken, begun lines included:
  // what a terminal or a pipe holds at this moment.
  void discard();

 private:
  void add(std::string_view typed, const std::function<void(const std::string& line)>& take);

  const int descriptor_;
  std::string begun_;
};

}  // namespace terminal
