// The directory that holds everything that lasts, and safe ways to touch the files in it.
#pragma once

#include <cstddef>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "base/File.h"
#include "base/Result.h"

namespace state {

// The state directory, held by one process at a time: a second one that opens it is refused until this
// object goes. Thread-safe, but two writes to one file name must not overlap. File names are plain names,
// without a slash.
class Directory {
 public:
  // Opens the directory, making it and its missing parents with mode 0700. Refused (kRefused, with what to
  // do about it): a directory of another owner, one that its group or others can enter, a symbolic link,
  // one that another process holds.
  static base::Result<std::unique_ptr<Directory>> open(const std::filesystem::path& path);

  // Absolute, free of symbolic links.
  const std::filesystem::path& path() const { return path_; }

  // Whether there is such a file. kRefused, with what to do about it, where what is there cannot be trusted:
  // it is no regular file, it belongs to somebody else, it has a second name, or others can get at it.
  base::Result<bool> checkFile(const std::string& name) const;

  // Opens a file for reading that checkFile lets pass; absent where there is none.
  base::Result<std::optional<base::FileDescriptor>> openFile(const std::string& name) const;

  // The content of such a file. kInvalid where it is longer than `limit` bytes.
  base::Result<std::optional<std::string>> readFile(const std::string& name, std::size_t limit) const;

  // Puts this content in place of the file's, or makes the file, with mode 0600; durable when it returns.
  // Whatever happens, the file has either its old content or the new.
  base::Result<void> replaceFile(const std::string& name, std::string_view content) const;

  // Gives a file the first free name of `name`.damaged-1, -2 and so on, and answers which.
  base::Result<std::string> setAside(const std::string& name) const;

  // Renames over what may be there; durable when it returns.
  base::Result<void> rename(const std::string& from, const std::string& to) const;

  // No such file is a success.
  base::Result<void> removeFile(const std::string& name) const;

 private:
  Directory(std::filesystem::path path, base::FileDescriptor directory, base::FileDescriptor lock);
  base::Result<void> writeFile(const std::string& name, std::string_view content) const;
  base::Failure failure(const std::string& name, const char* action) const;

  const std::filesystem::path path_;
  const base::FileDescriptor directory_;
  const base::FileDescriptor lock_;
};

}  // namespace state
