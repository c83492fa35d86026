#include "daemon/config/Entitlements.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <cstring>
#include <utility>
#include <vector>

#include "base/File.h"
#include "base/Result.h"
#include "daemon/config/IniFile.h"
#include "daemon/log/Log.h"

namespace config {
namespace {

using base::Failure;
using base::FailureKind;
using base::FileDescriptor;

constexpr std::size_t kMaximalFileSize = 64 * 1024;
constexpr std::string_view kSuffix = ".conf";
constexpr std::string_view kKey = "Entitlements";

Failure systemFailure(const std::string& path) {
  const FailureKind kind = errno == ENOENT ? FailureKind::kNotFound : FailureKind::kFailed;
  return {kind, path + ": " + std::strerror(errno)};
}

// Looks at what was opened and not at what a path leads to now. An access list that lets somebody else
// write shows in the group's bits.
base::Result<void> checkTrust(const FileDescriptor& file, const std::string& path, uid_t owner) {
  struct stat status {};
  if (::fstat(file.get(), &status) != 0) return systemFailure(path);
  if (status.st_uid != owner)
    return Failure{FailureKind::kRefused, path + ": belongs to user " + std::to_string(status.st_uid)};
  if ((status.st_mode & (S_IWGRP | S_IWOTH)) != 0)
    return Failure{FailureKind::kRefused, path + ": can be written by others than its owner"};
  return {};
}

// The parts of `path` below `top`; nothing where it is not below, or where a part is "." or "..".
base::Result<std::vector<std::string>> partsBelow(std::string top, std::string_view path) {
  const Failure refused{FailureKind::kRefused, std::string(path) + ": is no plain path below " + top};
  if (!top.ends_with('/')) top += '/';
  if (!(std::string(path) + '/').starts_with(top)) return refused;
  std::vector<std::string> parts;
  path.remove_prefix(std::min(top.size(), path.size()));
  while (!path.empty()) {
    const std::size_t slash = std::min(path.find('/'), path.size());
    const std::string_view part = path.substr(0, slash);
    if (part == "." || part == "..") return refused;
    if (!part.empty()) parts.emplace_back(part);
    path.remove_prefix(std::min(slash + 1, path.size()));
  }
  return parts;
}

// Opens the directory part by part, so that no part can be another one when it is checked than when it is
// gone through.
base::Result<FileDescriptor> openDirectory(const std::string& directory, const PolicyTrust& trust) {
  constexpr int kFlags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
  const auto parts = partsBelow(trust.top, directory);
  if (!parts) return parts.failure();
  std::string path = trust.top;
  FileDescriptor current(::open(path.c_str(), kFlags));
  if (!current.isOpen()) return systemFailure(path);
  if (const auto checked = checkTrust(current, path, trust.owner); !checked) return checked.failure();
  for (const std::string& part : *parts) {
    path += (path.ends_with('/') ? "" : "/") + part;
    FileDescriptor next(::openat(current.get(), part.c_str(), kFlags));
    if (!next.isOpen()) return systemFailure(path);
    if (const auto checked = checkTrust(next, path, trust.owner); !checked) return checked.failure();
    current = std::move(next);
  }
  return current;
}

std::set<std::string> policyFileNames(const FileDescriptor& directory) {
  std::set<std::string> names;
  const int own = ::openat(directory.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  DIR* listing = own >= 0 ? ::fdopendir(own) : nullptr;
  if (listing == nullptr) {
    const FileDescriptor closed(own);
    return names;
  }
  while (const dirent* entry = ::readdir(listing)) {
    const std::string_view name = entry->d_name;
    if (name.ends_with(kSuffix) && !name.starts_with('.')) names.emplace(name);
  }
  ::closedir(listing);
  return names;
}

Entitlements::Names splitList(std::string_view list) {
  Entitlements::Names names;
  while (!list.empty()) {
    const std::size_t end = std::min(list.find(';'), list.size());
    const std::size_t begin = std::min(list.find_first_not_of(" \t"), end);
    const std::size_t last = list.substr(0, end).find_last_not_of(" \t");
    if (begin < end) names.emplace(list.substr(begin, last - begin + 1));
    list.remove_prefix(std::min(end + 1, list.size()));
  }
  return names;
}

using ByClient = std::map<std::string, Entitlements::Names, std::less<>>;

base::Result<ByClient> readPolicyFile(const FileDescriptor& directory,
                                      const std::string& name,
                                      const std::string& path,
                                      uid_t owner) {
  const FileDescriptor file(
      ::openat(directory.get(), name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  if (!file.isOpen()) return systemFailure(path);
  if (const auto checked = checkTrust(file, path, owner); !checked) return checked.failure();
  const auto text = base::readFile(file, path, kMaximalFileSize);
  if (!text) return text.failure();
  const auto content = parseIni(*text, path, IniFlavour::kSettings);
  if (!content) return content.failure();
  ByClient result;
  for (const IniSection& section : content->sections) {
    for (const IniEntry& entry : section.entries) {
      if (entry.key != kKey)
        return Failure{FailureKind::kInvalid,
                       path + ":" + std::to_string(entry.line) + ": key \"" + entry.key + "\" is not known"};
      result[section.name] = splitList(entry.value);
    }
  }
  return result;
}

}  // namespace

Entitlements::Entitlements(std::string directory, PolicyTrust trust, RVLogService& log)
    : directory_(std::move(directory)),
      trust_(std::move(trust)),
      log_(log),
      changes_(watch()),
      byClient_(read()) {
}

// Made anew for each reading, before it, since a directory that was exchanged is not the one that was
// watched.
base::FileDescriptor Entitlements::watch() const {
  const auto parts = partsBelow(trust_.top, directory_);
  FileDescriptor changes(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
  if (!parts || !changes.isOpen()) return changes;  // such a path is never believed
  constexpr std::uint32_t kEvents = IN_ATTRIB | IN_CLOSE_WRITE | IN_CREATE | IN_DELETE | IN_DELETE_SELF |
                                    IN_MOVED_FROM | IN_MOVED_TO | IN_MOVE_SELF | IN_DONT_FOLLOW | IN_ONLYDIR;
  std::string path = trust_.top;
  for (auto part = parts->begin();; ++part) {
    // Below a directory that is not there, or that is none, nothing can change before it does.
    if (::inotify_add_watch(changes.get(), path.c_str(), kEvents) < 0) {
      if (errno == ENOENT || errno == ENOTDIR || errno == ELOOP) return changes;
      return FileDescriptor();
    }
    if (part == parts->end()) return changes;
    path += (path.ends_with('/') ? "" : "/") + *part;
  }
}

bool Entitlements::hasChanged() const {
  if (!changes_.isOpen()) return true;
  std::array<char, sizeof(inotify_event) + NAME_MAX + 1> event;
  return ::read(changes_.get(), event.data(), event.size()) >= 0 || errno != EAGAIN;
}

Entitlements::Names Entitlements::entitlementsOfClient(std::string_view clientID) const {
  const std::lock_guard lock(mutex_);
  if (hasChanged()) {
    changes_ = watch();
    byClient_ = read();
  }
  const auto entry = byClient_.find(clientID);
  return entry != byClient_.end() ? entry->second : Names();
}

Entitlements::ByClient Entitlements::read() const {
  const auto directory = openDirectory(directory_, trust_);
  if (!directory) {
    if (directory.failure().kind != FailureKind::kNotFound)
      logging::error(log_, "No entitlements are given: %@.", {directory.failure().message});
    return {};
  }
  ByClient result;
  for (const std::string& name : policyFileNames(*directory)) {
    const auto file = readPolicyFile(*directory, name, directory_ + "/" + name, trust_.owner);
    if (!file) {
      logging::error(log_, "An entitlements file is left out: %@.", {file.failure().message});
      continue;
    }
    for (const auto& [client, names] : *file) result[client].insert(names.begin(), names.end());
  }
  return result;
}

}  // namespace config
