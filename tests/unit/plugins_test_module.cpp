// Plug-in modules for tests of the loader: one for each way in which a module fits or does not.
#include <cstdlib>
#include <stdexcept>

#include "host/RVDAccountAccessPlugin.h"

namespace {

// Answers every operation with the text of the key "GREETING" in its own string table.
class TestPlugin final : public RVDAccountAccessPlugin {
 public:
  explicit TestPlugin(const RVDHostServices& services)
      : services_(services) {}

  void handleAccessRequestToAccountsOfType(std::shared_ptr<const RVAccountType>,
                                           std::shared_ptr<const RVDClient>,
                                           const RVDictionary&,
                                           std::shared_ptr<RVDAccountStore>,
                                           bool,
                                           RVDAccessCompletion completion) override {
    greet(completion);
  }
  void authorizeAccessToAccountsOfType(std::shared_ptr<const RVAccountType>,
                                       std::shared_ptr<const RVDClient>,
                                       std::shared_ptr<RVDAccountStore>,
                                       RVDAccessCompletion completion) override {
    greet(completion);
  }
  void revokeAccessToAccountsOfType(std::shared_ptr<const RVAccountType>,
                                    std::shared_ptr<const RVDClient>,
                                    std::shared_ptr<RVDAccountStore>,
                                    RVDAccessCompletion completion) override {
    greet(completion);
  }
  void revokeAllAccessToAccountsOfType(std::shared_ptr<const RVAccountType>,
                                       std::shared_ptr<RVDAccountStore>,
                                       RVDAccessCompletion completion) override {
    greet(completion);
  }

 private:
  void greet(const RVDAccessCompletion& completion) {
    const auto text = services_.stringTable->textForKey("GREETING", "", "Localizable");
    completion(true, RVError{*text, 0, {}});
  }
  RVDHostServices services_;
};

[[maybe_unused]] bool supports(const std::optional<std::string>& identifier) {
  return identifier == "org.example.type";
}

[[maybe_unused]] std::unique_ptr<RVDAccountAccessPlugin> initWorking(const RVDHostServices& services) {
  return std::make_unique<TestPlugin>(services);
}

[[maybe_unused]] std::unique_ptr<RVDAccountAccessPlugin> initNull(const RVDHostServices&) {
  return nullptr;
}

[[maybe_unused]] std::unique_ptr<RVDAccountAccessPlugin> initThrowing(const RVDHostServices&) {
  throw std::runtime_error("no luck");
}

[[maybe_unused]] bool abortingSupports(const std::optional<std::string>&) {
  std::abort();
}

[[maybe_unused]] std::unique_ptr<RVDAccountAccessPlugin> abortingInit(const RVDHostServices&) {
  std::abort();
}

}  // namespace

#ifndef TEST_MODULE_WITHOUT_ENTRY
extern "C" const RVDAccountAccessPluginEntry RVDAccountAccessPluginEntryPoint;
const RVDAccountAccessPluginEntry RVDAccountAccessPluginEntryPoint{TEST_MODULE_ENTRY};
#endif
