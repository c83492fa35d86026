// The applications that are installed for the user, from their desktop entries.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace clients {

constexpr std::size_t kMaximalIDSize = 255;  // of an application's ID, in bytes

struct InstalledApplication {
  std::string id;    // the desktop entry's ID, without ".desktop"
  std::string name;  // for display, in the user's language; the ID where the entry has none to show
  std::string icon;  // a name or a path; may be empty
  // Whether an entry of this ID, in whichever directory, was put there by Flatpak or snapd: then the
  // application runs in a sandbox, and no program outside of one is it.
  bool belongsToSandbox = false;
};

// An application that nothing is known of but its ID.
InstalledApplication namedByItsID(const std::string& id);

// Where desktop entries are looked for, best first, from the values of XDG_DATA_HOME, HOME and
// XDG_DATA_DIRS (empty where one is not set). Relative directories do not count.
std::vector<std::string> dataDirectories(const std::string& XDG_DATA_HOME,
                                         const std::string& HOME,
                                         const std::string& XDG_DATA_DIRS);

// A name as it is shown to the user: see base::displayName; `fallback` where nothing of it can be shown.
std::string shownName(std::string_view name, const std::string& fallback);

// Immutable; reads the files anew at every look-up, so that what is installed meanwhile is found. Called
// from any thread.
class InstalledApplications {
 public:
  // directories: see dataDirectories; entries are in their sub-directories "applications". languages: see
  // base::languageChain.
  InstalledApplications(std::vector<std::string> directories, std::vector<std::string> languages);

  // The application whose desktop entry has the ID: "a-b" is a-b.desktop or a/b.desktop in the first
  // directory that has either. Absent where there is none, where that first one is hidden, is no
  // application's or cannot be read, and where the ID itself could not be shown to the user as it is.
  std::optional<InstalledApplication> find(std::string_view id) const;

 private:
  const std::vector<std::string> directories_;
  const std::vector<std::string> languages_;
};

}  // namespace clients
