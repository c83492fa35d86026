// Preferences, kept in one file.
#pragma once

#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "base/Result.h"
#include "daemon/state/Directory.h"
#include "host/RVLog.h"
#include "host/ZQPreferences.h"

namespace preferences {

// `preferences.json` in the state directory. What a plug-in reads is kept until it synchronises the
// application; get, set and reset work on the file itself. A damaged file is set aside, with an error in the
// log, and counts as empty. Thread-safe.
class PreferencesStore : public ZQPreferences {
 public:
  // The directory and the log outlive the store.
  PreferencesStore(const state::Directory& directory, RVLogService& log);

  std::optional<RVValue> ZQPreferencesCopyValue(std::string_view key,
                                                std::string_view applicationID,
                                                ZQPreferencesUser userName,
                                                ZQPreferencesHost hostName) override;
  bool ZQPreferencesAppSynchronize(std::string_view applicationID) override;
  bool booleanValue(const RVValue& value) const override;

  // The stored value; absent where there is none.
  base::Result<std::optional<RVValue>> get(std::string_view applicationId, std::string_view key);
  // Durable when it returns.
  base::Result<void> set(std::string_view applicationId, std::string_view key, const RVValue& value);
  // Durable when it returns; nothing stored is a success.
  base::Result<void> reset(std::string_view applicationId, std::string_view key);

 private:
  using Cached = std::map<std::string, std::optional<RVValue>, std::less<>>;

  base::Result<RVDictionary> load();
  base::Result<std::optional<RVValue>> read(std::string_view applicationId, std::string_view key);
  base::Result<void> change(std::string_view applicationId,
                            const std::function<void(RVDictionary& application)>& edit);

  const state::Directory& directory_;
  RVLogService& log_;
  std::mutex mutex_;
  std::map<std::string, Cached, std::less<>> cache_;  // by application; guarded by mutex_
};

}  // namespace preferences
