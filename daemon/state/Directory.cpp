#include "daemon/state/Directory.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <utility>

namespace state {
namespace {

constexpr mode_t kGroupAndOthers = S_IRWXG | S_IRWXO;
constexpr const char* kLockName = "lock";

base::Failure failed(const std::string& path, const char* action) {
  return {base::FailureKind::kFailed, path + ": " + action + ": " + std::strerror(errno)};
}

base::Failure refused(const std::string& path, const std::string& reason, const std::string& remedy) {
  return {base::FailureKind::kRefused, path + " " + reason + "; " + remedy};
}

std::string octal(mode_t mode) {
  char text[8];
  std::snprintf(text, sizeof text, "%04o", static_cast<unsigned>(mode & 07777));
  return text;
}

// Makes one directory where there is none. The umask must not decide about its mode.
base::Result<void> makeDirectory(const std::filesystem::path& path) {
  if (::mkdir(path.c_str(), S_IRWXU) != 0) {
    if (errno == EEXIST) return {};
    return failed(path, "cannot make the directory");
  }
  const base::FileDescriptor made(::open(path.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  const std::string alias = "/proc/self/fd/" + std::to_string(made.get());
  if (!made.isOpen() || ::chmod(alias.c_str(), S_IRWXU) != 0) return failed(path, "cannot set its mode");
  return {};
}

base::Result<void> makeDirectories(const std::filesystem::path& path) {
  std::filesystem::path made;
  for (const auto& part : path) {
    made /= part;
    struct stat status {};
    if (::stat(made.c_str(), &status) == 0) continue;
    if (auto done = makeDirectory(made); !done) return done;
  }
  return {};
}

base::Result<base::FileDescriptor> openDirectory(const std::filesystem::path& path) {
  struct stat status {};
  if (::lstat(path.c_str(), &status) == 0 && S_ISLNK(status.st_mode))
    return refused(path, "is a symbolic link", "name the directory itself with --state-dir");
  base::FileDescriptor directory(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!directory.isOpen()) return failed(path, "cannot open the directory");
  if (::fstat(directory.get(), &status) != 0) return failed(path, "cannot look at the directory");
  if (status.st_uid != ::geteuid())
    return refused(path,
                   "belongs to user " + std::to_string(status.st_uid),
                   "name a directory of your own with --state-dir");
  if ((status.st_mode & kGroupAndOthers) != 0)
    return refused(path,
                   "has mode " + octal(status.st_mode) + ", so that others could have changed what it holds",
                   "make sure that nobody did, then: chmod 700 " + path.string());
  return directory;
}

base::Result<base::FileDescriptor> lockDirectory(const base::FileDescriptor& directory,
                                                 const std::filesystem::path& path) {
  base::FileDescriptor lock(
      ::openat(directory.get(), kLockName, O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, S_IRUSR | S_IWUSR));
  if (!lock.isOpen() || ::fchmod(lock.get(), S_IRUSR | S_IWUSR) != 0)
    return failed(path / kLockName, "cannot open the file");
  if (::flock(lock.get(), LOCK_EX | LOCK_NB) == 0) return lock;
  if (errno != EWOULDBLOCK) return failed(path / kLockName, "cannot lock the file");
  return refused(
      path, "is in use by another rvd", "end that one, or name another directory with --state-dir");
}

base::Result<void> checkStatus(const std::string& path, const struct stat& status) {
  const std::string remedy = "make sure of what it holds, then move it away";
  if (!S_ISREG(status.st_mode)) return refused(path, "is no regular file", remedy);
  if (status.st_uid != ::geteuid())
    return refused(path, "belongs to user " + std::to_string(status.st_uid), remedy);
  if (status.st_nlink != 1) return refused(path, "has a second name (hard link)", remedy);
  if ((status.st_mode & kGroupAndOthers) != 0)
    return refused(path,
                   "has mode " + octal(status.st_mode) + ", so that others could have got at it",
                   "make sure that nobody did, then: chmod 600 " + path);
  return {};
}

bool writeAll(int file, std::string_view content) {
  while (!content.empty()) {
    const ssize_t written = ::write(file, content.data(), content.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) return false;
    content.remove_prefix(static_cast<std::size_t>(written));
  }
  return true;
}

}  // namespace

Directory::Directory(std::filesystem::path path, base::FileDescriptor directory, base::FileDescriptor lock)
    : path_(std::move(path)),
      directory_(std::move(directory)),
      lock_(std::move(lock)) {
}

base::Result<std::unique_ptr<Directory>> Directory::open(const std::filesystem::path& path) {
  std::error_code error;
  std::filesystem::path absolute = std::filesystem::absolute(path, error).lexically_normal();
  if (error) return base::Failure{base::FailureKind::kFailed, path.string() + ": " + error.message()};
  if (!absolute.has_filename()) absolute = absolute.parent_path();  // "/a/b/" is "/a/b"
  if (const auto made = makeDirectories(absolute); !made) return made.failure();
  auto directory = openDirectory(absolute);
  if (!directory) return directory.failure();
  auto lock = lockDirectory(*directory, absolute);
  if (!lock) return lock.failure();

  // SQLite takes a path. It must lead to the very directory that was looked at.
  std::filesystem::path canonical = std::filesystem::canonical(absolute, error);
  struct stat opened {};
  struct stat named {};
  if (error || ::fstat(directory->get(), &opened) != 0 || ::stat(canonical.c_str(), &named) != 0 ||
      opened.st_dev != named.st_dev || opened.st_ino != named.st_ino)
    return refused(absolute, "was exchanged while it was opened", "find out who did this");
  return std::unique_ptr<Directory>(
      new Directory(std::move(canonical), *std::move(directory), *std::move(lock)));
}

base::Failure Directory::failure(const std::string& name, const char* action) const {
  return failed(path_ / name, action);
}

base::Result<bool> Directory::checkFile(const std::string& name) const {
  struct stat status {};
  if (::fstatat(directory_.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
    if (errno == ENOENT) return false;
    return failure(name, "cannot look at the file");
  }
  if (const auto checked = checkStatus(path_ / name, status); !checked) return checked.failure();
  return true;
}

base::Result<std::optional<base::FileDescriptor>> Directory::openFile(const std::string& name) const {
  if (const auto exists = checkFile(name); !exists || !*exists) {
    if (!exists) return exists.failure();
    return std::optional<base::FileDescriptor>();
  }
  base::FileDescriptor file(
      ::openat(directory_.get(), name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  if (!file.isOpen() || ::fstat(file.get(), &status) != 0) return failure(name, "cannot open the file");
  // Once more: the name may have gone to another file since.
  if (const auto checked = checkStatus(path_ / name, status); !checked) return checked.failure();
  return std::optional(std::move(file));
}

base::Result<std::optional<std::string>> Directory::readFile(const std::string& name,
                                                             std::size_t limit) const {
  const auto file = openFile(name);
  if (!file) return file.failure();
  if (!*file) return std::optional<std::string>();
  auto content = base::readFile(**file, path_ / name, limit);
  if (!content) return content.failure();
  return std::optional(*std::move(content));
}

base::Result<void> Directory::writeFile(const std::string& name, std::string_view content) const {
  if (auto removed = removeFile(name); !removed) return removed;
  const base::FileDescriptor file(::openat(directory_.get(),
                                           name.c_str(),
                                           O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC,
                                           S_IRUSR | S_IWUSR));
  if (!file.isOpen()) return failure(name, "cannot make the file");
  if (::fchmod(file.get(), S_IRUSR | S_IWUSR) == 0 && writeAll(file.get(), content) &&
      ::fsync(file.get()) == 0)
    return {};
  const base::Failure reason = failure(name, "cannot write the file");
  ::unlinkat(directory_.get(), name.c_str(), 0);
  return reason;
}

base::Result<void> Directory::replaceFile(const std::string& name, std::string_view content) const {
  const std::string unfinished = name + ".new";
  if (auto written = writeFile(unfinished, content); !written) return written;
  return rename(unfinished, name);
}

base::Result<std::string> Directory::setAside(const std::string& name) const {
  for (int number = 1;; ++number) {
    std::string aside = name + ".damaged-" + std::to_string(number);
    struct stat status {};
    if (::fstatat(directory_.get(), aside.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0) continue;
    if (errno != ENOENT) return failure(aside, "cannot look at the file");
    if (const auto renamed = rename(name, aside); !renamed) return renamed.failure();
    return aside;
  }
}

base::Result<void> Directory::rename(const std::string& from, const std::string& to) const {
  if (::renameat(directory_.get(), from.c_str(), directory_.get(), to.c_str()) != 0)
    return failure(from, "cannot rename the file");
  if (::fsync(directory_.get()) != 0) return failure(to, "cannot write the directory");
  return {};
}

base::Result<void> Directory::removeFile(const std::string& name) const {
  if (::unlinkat(directory_.get(), name.c_str(), 0) == 0 || errno == ENOENT) return {};
  return failure(name, "cannot remove the file");
}

}  // namespace state
