#include "daemon/bus/RequestOptions.h"

#include <sdbus-c++/sdbus-c++.h>

#include "daemon/bus/Names.h"
#include "host/Constants.h"

namespace bus {
namespace {

// A name's bytes; of something that is no name, as many as it has parts and bytes of text, since it may
// be remembered all the same.
std::size_t bytesOf(const RVValue& value) {
  if (value.string() != nullptr) return value.string()->size();
  std::size_t bytes = 1;
  if (value.array() != nullptr)
    for (const RVValue& element : *value.array()) bytes += bytesOf(element);
  if (value.dictionary() != nullptr)
    for (const auto& [key, element] : *value.dictionary()) bytes += key.size() + bytesOf(element);
  return bytes;
}

void checkSizes(const RVDictionary& options, const config::Settings& settings) {
  const auto checkName = [&](const RVValue& value) {
    if (bytesOf(value) > settings.nameBytes)
      throw sdbus::Error(kLimitsExceeded, "A name in the options is too long");
  };
  for (const auto& [key, value] : options) {
    if (key != RVFacebookPermissionsKey) {
      checkName(value);
    } else if (const RVArray* permissions = value.array()) {
      if (permissions->size() > settings.permissionsPerRequest)
        throw sdbus::Error(kLimitsExceeded, "There are too many permissions");
      for (const RVValue& permission : *permissions) checkName(permission);
    }
  }
}

}  // namespace

RVDictionary readRequestOptions(sdbus::Message& message,
                                SizeLimit& limit,
                                const config::Settings& settings,
                                const std::set<std::string_view>& others) {
  std::set<std::string_view> keys{RVFacebookAppIdKey, RVFacebookPermissionsKey, RVFacebookAudienceKey};
  keys.insert(others.begin(), others.end());
  RVDictionary options = readOptions(message, limit, keys);
  checkSizes(options, settings);
  return options;
}

}  // namespace bus
