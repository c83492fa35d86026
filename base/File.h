// Reading small files that somebody else may have written.
#pragma once

#include <cstddef>
#include <string>
#include <utility>

#include "base/Result.h"

namespace base {

// An open file; closed when the object goes.
class FileDescriptor {
 public:
  FileDescriptor() = default;
  explicit FileDescriptor(int descriptor)
      : descriptor_(descriptor) {}
  FileDescriptor(FileDescriptor&& other) noexcept
      : descriptor_(std::exchange(other.descriptor_, -1)) {}
  FileDescriptor& operator=(FileDescriptor&& other) noexcept {
    std::swap(descriptor_, other.descriptor_);
    return *this;
  }
  ~FileDescriptor();

  int get() const { return descriptor_; }
  bool isOpen() const { return descriptor_ >= 0; }

 private:
  int descriptor_ = -1;
};

// The whole content of a regular file of at most `limit` bytes. Failures: kNotFound where there is no file;
// kInvalid for a larger one and for a device, a pipe or a directory, which are not waited for. The message
// names the path.
Result<std::string> readFile(const std::string& path, std::size_t limit);

// The same for a file that is open already; `name` is what the message calls it.
Result<std::string> readFile(const FileDescriptor& file, const std::string& name, std::size_t limit);

}  // namespace base
