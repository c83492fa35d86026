#include "base/File.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>

namespace base {
namespace {

Failure systemFailure(const std::string& name) {
  const FailureKind kind = errno == ENOENT ? FailureKind::kNotFound : FailureKind::kFailed;
  return Failure{kind, name + ": " + std::strerror(errno)};
}

}  // namespace

FileDescriptor::~FileDescriptor() {
  if (isOpen()) ::close(descriptor_);
}

Result<std::string> readFile(const std::string& path, std::size_t limit) {
  // Without blocking, so that opening a pipe that nobody writes to returns.
  const FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (!file.isOpen()) return systemFailure(path);
  return readFile(file, path, limit);
}

Result<std::string> readFile(const FileDescriptor& file, const std::string& name, std::size_t limit) {
  struct stat status {};
  if (::fstat(file.get(), &status) != 0) return systemFailure(name);
  if (!S_ISREG(status.st_mode)) return Failure{FailureKind::kInvalid, name + ": is no regular file"};
  std::string content;
  std::array<char, 16 * 1024> chunk;
  for (;;) {
    const ssize_t size = ::read(file.get(), chunk.data(), chunk.size());
    if (size < 0 && errno == EINTR) continue;
    if (size < 0) return systemFailure(name);
    if (size == 0) return content;
    content.append(chunk.data(), static_cast<std::size_t>(size));
    if (content.size() > limit)
      return Failure{FailureKind::kInvalid, name + ": is larger than " + std::to_string(limit) + " bytes"};
  }
}

}  // namespace base
