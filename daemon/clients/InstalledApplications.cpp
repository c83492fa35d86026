#include "daemon/clients/InstalledApplications.h"

#include <sys/stat.h>

#include <algorithm>
#include <utility>

#include "base/File.h"
#include "base/Text.h"
#include "daemon/config/IniFile.h"

namespace clients {
namespace {

constexpr std::size_t kMaximalEntrySize = 512 * 1024;
constexpr std::size_t kMaximalNameLength = 64;  // grapheme clusters
constexpr int kMaximalProbes = 64;              // directories looked into for one ID
constexpr std::string_view kSection = "Desktop Entry";

bool isThere(const std::string& path) {
  struct stat status {};
  return ::lstat(path.c_str(), &status) == 0;
}

bool isDirectory(const std::string& path) {
  struct stat status {};
  return ::stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

// The file of the entry with this ID at or below the directory; empty where there is none. Each dash of the
// ID may stand for the end of a sub-directory's name; `probes` bounds how many of them are tried, since
// sub-directories that link to each other make their number grow without end.
std::string entryFile(const std::string& directory, std::string_view id, int& probes) {
  const std::string file = directory + "/" + std::string(id) + ".desktop";
  if (isThere(file)) return file;
  for (std::size_t dash = id.find('-'); dash != std::string_view::npos; dash = id.find('-', dash + 1)) {
    if (dash == 0 || id.front() == '.' || dash + 1 == id.size()) continue;
    const std::string below = directory + "/" + std::string(id.substr(0, dash));
    if (!isDirectory(below) || --probes < 0) continue;
    const std::string found = entryFile(below, id.substr(dash + 1), probes);
    if (!found.empty()) return found;
  }
  return {};
}

// An ID is shown to the user beside the name and tells applications apart, so it must look like what it is.
bool isShownAsItIs(std::string_view id) {
  return !id.empty() && id.size() <= kMaximalIDSize && id.find('/') == std::string_view::npos &&
         base::displayName(id, kMaximalIDSize) == id;
}

// Whether the data directory is one into which Flatpak or snapd puts the entries of its applications.
bool isOfSandboxes(const std::string& directory) {
  std::string_view path = directory;
  while (path.ends_with('/')) path.remove_suffix(1);
  return path.ends_with("/flatpak/exports/share") || path.ends_with("/snapd/desktop");
}

// Whether the entry is one that Flatpak or snapd wrote.
bool isOfSandbox(const config::IniSection& entry) {
  return entry.value("X-Flatpak") != nullptr || entry.value("X-SnapInstanceName") != nullptr;
}

std::optional<config::IniSection> readEntry(const std::string& path) {
  const auto text = base::readFile(path, kMaximalEntrySize);
  if (!text) return std::nullopt;
  const auto file = config::parseIni(*text, path, config::IniFlavour::kDesktopEntry);
  const config::IniSection* entry = file ? file->section(kSection) : nullptr;
  return entry != nullptr ? std::optional(*entry) : std::nullopt;
}

bool isTrue(const std::string* value) {
  return value != nullptr && *value == "true";
}

}  // namespace

std::vector<std::string> dataDirectories(const std::string& XDG_DATA_HOME,
                                         const std::string& HOME,
                                         const std::string& XDG_DATA_DIRS) {
  std::vector<std::string> directories;
  const auto append = [&directories](const std::string& directory) {
    if (directory.starts_with('/')) directories.push_back(directory);
  };
  if (XDG_DATA_HOME.starts_with('/'))
    append(XDG_DATA_HOME);
  else if (!HOME.empty())
    append(HOME + "/.local/share");
  std::string_view list =
      XDG_DATA_DIRS.empty() ? "/usr/local/share:/usr/share" : std::string_view(XDG_DATA_DIRS);
  while (!list.empty()) {
    const std::size_t colon = std::min(list.find(':'), list.size());
    append(std::string(list.substr(0, colon)));
    list.remove_prefix(std::min(colon + 1, list.size()));
  }
  return directories;
}

std::string shownName(std::string_view name, const std::string& fallback) {
  std::string shown = base::displayName(name, kMaximalNameLength);
  return shown.empty() ? fallback : shown;
}

InstalledApplications::InstalledApplications(std::vector<std::string> directories,
                                             std::vector<std::string> languages)
    : directories_(std::move(directories)),
      languages_(std::move(languages)) {
}

InstalledApplication namedByItsID(const std::string& id) {
  return {id, shownName(id, ""), "", false};
}

std::optional<InstalledApplication> InstalledApplications::find(std::string_view id) const {
  if (!isShownAsItIs(id)) return std::nullopt;
  bool isThere = false;
  bool belongsToSandbox = false;
  std::optional<config::IniSection> entry;  // the best directory's
  for (const std::string& directory : directories_) {
    int probes = kMaximalProbes;
    const std::string path = entryFile(directory + "/applications", id, probes);
    if (path.empty()) continue;
    auto found = readEntry(path);
    if (isOfSandboxes(directory) || (found && isOfSandbox(*found))) belongsToSandbox = true;
    if (!std::exchange(isThere, true)) entry = std::move(found);
  }
  if (!entry || isTrue(entry->value("Hidden"))) return std::nullopt;
  const std::string* type = entry->value("Type");
  if (type == nullptr || *type != "Application") return std::nullopt;
  const std::string* name = entry->value("Name", languages_);
  const std::string* icon = entry->value("Icon", languages_);
  InstalledApplication application = namedByItsID(std::string(id));
  if (name != nullptr) application.name = shownName(*name, application.name);
  if (icon != nullptr && base::isUTF8(*icon)) application.icon = *icon;
  application.belongsToSandbox = belongsToSandbox;
  return application;
}

}  // namespace clients
