// A directory for one test.
#pragma once

#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <string>
#include <string_view>

namespace support {

// Made empty, with mode 0700; removed with all that is in it when the object goes.
class TemporaryDirectory {
 public:
  TemporaryDirectory() {
    std::string pattern = (std::filesystem::temp_directory_path() / "rvd-test-XXXXXX").string();
    if (::mkdtemp(pattern.data()) == nullptr) throw std::runtime_error("no temporary directory");
    path_ = std::filesystem::canonical(pattern).string();
  }
  TemporaryDirectory(const TemporaryDirectory&) = delete;
  TemporaryDirectory& operator=(const TemporaryDirectory&) = delete;
  ~TemporaryDirectory() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }

  const std::string& path() const { return path_; }
  std::string path(std::string_view name) const { return path_ + "/" + std::string(name); }

  // Writes a file, with the directories that it needs (mode 0755), and returns its path.
  std::string write(std::string_view name, std::string_view content, mode_t mode = 0644) const {
    const std::string file = path(name);
    makeDirectories(std::filesystem::path(file).parent_path());
    std::ofstream(file, std::ios::binary | std::ios::trunc) << content;
    ::chmod(file.c_str(), mode);
    return file;
  }

 private:
  static void makeDirectories(const std::filesystem::path& directory) {
    if (std::filesystem::exists(directory)) return;
    makeDirectories(directory.parent_path());
    ::mkdir(directory.c_str(), 0755);
    ::chmod(directory.c_str(), 0755);
  }

  std::string path_;
};

}  // namespace support
