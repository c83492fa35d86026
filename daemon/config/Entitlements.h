// What the device's policy gives to which client.
#pragma once

#include <sys/types.h>

#include <map>
#include <mutex>
#include <set>
#include <string>
#include <string_view>

#include "base/File.h"
#include "host/RVLog.h"

namespace config {

// Whom a policy file is believed from. The file, its directory and every directory above, up to and with
// `top`, must belong to `owner`, be writable by nobody else, and be no symbolic link.
struct PolicyTrust {
  uid_t owner = 0;
  std::string top = "/";
};

// The entitlements of all "*.conf" files of a directory, one section a client ID:
//
//   [org.example.PhotoApp]
//   Entitlements=com.zentor.accounts.facebook.default-access;
//
// A file that is not to be believed, or that does not parse, is left out whole, with one line in the log;
// the other files stand. A directory that is not there gives nothing to anybody. What changes is read anew
// before the next answer. Thread-safe.
class Entitlements {
 public:
  using Names = std::set<std::string, std::less<>>;

  // Reads the files. directory: an absolute path at or below trust.top. The log must outlive the object.
  Entitlements(std::string directory, PolicyTrust trust, RVLogService& log);

  // Empty for a client that no file names. All of one answer comes from one reading of the files.
  Names entitlementsOfClient(std::string_view clientID) const;

 private:
  using ByClient = std::map<std::string, Names, std::less<>>;
  bool hasChanged() const;
  base::FileDescriptor watch() const;
  ByClient read() const;

  const std::string directory_;
  const PolicyTrust trust_;
  RVLogService& log_;
  mutable std::mutex mutex_;  // protects everything below
  // Tells of changes to the directory and those above it; closed where the system tells nobody, so that the
  // files are read each time.
  mutable base::FileDescriptor changes_;
  mutable ByClient byClient_;
};

}  // namespace config
