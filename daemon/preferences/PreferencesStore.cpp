#include "daemon/preferences/PreferencesStore.h"

#include <algorithm>
#include <array>
#include <utility>

#include "daemon/log/Log.h"
#include "daemon/state/ValueText.h"

namespace preferences {
namespace {

constexpr const char* kFileName = "preferences.json";
constexpr std::size_t kMaximalSize = 1024 * 1024;

bool isWordForTrue(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(), [](char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
  });
  constexpr std::array<std::string_view, 4> kWords = {"true", "yes", "on", "1"};
  return std::find(kWords.begin(), kWords.end(), text) != kWords.end();
}

// The application's preferences; empty where it has none.
RVDictionary preferencesOf(const RVDictionary& all, std::string_view applicationId) {
  const RVValue* application = RVValueForKey(all, applicationId);
  return application != nullptr && application->dictionary() != nullptr ? *application->dictionary()
                                                                        : RVDictionary();
}

}  // namespace

PreferencesStore::PreferencesStore(const state::Directory& directory, RVLogService& log)
    : directory_(directory),
      log_(log) {
}

base::Result<RVDictionary> PreferencesStore::load() {
  const auto text = directory_.readFile(kFileName, kMaximalSize);
  if (!text) return text.failure();
  if (!*text) return RVDictionary();
  const auto value = state::valueFromText(**text);
  if (value && value->dictionary() != nullptr) return *value->dictionary();
  const auto aside = directory_.setAside(kFileName);
  if (!aside) return aside.failure();
  logging::error(log_,
                 "%@ is damaged. It was set aside as %@; no preference is set any more.",
                 {RVValue(kFileName), RVValue(*aside)});
  return RVDictionary();
}

base::Result<std::optional<RVValue>> PreferencesStore::get(std::string_view applicationId,
                                                           std::string_view key) {
  const std::lock_guard lock(mutex_);
  return read(applicationId, key);
}

base::Result<std::optional<RVValue>> PreferencesStore::read(std::string_view applicationId,
                                                            std::string_view key) {
  const auto all = load();
  if (!all) return all.failure();
  const RVDictionary application = preferencesOf(*all, applicationId);
  const RVValue* value = RVValueForKey(application, key);
  return value != nullptr ? std::optional(*value) : std::nullopt;
}

std::optional<RVValue> PreferencesStore::ZQPreferencesCopyValue(std::string_view key,
                                                                std::string_view applicationID,
                                                                ZQPreferencesUser /*userName*/,
                                                                ZQPreferencesHost /*hostName*/) {
  const std::lock_guard lock(mutex_);
  Cached& cached = cache_[std::string(applicationID)];
  const auto found = cached.find(key);
  if (found != cached.end()) return found->second;
  auto value = read(applicationID, key);
  if (!value) {
    logging::error(log_, "The preferences cannot be read: %@", {RVValue(value.failure().message)});
    return std::nullopt;
  }
  return cached.insert_or_assign(std::string(key), *std::move(value)).first->second;
}

bool PreferencesStore::ZQPreferencesAppSynchronize(std::string_view applicationID) {
  const std::lock_guard lock(mutex_);
  if (const auto cached = cache_.find(applicationID); cached != cache_.end()) cache_.erase(cached);
  return true;
}

bool PreferencesStore::booleanValue(const RVValue& value) const {
  if (value.boolean() != nullptr) return *value.boolean();
  if (value.integer() != nullptr) return *value.integer() != 0;
  if (value.real() != nullptr) return *value.real() != 0;
  return value.string() != nullptr && isWordForTrue(*value.string());
}

base::Result<void> PreferencesStore::change(std::string_view applicationId,
                                            const std::function<void(RVDictionary&)>& edit) {
  const std::lock_guard lock(mutex_);
  auto all = load();
  if (!all) return all.failure();
  RVDictionary application = preferencesOf(*all, applicationId);
  edit(application);
  all->insert_or_assign(std::string(applicationId), RVValue(std::move(application)));
  const std::string text = state::textFromValue(*all);
  if (text.size() > kMaximalSize)
    return base::Failure{base::FailureKind::kInvalid,
                         "the preferences would be larger than " + std::to_string(kMaximalSize) + " bytes"};
  return directory_.replaceFile(kFileName, text);
}

base::Result<void> PreferencesStore::set(std::string_view applicationId,
                                         std::string_view key,
                                         const RVValue& value) {
  return change(applicationId,
                [&](RVDictionary& application) { application.insert_or_assign(std::string(key), value); });
}

base::Result<void> PreferencesStore::reset(std::string_view applicationId, std::string_view key) {
  return change(applicationId, [&](RVDictionary& application) {
    if (const auto found = application.find(key); found != application.end()) application.erase(found);
  });
}

}  // namespace preferences
