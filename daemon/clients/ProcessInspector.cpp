#include "daemon/clients/ProcessInspector.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <optional>
#include <string_view>
#include <utility>

#include "base/File.h"
#include "daemon/clients/InstalledApplications.h"
#include "daemon/clients/UnitNames.h"
#include "daemon/config/IniFile.h"

namespace clients {
namespace {

using base::FileDescriptor;
using Confinement = ProcessFacts::Confinement;

constexpr std::size_t kMaximalMarkerSize = 64 * 1024;
constexpr std::size_t kMaximalProcFileSize = 64 * 1024;
constexpr std::string_view kProxy = "xdg-dbus-proxy";

// What was to be found out could not be; the reason is for the log.
struct Unclear {
  std::string reason;
};

[[noreturn]] void throwErrno(const std::string& what) {
  throw Unclear{what + ": " + std::strerror(errno)};
}

// A file of the process file system, whole. Absent where the system fails with one of the errors.
std::optional<std::string> readProcFile(const FileDescriptor& process,
                                        const char* name,
                                        std::initializer_list<int> absentWith) {
  const auto isAbsence = [&] {
    return std::find(absentWith.begin(), absentWith.end(), errno) != absentWith.end();
  };
  const FileDescriptor file(::openat(process.get(), name, O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  if (!file.isOpen()) {
    if (isAbsence()) return std::nullopt;
    throwErrno(name);
  }
  std::string content;
  std::array<char, 4096> chunk;
  for (;;) {
    const ssize_t size = ::read(file.get(), chunk.data(), chunk.size());
    if (size < 0 && errno == EINTR) continue;
    if (size < 0 && isAbsence()) return std::nullopt;
    if (size < 0) throwErrno(name);
    if (size == 0) return content;
    content.append(chunk.data(), static_cast<std::size_t>(size));
    if (content.size() > kMaximalProcFileSize) throw Unclear{std::string(name) + ": is too large"};
  }
}

bool isSameNamespace(const FileDescriptor& process, const FileDescriptor& own, const char* name) {
  struct stat its {};
  struct stat ours {};
  if (::fstatat(process.get(), name, &its, 0) != 0) throwErrno(name);
  if (::fstatat(own.get(), name, &ours, 0) != 0) throwErrno(std::string("our own ") + name);
  return its.st_dev == ours.st_dev && its.st_ino == ours.st_ino;
}

// What a Flatpak sandbox lays into its root, absent where it is not there.
std::optional<std::string> readMarker(const FileDescriptor& process) {
  const FileDescriptor root(::openat(process.get(), "root", O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!root.isOpen()) throwErrno("root");
  open_how how{};
  how.flags = O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;
  how.resolve = RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS | RESOLVE_BENEATH;
  const FileDescriptor marker(
      static_cast<int>(::syscall(SYS_openat2, root.get(), ".flatpak-info", &how, sizeof how)));
  if (!marker.isOpen()) {
    if (errno == ENOENT) return std::nullopt;
    throwErrno("the sandbox's marker");
  }
  auto text = base::readFile(marker, "the sandbox's marker", kMaximalMarkerSize);
  if (!text) throw Unclear{text.failure().message};
  return *std::move(text);
}

bool isFlatpakID(std::string_view id) {
  constexpr std::string_view kCharacters =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789._-";
  return id.size() <= kMaximalIDSize && id.find_first_not_of(kCharacters) == std::string_view::npos &&
         !id.empty() && id.front() != '.' && id.front() != '-';
}

// The application that the marker names. Strictly read, as readers differ in which of two lines counts.
std::string applicationOfMarker(const std::string& text) {
  const auto file = config::parseIni(text, "the sandbox's marker", config::IniFlavour::kSettings);
  if (!file) throw Unclear{file.failure().message};
  const config::IniSection* section = file->section("Application");
  const std::string* name = section != nullptr ? section->value("name") : nullptr;
  if (name == nullptr || !isFlatpakID(*name)) throw Unclear{"the sandbox's marker: names no application"};
  return *name;
}

SnapName snapOf(const FileDescriptor& process, const std::string& controlGroup) {
  // Neither file is there, or one cannot be read, where no security module is.
  auto label = readProcFile(process, "attr/apparmor/current", {ENOENT, EINVAL});
  if (!label) label = readProcFile(process, "attr/current", {ENOENT, EINVAL});
  // Programs can name their units as they like, but not their labels.
  return label ? snapOfLabel(*label) : snapOfControlGroup(controlGroup);
}

// The file name of the process's program.
std::string programOf(const FileDescriptor& process) {
  std::array<char, 4096> path;
  const ssize_t size = ::readlinkat(process.get(), "exe", path.data(), path.size());
  if (size < 0) throwErrno("exe");
  std::string_view name(path.data(), static_cast<std::size_t>(size));
  constexpr std::string_view kDeleted = " (deleted)";
  if (name.ends_with(kDeleted)) name.remove_suffix(kDeleted.size());
  return std::string(name.substr(name.rfind('/') + 1));
}

FileDescriptor openProcess(const std::string& path) {
  FileDescriptor process(::open(path.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!process.isOpen()) throwErrno(path);
  return process;
}

ProcessFacts inspectProcess(const FileDescriptor& process, const FileDescriptor& own, uid_t user) {
  const bool isInOurMounts = isSameNamespace(process, own, "ns/mnt");
  const bool isAmongOurUsers = isSameNamespace(process, own, "ns/user");
  const auto marker = readMarker(process);
  const auto controlGroup = managedControlGroup(*readProcFile(process, "cgroup", {}));
  const SnapName snap = snapOf(process, controlGroup.value_or(""));

  if (marker) {
    if (isInOurMounts) throw Unclear{"the sandbox's marker lies outside any sandbox"};
    if (snap.kind != SnapName::Kind::kNone) throw Unclear{"two kinds of sandbox claim it"};
    return {Confinement::kConfined, {applicationOfMarker(*marker)}, ""};
  }
  if (snap.kind == SnapName::Kind::kApplication) return {Confinement::kConfined, {snap.applicationID}, ""};
  if (snap.kind == SnapName::Kind::kOther) throw Unclear{"it belongs to a snap and is no application of it"};
  if (!isInOurMounts || !isAmongOurUsers)
    throw Unclear{"it runs in namespaces of its own, and in no sandbox that says which application it is"};
  if (programOf(process) == kProxy) throw Unclear{"it is a bus proxy, and stands for somebody else"};
  return {Confinement::kUnconfined, applicationsOfUnit(controlGroup.value_or(""), user), ""};
}

}  // namespace

ProcessInspector::ProcessInspector(std::string procDirectory, uid_t user)
    : procDirectory_(std::move(procDirectory)),
      user_(user) {
}

ProcessFacts ProcessInspector::inspect(pid_t pid) const {
  try {
    if (pid <= 0) throw Unclear{"the bus names no process of ours"};
    return inspectProcess(openProcess(procDirectory_ + "/" + std::to_string(pid)),
                          openProcess(procDirectory_ + "/self"),
                          user_);
  } catch (const Unclear& unclear) {
    return {Confinement::kUnknown, {}, unclear.reason};
  }
}

}  // namespace clients
