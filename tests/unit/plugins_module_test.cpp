#include <gtest/gtest.h>

#include "daemon/plugins/PluginModule.h"
#include "daemon/plugins/StringTable.h"
#include "tests/fakes/FakeHost.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/MessageCatalogues.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using plugins::loadPlugins;
using plugins::PluginModule;

class APluginDirectory : public testing::Test {
 protected:
  APluginDirectory() {
    services_.log = &log_;
    services_.stringTable = &hostsTable_;
  }
  std::string faultOf(const std::string& name) {
    const auto module = PluginModule::load(kTestModules + name, services_, {});
    if (module) return "none";
    const std::string path = kTestModules + name + "/" + name + ".so: ";
    const std::string& message = module.failure().message;
    return message.starts_with(path) ? message.substr(path.size()) : "another file: " + message;
  }

  const std::string kTestModules = TEST_MODULES "/";
  fakes::FakeLog log_;
  fakes::FakeStringTable hostsTable_;
  RVDHostServices services_;
};

TEST_F(APluginDirectory, LoadsWhatFitsAndLeavesTheRestOutWithALineEach) {
  const auto modules = loadPlugins(TEST_MODULES, services_, {});
  ASSERT_EQ(modules.size(), 1u);
  EXPECT_EQ(modules[0]->className(), "WorkingPlugin");
  EXPECT_TRUE(modules[0]->supportsAccountType("org.example.type"));
  EXPECT_FALSE(modules[0]->supportsAccountType("org.example.other"));
  EXPECT_FALSE(modules[0]->supportsAccountType(std::nullopt));
  int refusals = 0;
  for (const auto& line : log_.lines()) refusals += line.level == kRVLogLevelError ? 1 : 0;
  EXPECT_EQ(refusals, 6);
}

TEST_F(APluginDirectory, SaysWhichVersionAModuleHasAndCallsNothingOfIt) {
  EXPECT_EQ(faultOf("OtherVersion"),
            "has ABI version 99, the daemon has " + std::to_string(kRVDAccountAccessPluginABIVersion));
}

TEST_F(APluginDirectory, SaysWhyAModuleIsLeftOut) {
  EXPECT_EQ(faultOf("NullInit"), "could not be set up");
  EXPECT_EQ(faultOf("ThrowingInit"), "could not be set up: no luck");
  EXPECT_EQ(faultOf("Incomplete"), "its entry point is incomplete");
  EXPECT_TRUE(faultOf("WithoutEntry").starts_with("is no plug-in: "));
  EXPECT_TRUE(faultOf("NoModule").starts_with("cannot be loaded: "));
  EXPECT_TRUE(faultOf("NotThere").starts_with("cannot be loaded: "));
}

TEST_F(APluginDirectory, GivesEachPluginTheStringTableOfItsOwnBundle) {
  hostsTable_.put("GREETING", "the host's");
  for (const auto& [language, greeting] : {std::pair("de", "Guten Tag"), std::pair("fr", "Hello")}) {
    const auto module = PluginModule::load(kTestModules + "Working", services_, {language});
    ASSERT_TRUE(module) << module.failure().message;
    std::string text;
    (*module)->plugin().revokeAllAccessToAccountsOfType(
        nullptr, nullptr, [&text](bool, const std::optional<RVError>& error) { text = error->domain; });
    EXPECT_EQ(text, greeting);
  }
  EXPECT_EQ(services_.stringTable, &hostsTable_);
}

TEST_F(APluginDirectory, GivesAnotherObjectOfAModuleServicesAndWordsOfItsOwn) {
  const auto module = PluginModule::load(kTestModules + "Working", services_, {"fr"});
  ASSERT_TRUE(module) << module.failure().message;
  fakes::FakeLog log;
  RVDHostServices services = services_;
  services.log = &log;
  const auto another = (*module)->another(services, {"de_AT", "de"});
  ASSERT_TRUE(another) << another.failure().message;
  const auto greetingOf = [](const PluginModule& of) {
    std::string text;
    of.plugin().revokeAllAccessToAccountsOfType(
        nullptr, nullptr, [&text](bool, const std::optional<RVError>& error) { text = error->domain; });
    return text;
  };
  EXPECT_EQ(greetingOf(**another), "Guten Tag");
  EXPECT_EQ(greetingOf(**module), "Hello");
  EXPECT_TRUE((*another)->stringTable().hasLanguage("de"));
  EXPECT_TRUE((*another)->stringTable().hasLanguage("en"));
  EXPECT_FALSE((*another)->stringTable().hasLanguage("de_AT"));
  EXPECT_FALSE((*module)->stringTable().hasLanguage("de"));
}

TEST_F(APluginDirectory, IsNamedByAnAbsolutePath) {
  EXPECT_TRUE(loadPlugins("plugins", services_, {}).empty());
  EXPECT_EQ(log_.texts(), std::vector<std::string>{"No plug-in is loaded: plugins is no absolute path."});
}

TEST_F(APluginDirectory, ThatIsNotThereHasNoPlugins) {
  const support::TemporaryDirectory directory;
  EXPECT_TRUE(loadPlugins(directory.path(), services_, {}).empty());
  EXPECT_TRUE(log_.lines().empty());
  EXPECT_TRUE(loadPlugins(directory.path("none"), services_, {}).empty());
  EXPECT_EQ(log_.lines().size(), 1u);
}

TEST(TheFacebookBundle, IsLoadedWithItsPluginAndItsWords) {
  fakes::FakeHost host;
  const auto modules = loadPlugins(BUILT_PLUGINS, host.services(), {});
  ASSERT_EQ(modules.size(), 1u);
  EXPECT_EQ(modules[0]->className(), "TKFacebookAccountAccessPlugin");
  EXPECT_TRUE(modules[0]->supportsAccountType(std::string(RVAccountTypeIdentifierFacebook)));
  fakes::FakeLog log;
  plugins::StringTable table(BUILT_PLUGINS "/TKFacebookAccountAccessPlugin/resources", {}, log);
  EXPECT_NE(table.textForKey("ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT", "", "Localizable"),
            "ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT");
  EXPECT_TRUE(log.lines().empty());
}

}  // namespace
