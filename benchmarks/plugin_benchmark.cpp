// The plug-in alone, over a host that answers at once: a held grant, a first request with every
// permission there is, and the sentence for the user.
#include <benchmark/benchmark.h>

#include <string>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "benchmarks/CountingHeap.h"
#include "benchmarks/InMemoryHost.h"
#include "daemon/plugins/StringTable.h"

// What the class lets its tests and benchmarks see.
struct TKFacebookAccountAccessPluginTestAccess {
  static RVPermissionSet everything(const TKFacebookAccountAccessPlugin& plugin) {
    RVPermissionSet all = plugin._allReadPermissions();
    all.insert(plugin._writePermissions().begin(), plugin._writePermissions().end());
    all.insert(plugin._managePermissions().begin(), plugin._managePermissions().end());
    return all;
  }
  static std::optional<std::string> message(const TKFacebookAccountAccessPlugin& plugin,
                                            const RVPermissionSet& permissions) {
    return plugin._constructUserMessageForPermissions(
        permissions, std::string(RVFacebookAudienceFriends), "Photos", nullptr);
  }
};

namespace {

struct Setting {
  Setting()
      : words(BUNDLE "/resources", {}, nothing.log()),
        plugin(nothing.with(words)) {}

  static RVDictionary options(const RVPermissionSet& permissions) {
    return {{std::string(RVFacebookAppIdKey), "1234567890"},
            {std::string(RVFacebookPermissionsKey), RVArray(permissions.begin(), permissions.end())},
            {std::string(RVFacebookAudienceKey), std::string(RVFacebookAudienceFriends)}};
  }

  bool request(const RVDictionary& options) {
    bool answer = false;
    plugin.handleAccessRequestToAccountsOfType(
        type, client, options, store, true, [&](bool granted, const auto&) { answer = granted; });
    return answer;
  }

  benchmarks::Services nothing;
  plugins::StringTable words;
  TKFacebookAccountAccessPlugin plugin;
  std::shared_ptr<const RVAccountType> type =
      std::make_shared<RVAccountType>(std::string(RVAccountTypeIdentifierFacebook));
  std::shared_ptr<const RVDClient> client = std::make_shared<benchmarks::Client>();
  std::shared_ptr<benchmarks::Store> store = std::make_shared<benchmarks::Store>();
};

// Runs the work once for each iteration and reports the allocations of one.
template <typename Work>
void measure(benchmark::State& state, const Work& work) {
  const std::size_t before = benchmarks::heapAllocations();
  for (auto _ : state) {
    if (!work()) state.SkipWithError("not granted");
  }
  state.counters["allocations"] = benchmark::Counter(
      static_cast<double>(benchmarks::heapAllocations() - before), benchmark::Counter::kAvgIterations);
}

void heldGrant(benchmark::State& state) {
  Setting setting;
  const RVDictionary options = Setting::options({"email", "user_photos"});
  setting.request(options);
  measure(state, [&] { return setting.request(options); });
}
BENCHMARK(heldGrant);

void firstRequestWithEveryPermission(benchmark::State& state) {
  Setting setting;
  const RVDictionary options =
      Setting::options(TKFacebookAccountAccessPluginTestAccess::everything(setting.plugin));
  measure(state, [&] {
    setting.store->forget();
    return setting.request(options);
  });
}
BENCHMARK(firstRequestWithEveryPermission);

void consentSentenceForEveryPermission(benchmark::State& state) {
  Setting setting;
  const RVPermissionSet everything = TKFacebookAccountAccessPluginTestAccess::everything(setting.plugin);
  measure(state, [&] {
    return TKFacebookAccountAccessPluginTestAccess::message(setting.plugin, everything).has_value();
  });
}
BENCHMARK(consentSentenceForEveryPermission);

}  // namespace

BENCHMARK_MAIN();
