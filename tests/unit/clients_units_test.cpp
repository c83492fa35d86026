#include <gtest/gtest.h>

#include "daemon/clients/UnitNames.h"

namespace {

using clients::SnapName;
using IDs = std::vector<std::string>;

constexpr const char* kUUID = "b1e9ec07-e2a0-4a3f-8f2c-0a4a5cd3f3f2";

IDs idsOf(const std::string& unit) {
  return clients::applicationsOfUnit("/user.slice/user-1000.slice/user@1000.service/app.slice/" + unit, 1000);
}

TEST(AUnit, OfAScopeNamesItsApplicationBeforeSomethingRandom) {
  EXPECT_EQ(idsOf("app-org.example.Photos-12.scope"), IDs{"org.example.Photos"});
  EXPECT_EQ(idsOf("app-gnome-org.example.Photos-12.scope"), IDs{"org.example.Photos"});
  EXPECT_EQ(idsOf("app-flatpak-org.example.Photos-12.scope"), IDs{"org.example.Photos"});
}

TEST(AUnit, OfAServiceMayHaveSomethingRandomOrNot) {
  EXPECT_EQ(idsOf("app-org.example.Photos.service"), IDs{"org.example.Photos"});
  EXPECT_EQ(idsOf("app-org.example.Photos@12.service"), IDs{"org.example.Photos"});
  EXPECT_EQ(idsOf("app-org.example.Photos@autostart.service"), IDs{"org.example.Photos"});
  EXPECT_EQ(idsOf("app-gnome-org.example.Photos@12.service"), IDs{"org.example.Photos"});
  EXPECT_EQ(idsOf("app-gnome-org.example.Photos-12.service"), IDs{"org.example.Photos"});
  // It does not say which of two it means.
  EXPECT_EQ(idsOf("app-gnome-org.example.Photos.service"), (IDs{"gnome", "org.example.Photos"}));
}

TEST(AUnit, HasItsEscapesUndone) {
  EXPECT_EQ(idsOf("app-gnome-org.example.photo\\x2dapp-12.scope"), IDs{"org.example.photo-app"});
  EXPECT_EQ(idsOf("app-a\\x20\\x5cb@1.service"), IDs{"a \\b"});
  for (const char* unit :
       {"app-a\\-1.scope", "app-a\\x-1.scope", "app-a\\x2-1.scope", "app-a\\xzz-1.scope", "app-a\\n-1.scope"})
    EXPECT_EQ(idsOf(unit), IDs{}) << unit;
}

TEST(AUnit, OfAnyOtherNameIsNoEvidence) {
  for (const char* unit : {"",
                           "app.scope",
                           "app-.scope",
                           "app-org.example.Photos.scope",
                           "app--org.example.Photos-1.scope",
                           "app-gnome--1.scope",
                           "app-org.example.Photos-.scope",
                           "app-a-b-c-d.scope",
                           "app-a-b-c@d.service",
                           "app-a@.service",
                           "app-@1.service",
                           "app.service",
                           "apps-org.example.Photos-1.scope",
                           "App-org.example.Photos-1.scope",
                           "app-org.example.Photos-1.slice",
                           "app-org.example.Photos-1.scope ",
                           "app-org.example.Photos-1",
                           "vte-spawn-1.scope",
                           "dbus-:1.2-org.example.Photos@0.service",
                           "org.example.Photos.service"})
    EXPECT_EQ(idsOf(unit), IDs{}) << unit;
}

TEST(AUnit, CountsOnlyDirectlyBelowTheUsersOwnManager) {
  const std::string unit = "app-org.example.Photos-1.scope";
  const std::string manager = "/user.slice/user-1000.slice/user@1000.service/";
  const auto ids = [](const std::string& path) { return clients::applicationsOfUnit(path, 1000); };
  for (const std::string& path : {manager + unit,
                                  manager + "app.slice/" + unit,
                                  manager + "app.slice/app-gnome.slice/" + unit,
                                  manager + "session.slice/" + unit})
    EXPECT_EQ(ids(path), IDs{"org.example.Photos"}) << path;
  for (const std::string& path : {"/" + unit,
                                  unit,
                                  "/app.slice/" + unit,
                                  "/user.slice/user-1000.slice/" + unit,
                                  "/user.slice/user-1001.slice/user@1001.service/app.slice/" + unit,
                                  "/x" + manager + unit,
                                  manager + "other.service/" + unit,
                                  manager + "app.slice/" + unit + "/below",
                                  manager + "app.slice/" + unit + "/",
                                  manager + "app.slice//" + unit,
                                  manager,
                                  std::string("/"),
                                  std::string()})
    EXPECT_EQ(ids(path), IDs{}) << path;
  EXPECT_EQ(clients::applicationsOfUnit(
                "/user.slice/user-4000000000.slice/user@4000000000.service/app.slice/" + unit, 4000000000),
            IDs{"org.example.Photos"});
}

std::string snap(const SnapName& name) {
  if (name.kind == SnapName::Kind::kNone) return "none";
  return name.kind == SnapName::Kind::kApplication ? name.applicationID : "other";
}

TEST(ALabel, NamesTheSnapsApplication) {
  EXPECT_EQ(snap(clients::snapOfLabel("snap.photos.viewer (enforce)\n")), "photos_viewer");
  EXPECT_EQ(snap(clients::snapOfLabel("snap.photos.viewer (complain)")), "photos_viewer");
  EXPECT_EQ(snap(clients::snapOfLabel("snap.photos_two.view-er\n")), "photos_two_view-er");
  EXPECT_EQ(snap(clients::snapOfLabel(std::string("snap.photos.viewer\0", 19))), "photos_viewer");
}

TEST(ALabel, OfASnapThatIsNoApplicationsIsSomethingOther) {
  for (const char* label : {"snap.photos.hook.configure (enforce)",
                            "snap.photos.hook (enforce)",
                            "snap.photos (enforce)",
                            "snap. (enforce)",
                            "snap..viewer",
                            "snap.photos.",
                            "snap.photos.viewer.more",
                            "snap.photos.viewer//child (enforce)",
                            "snap.photos.viewer//&unconfined (enforce)",
                            "snap.Photos.viewer (enforce)",
                            "snap.photos.view er",
                            "unconfined//&snap.photos.viewer (enforce)",
                            ":root://snap.photos.viewer (enforce)",
                            "snap.photos.viewer/../x"})
    EXPECT_EQ(snap(clients::snapOfLabel(label)), "other") << label;
}

TEST(ALabel, OfAnythingElseIsNoSnaps) {
  for (const char* label : {"",
                            "\n",
                            "unconfined\n",
                            "/usr/bin/snap.photos.viewer (enforce)",
                            "snapd (enforce)",
                            "unconfined_u:unconfined_r:unconfined_t:s0-s0:c0.c1023",
                            "snap-update-ns.photos (enforce)"})
    EXPECT_EQ(snap(clients::snapOfLabel(label)), "none") << label;
}

TEST(AControlGroup, NamesTheSnapsApplication) {
  const std::string uuid = kUUID;
  EXPECT_EQ(snap(clients::snapOfControlGroup("/a/snap.photos.viewer-" + uuid + ".scope")), "photos_viewer");
  EXPECT_EQ(snap(clients::snapOfControlGroup("/a/snap.photos.viewer." + uuid + ".scope")), "photos_viewer");
  EXPECT_EQ(snap(clients::snapOfControlGroup("/a/snap.photos.view-er-" + uuid + ".scope/b")),
            "photos_view-er");
  EXPECT_EQ(snap(clients::snapOfControlGroup("/a/snap.photos.viewer.service")), "photos_viewer");
}

TEST(AControlGroup, OfASnapThatIsNoApplicationsIsSomethingOther) {
  const std::string uuid = kUUID;
  for (const std::string& path : {"/snap.photos.hook.configure-" + uuid + ".scope",
                                  "/snap.photos.hook." + uuid + ".scope",
                                  "/snap.photos-" + uuid + ".scope",
                                  "/snap.photos.viewer" + uuid + ".scope",
                                  "/snap." + uuid + ".scope",
                                  std::string("/snap.photos.viewer.scope"),
                                  std::string("/snap.photos.viewer-1.scope"),
                                  std::string("/snap..scope"),
                                  "/snap.a.b-" + uuid + ".scope/snap.c.d-" + uuid + ".scope",
                                  "/snap.photos.viewer-" + std::string(36, 'a') + ".scope",
                                  std::string("/snap.photos.viewer.more.service")})
    EXPECT_EQ(snap(clients::snapOfControlGroup(path)), "other") << path;
}

TEST(AControlGroup, OfAnythingElseIsNoSnaps) {
  for (const char* path :
       {"", "/", "/snap.slice/x", "/snapd.service", "/xsnap.photos.viewer.service", "/snap.photos.viewer"})
    EXPECT_EQ(snap(clients::snapOfControlGroup(path)), "none") << path;
}

TEST(AListOfControlGroups, NamesTheServiceManagersOwn) {
  EXPECT_EQ(clients::managedControlGroup("0::/a:b\n"), "/a:b");
  EXPECT_EQ(clients::managedControlGroup("12:pids:/x\n1:name=systemd:/y\n0::/z\n"), "/y");
  EXPECT_EQ(clients::managedControlGroup("12:pids:/x\n0::/z\n"), "/z");
  for (const char* content : {"", "\n", "0\n", "0:\n", "1::/x\n", "12:pids:/x\n", "garbage"})
    EXPECT_EQ(clients::managedControlGroup(content), std::nullopt) << content;
}

}  // namespace
