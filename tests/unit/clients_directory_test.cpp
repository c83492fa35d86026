#include <gtest/gtest.h>
#include <unistd.h>

#include "daemon/clients/Client.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using clients::Evidence;

class TheClientDirectory : public testing::Test {
 protected:
  TheClientDirectory() {
    files_.write("share/applications/org.example.App.desktop",
                 "[Desktop Entry]\nType=Application\nName=App\nIcon=app\n");
    files_.write("entitlements.d/app.conf", "[org.example.App]\nEntitlements=e;\n");
  }

  support::TemporaryDirectory files_;
  fakes::FakeLog log_;
  clients::InstalledApplications applications_{{files_.path("share")}, {}};
  config::Entitlements entitlements_{files_.path("entitlements.d"), {::getuid(), files_.path()}, log_};
  clients::ClientDirectory directory_{applications_, entitlements_, "Eine unbekannte Anwendung"};
};

TEST_F(TheClientDirectory, NamesAnInstalledClientByItsEntry) {
  const auto client = directory_.clientForID("org.example.App");
  EXPECT_EQ(client->bundleID(), "org.example.App");
  EXPECT_EQ(client->name(), "App");
  EXPECT_EQ(client->icon(), "app");
  EXPECT_EQ(client->description(), "org.example.App");
  EXPECT_EQ(client->evidence(), Evidence::kUnknown);
  EXPECT_TRUE(client->hasEntitlement("e"));
  EXPECT_FALSE(client->hasEntitlement("f"));
}

TEST_F(TheClientDirectory, HasNamesIsolatedInSentences) {
  EXPECT_EQ(directory_.clientForID("org.example.App")->localizedAppName(), "\u2068App\u2069");
  EXPECT_EQ(directory_.unknownClient()->localizedAppName(), "\u2068Eine unbekannte Anwendung\u2069");
}

TEST_F(TheClientDirectory, NamesAClientThatIsNotInstalledByItsID) {
  const auto client = directory_.clientForID("org.example.Gone");
  EXPECT_EQ(client->bundleID(), "org.example.Gone");
  EXPECT_EQ(client->name(), "org.example.Gone");
  EXPECT_EQ(client->icon(), "");
  EXPECT_FALSE(client->hasEntitlement("e"));
}

TEST_F(TheClientDirectory, NeverLeavesAClientWithoutAName) {
  EXPECT_EQ(directory_.clientForID("")->name(), "Eine unbekannte Anwendung");
  EXPECT_EQ(directory_.clientForID("")->bundleID(), "");
  EXPECT_EQ(directory_.clientForID("a\nb")->name(), "a b");
}

TEST_F(TheClientDirectory, KnowsAClientThatNothingIsKnownAbout) {
  files_.write("entitlements.d/unknown.conf", "[Eine unbekannte Anwendung]\nEntitlements=e\n");
  const auto client = directory_.unknownClient();
  EXPECT_EQ(client->bundleID(), std::nullopt);
  EXPECT_EQ(client->name(), "Eine unbekannte Anwendung");
  EXPECT_EQ(client->description(), "(no ID)");
  EXPECT_EQ(clients::evidenceText(client->evidence()), "unknown");
  EXPECT_FALSE(client->hasEntitlement("e"));
}

TEST_F(TheClientDirectory, KeepsTheNameThatAConnectionWasKnownBy) {
  const auto client =
      directory_.clientForIdentity({"org.example.App", "The old name", "old"}, Evidence::kRegistered);
  EXPECT_EQ(client->name(), "The old name");
  EXPECT_EQ(client->icon(), "old");
  EXPECT_EQ(clients::evidenceText(client->evidence()), "registered");
  EXPECT_TRUE(client->hasEntitlement("e"));
}

TEST_F(TheClientDirectory, GivesTheEntitlementsOfTheMoment) {
  const auto before = directory_.clientForID("org.example.App");
  files_.write("entitlements.d/app.conf", "[org.example.App]\nEntitlements=f;\n");
  EXPECT_TRUE(before->hasEntitlement("e"));
  EXPECT_TRUE(directory_.clientForID("org.example.App")->hasEntitlement("f"));
  EXPECT_FALSE(directory_.clientForID("org.example.App")->hasEntitlement("e"));
}

}  // namespace
