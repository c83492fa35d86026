#include "daemon/config/Settings.h"

#include <charconv>
#include <cstdint>
#include <string_view>

#include "base/File.h"
#include "daemon/config/IniFile.h"

namespace config {
namespace {

using base::Failure;
using base::FailureKind;

constexpr std::size_t kMaximalFileSize = 64 * 1024;

// What is wrong with a value; nothing where it was taken into the settings.
using Fault = std::optional<std::string>;

Fault readNumber(const std::string& value, std::size_t least, std::size_t most, std::size_t& number) {
  std::size_t read = 0;
  const char* end = value.data() + value.size();
  const auto result = std::from_chars(value.data(), end, read);
  if (result.ec != std::errc() || result.ptr != end || read < least || read > most)
    return "must be a whole number from " + std::to_string(least) + " to " + std::to_string(most);
  number = read;
  return std::nullopt;
}

Fault readURL(const std::string& value, const URLCheck& checkURL, Settings& settings) {
  if (const auto problem = checkURL(value)) return "the server URL " + *problem;
  settings.serverURL = value;
  return std::nullopt;
}

Fault readTimeout(const std::string& value, Settings& settings) {
  std::size_t seconds = 0;
  if (const Fault fault = readNumber(value, 1, 3600, seconds)) return fault;
  settings.transferTimeout = std::chrono::seconds(seconds);
  return std::nullopt;
}

Fault readCAFile(const std::string& value, Settings& settings) {
  if (!value.starts_with('/')) return "must be an absolute path";
  settings.caFile = value;
  return std::nullopt;
}

Fault readStore(const std::string& value, Settings& settings) {
  if (value != "sealed" && value != "secret-service") return "must be \"sealed\" or \"secret-service\"";
  settings.credentialStore = value == "sealed" ? CredentialStore::kSealed : CredentialStore::kSecretService;
  return std::nullopt;
}

struct Key {
  std::string_view section;
  std::string_view name;
  std::function<Fault(const std::string& value, Settings& settings)> read;
};

Key number(std::string_view section,
           std::string_view name,
           std::size_t least,
           std::size_t most,
           std::size_t Settings::*number) {
  return {section, name, [least, most, number](const std::string& value, Settings& settings) {
            return readNumber(value, least, most, settings.*number);
          }};
}

Key limit(std::string_view name, std::size_t least, std::size_t most, std::size_t Settings::*limit) {
  return number("Limits", name, least, most, limit);
}

std::vector<Key> knownKeys(const URLCheck& checkURL) {
  return {
      {"Server",
       "URL",
       [checkURL](const std::string& value, Settings& settings) {
         return readURL(value, checkURL, settings);
       }},
      {"Server", "TimeoutSeconds", readTimeout},
      {"Server", "CAFile", readCAFile},
      {"Credentials", "Store", readStore},
      number("AccessLog", "KeepDays", 1, 36500, &Settings::accessLogDays),
      limit("WaitingRequestsPerClient", 1, 4096, &Settings::waitingRequestsPerClient),
      limit("WaitingRequests", 1, 4096, &Settings::waitingRequests),
      limit("CallsPerSecond", 1, 1'000'000, &Settings::callsPerSecond),
      // The bus itself carries no message of more than 128 MiB.
      limit("MessageBytes", 1024, std::size_t{128} * 1024 * 1024, &Settings::messageBytes),
      limit("PermissionsPerRequest", 1, 65536, &Settings::permissionsPerRequest),
      limit("NameBytes", 1, 65536, &Settings::nameBytes),
  };
}

const Key* findKey(const std::vector<Key>& keys, std::string_view section, std::string_view name) {
  for (const Key& key : keys)
    if (key.section == section && (name.empty() || key.name == name)) return &key;
  return nullptr;
}

Failure failureAt(const std::string& path, int line, const std::string& what) {
  return {FailureKind::kInvalid, path + ":" + std::to_string(line) + ": " + what};
}

base::Result<void> takeFile(const std::string& path,
                            const IniFile& file,
                            const std::vector<Key>& keys,
                            Settings& settings) {
  for (const IniSection& section : file.sections) {
    if (findKey(keys, section.name, "") == nullptr)
      return failureAt(path, section.line, "section [" + section.name + "] is not known");
    for (const IniEntry& entry : section.entries) {
      const std::string where = "key \"" + entry.key + "\" of section [" + section.name + "] ";
      const Key* key = findKey(keys, section.name, entry.key);
      if (key == nullptr) return failureAt(path, entry.line, where + "is not known");
      if (const Fault fault = key->read(entry.value, settings))
        return failureAt(path, entry.line, where + "cannot be used: " + *fault);
    }
  }
  return {};
}

}  // namespace

base::Result<Settings> readSettings(const std::vector<std::string>& paths,
                                    bool mustExist,
                                    const URLCheck& checkURL) {
  const std::vector<Key> keys = knownKeys(checkURL);
  Settings settings;
  for (const std::string& path : paths) {
    const auto text = base::readFile(path, kMaximalFileSize);
    if (!text && text.failure().kind == FailureKind::kNotFound && !mustExist) continue;
    if (!text) return text.failure();
    const auto file = parseIni(*text, path, IniFlavour::kSettings);
    if (!file) return file.failure();
    if (const auto taken = takeFile(path, *file, keys, settings); !taken) return taken.failure();
  }
  return settings;
}

}  // namespace config
