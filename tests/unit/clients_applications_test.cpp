#include <gtest/gtest.h>

#include <filesystem>

#include "daemon/clients/InstalledApplications.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using clients::InstalledApplication;
using clients::InstalledApplications;

std::string entry(const std::string& name, const std::string& more = "") {
  return "[Desktop Entry]\nType=Application\nName=" + name + "\n" + more;
}

class TheInstalledApplications : public testing::Test {
 protected:
  std::optional<InstalledApplication> find(std::string_view id) {
    return InstalledApplications({directory_.path("home"), directory_.path("system")}, languages_).find(id);
  }
  std::string nameOf(std::string_view id) {
    const auto application = find(id);
    return application ? application->name : "not installed";
  }
  void install(const std::string& file, const std::string& content) {
    directory_.write("system/applications/" + file, content);
  }
  void installAtHome(const std::string& file, const std::string& content) {
    directory_.write("home/applications/" + file, content);
  }

  support::TemporaryDirectory directory_;
  std::vector<std::string> languages_;
};

TEST_F(TheInstalledApplications, AreFoundByTheIDsOfTheirEntries) {
  install("org.example.Photos.desktop", entry("Photos", "Icon=photos\n"));
  const auto application = find("org.example.Photos");
  ASSERT_TRUE(application);
  EXPECT_EQ(application->id, "org.example.Photos");
  EXPECT_EQ(application->name, "Photos");
  EXPECT_EQ(application->icon, "photos");
  EXPECT_FALSE(find("org.example.photos"));
  EXPECT_FALSE(find("org.example.Photos.desktop"));
  EXPECT_FALSE(find(""));
}

TEST_F(TheInstalledApplications, OfSubdirectoriesHaveDashesInTheirIDs) {
  install("kde/org-x/app-one.desktop", entry("One"));
  install("kde/two.desktop", entry("Two"));
  EXPECT_EQ(nameOf("kde-org-x-app-one"), "One");
  EXPECT_EQ(nameOf("kde-two"), "Two");
  EXPECT_EQ(nameOf("two"), "not installed");
  EXPECT_EQ(nameOf("kde/two"), "not installed");
  EXPECT_EQ(nameOf("kde-"), "not installed");
  EXPECT_EQ(nameOf("-two"), "not installed");
}

TEST_F(TheInstalledApplications, AreNotLookedForOutsideTheirDirectories) {
  directory_.write("system/outside.desktop", entry("Outside"));
  directory_.write("system/applications/sub/inside.desktop", entry("Inside"));
  for (const char* id : {"..-outside", "../outside", "sub-..-..-outside", "sub-.-inside", ".-sub-inside"})
    EXPECT_FALSE(find(id)) << id;
}

TEST_F(TheInstalledApplications, AreTheUsersOwnBeforeTheSystems) {
  install("app.desktop", entry("The system's"));
  EXPECT_EQ(nameOf("app"), "The system's");
  installAtHome("app.desktop", entry("The user's"));
  EXPECT_EQ(nameOf("app"), "The user's");
}

TEST_F(TheInstalledApplications, DoNotCountAHiddenEntryEvenWhereALaterDirectoryHasIt) {
  install("app.desktop", entry("App"));
  installAtHome("app.desktop", entry("App", "Hidden=true\n"));
  EXPECT_FALSE(find("app"));
}

TEST_F(TheInstalledApplications, CountOneThatIsNotShownInMenus) {
  install("app.desktop", entry("App", "NoDisplay=true\nHidden=false\n"));
  EXPECT_EQ(nameOf("app"), "App");
}

TEST_F(TheInstalledApplications, AreApplicationsAlone) {
  install("link.desktop", "[Desktop Entry]\nType=Link\nName=Link\n");
  install("none.desktop", "[Desktop Entry]\nName=None\n");
  install("other.desktop", "[Other]\nType=Application\nName=Other\n");
  install("empty.desktop", "");
  install("large.desktop", entry("Large", std::string(600 * 1024, '#')));
  std::filesystem::create_directories(directory_.path("system/applications/dir.desktop"));
  std::filesystem::create_symlink("/dev/zero", directory_.path("system/applications/zero.desktop"));
  for (const char* id : {"link", "none", "other", "empty", "large", "dir", "zero"})
    EXPECT_FALSE(find(id)) << id;
}

TEST_F(TheInstalledApplications, HaveTheirNamesInTheUsersLanguage) {
  install("app.desktop", entry("Photos", "Name[de]=Fotos\nIcon=a\nIcon[de]=b\n[Desktop Action x]\nName=X\n"));
  EXPECT_EQ(nameOf("app"), "Photos");
  languages_ = {"de_AT", "de"};
  EXPECT_EQ(nameOf("app"), "Fotos");
  EXPECT_EQ(find("app")->icon, "b");
}

TEST_F(TheInstalledApplications, HaveTheirIDsForNamesThatCannotBeShown) {
  install("unnamed.desktop", "[Desktop Entry]\nType=Application\n");
  install("blank.desktop", entry("\u200b\u3164 "));
  EXPECT_EQ(nameOf("unnamed"), "unnamed");
  EXPECT_EQ(nameOf("blank"), "blank");
}

TEST_F(TheInstalledApplications, HaveNoIDThatCouldPassForAnother) {
  for (const char* id : {"app\u200b",
                         "app\n",
                         " app",
                         "a\u202e"
                         "pp",
                         "\xff"}) {
    directory_.write("system/applications/" + std::string(id) + ".desktop", entry("App"));
    EXPECT_FALSE(find(id)) << id;
  }
  const std::string longID(250, 'x');
  EXPECT_FALSE(find(longID));
  EXPECT_FALSE(find(longID + "-" + longID));
}

TEST_F(TheInstalledApplications, AreLookedForInLinkedDirectoriesWithoutGoingRoundForEver) {
  std::filesystem::create_directories(directory_.path("system/applications"));
  std::filesystem::create_directory_symlink(".", directory_.path("system/applications/a"));
  std::filesystem::create_directory_symlink(".", directory_.path("system/applications/a-a"));
  std::string id;
  for (int i = 0; i < 120; ++i) id += "a-";
  EXPECT_FALSE(find(id + "b"));
  install("b.desktop", entry("B"));
  EXPECT_EQ(nameOf("a-a-b"), "B");
}

TEST_F(TheInstalledApplications, BelongToASandboxWhereAnyEntryOfTheirIDSaysSo) {
  install("app.desktop", entry("App"));
  EXPECT_FALSE(find("app")->belongsToSandbox);
  installAtHome("app.desktop", entry("The user's"));
  for (const char* key : {"X-Flatpak=app\n", "X-SnapInstanceName=app\n"}) {
    install("app.desktop", entry("App", key));
    EXPECT_TRUE(find("app")->belongsToSandbox) << key;
    EXPECT_EQ(nameOf("app"), "The user's");
  }
  install("app.desktop", entry("App", "[Desktop Action x]\nX-Flatpak=app\n"));
  EXPECT_FALSE(find("app")->belongsToSandbox);
}

TEST_F(TheInstalledApplications, BelongToASandboxWhereOneInstallsItsOwn) {
  for (const char* place : {"lib/flatpak/exports/share", "lib/snapd/desktop"}) {
    directory_.write(std::string(place) + "/applications/app.desktop", entry("App"));
    for (const char* slash : {"", "/"}) {
      const auto found = InstalledApplications({directory_.path(place) + slash}, {}).find("app");
      ASSERT_TRUE(found);
      EXPECT_TRUE(found->belongsToSandbox) << place;
    }
  }
}

TEST(TheDataDirectories, AreTheUsersOwnAndThenTheSystems) {
  using Directories = std::vector<std::string>;
  EXPECT_EQ(clients::dataDirectories("", "/home/u", ""),
            (Directories{"/home/u/.local/share", "/usr/local/share", "/usr/share"}));
  EXPECT_EQ(clients::dataDirectories("/data", "/home/u", "/a:relative::/b"),
            (Directories{"/data", "/a", "/b"}));
  EXPECT_EQ(clients::dataDirectories("relative", "", "/a"), (Directories{"/a"}));
}

}  // namespace
