#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>

#include "daemon/clients/ProcessInspector.h"
#include "tests/support/FakeProc.h"

namespace {

using Confinement = clients::ProcessFacts::Confinement;
using IDs = std::vector<std::string>;

constexpr pid_t kPID = 4711;

class AProcess : public testing::Test {
 protected:
  clients::ProcessFacts facts(pid_t pid = kPID) {
    return clients::ProcessInspector(proc_.path(), 1000).inspect(pid);
  }
  void expectUnknown(const std::string& because) {
    const auto found = facts();
    EXPECT_EQ(found.confinement, Confinement::kUnknown);
    EXPECT_TRUE(found.applicationIDs.empty());
    EXPECT_NE(found.reason.find(because), std::string::npos) << found.reason;
  }
  void expectUnconfined(const IDs& ids = {}) {
    const auto found = facts();
    EXPECT_EQ(found.confinement, Confinement::kUnconfined) << found.reason;
    EXPECT_EQ(found.applicationIDs, ids);
  }
  void expectConfined(const std::string& id) {
    const auto found = facts();
    EXPECT_EQ(found.confinement, Confinement::kConfined) << found.reason;
    EXPECT_EQ(found.applicationIDs, IDs{id});
  }
  std::string marker() { return proc_.path(kPID, "root/.flatpak-info"); }

  support::FakeProc proc_;
};

TEST_F(AProcess, ThatRunsAsTheUsersOwnDoIsUnconfined) {
  proc_.addUnconfined(kPID);
  expectUnconfined();
}

TEST_F(AProcess, ThatIsNotThereIsUnknown) {
  expectUnknown("No such file");
  for (const pid_t pid : {0, -1}) EXPECT_EQ(facts(pid).confinement, Confinement::kUnknown);
}

TEST_F(AProcess, InAFlatpakIsWhatTheMarkerSays) {
  proc_.addFlatpak(kPID, "org.example.Photos");
  expectConfined("org.example.Photos");
  proc_.setNamespace(kPID, "user", "ours");  // a sandbox that root's help has made
  expectConfined("org.example.Photos");
}

TEST_F(AProcess, WithAMarkerOutsideAnySandboxIsUnknown) {
  proc_.addFlatpak(kPID, "org.example.Photos");
  proc_.setNamespace(kPID, "mnt", "ours");
  expectUnknown("outside any sandbox");
}

TEST_F(AProcess, WhoseMarkerDoesNotNameOneApplicationIsUnknown) {
  proc_.addFlatpak(kPID, "org.example.Photos");
  using namespace std::string_literals;
  for (const std::string& text : {
           ""s,
           "name=org.example.Photos\n"s,
           "[Application]\n"s,
           "[Application]\nname=\n"s,
           "[Application]\nname[de]=org.example.Photos\n"s,
           "[Runtime]\nname=org.example.Platform\n"s,
           "[application]\nname=org.example.Photos\n"s,
           "[Application]\nname=org.example.A\nname=org.example.B\n"s,
           "[Application]\nname=org.example.A\n[Application]\nname=org.example.B\n"s,
           "[Application]\nname=org.example.A\n\0\nname=org.example.B\n"s,
           "[Application]\nname=org/example\n"s,
           "[Application]\nname=../../etc\n"s,
           "[Application]\nname=.hidden\n"s,
           "[Application]\nname=-option\n"s,
           "[Application]\nname=a b\n"s,
           "[Application]\nname=org.example.Ph\u043etos\n"s,
           "[Application]\nname=\xff\n"s,
           "[Application]\nname=a\\nb\n"s,
           "[Application]\nname="s + std::string(256, 'x') + "\n",
           std::string(1000, '['),
       }) {
    proc_.write(kPID, "root/.flatpak-info", text);
    expectUnknown("marker");
  }
}

TEST_F(AProcess, WhoseMarkerIsTooLargeIsUnknown) {
  proc_.addFlatpak(kPID, "org.example.Photos");
  const std::string text = "[Application]\nname=org.example.Photos\n#";
  proc_.write(kPID, "root/.flatpak-info", text + std::string(64 * 1024 - text.size(), 'x'));
  expectConfined("org.example.Photos");
  proc_.write(kPID, "root/.flatpak-info", text + std::string(64 * 1024 - text.size() + 1, 'x'));
  expectUnknown("larger");
  std::filesystem::resize_file(marker(), std::uintmax_t{1} << 30);
  expectUnknown("larger");
}

TEST_F(AProcess, WhoseMarkerIsNoFileIsUnknownWithoutWaiting) {
  proc_.addFlatpak(kPID, "org.example.Photos");
  proc_.write(kPID, "root/elsewhere", "[Application]\nname=org.example.Photos\n");
  std::filesystem::remove(marker());
  ASSERT_EQ(::mkfifo(marker().c_str(), 0600), 0);
  expectUnknown("no regular file");
  std::filesystem::remove(marker());
  std::filesystem::create_directory(marker());
  expectUnknown("no regular file");
  std::filesystem::remove(marker());
  for (const char* target : {"elsewhere", "/dev/zero", "nowhere", ".flatpak-info"}) {
    std::filesystem::create_symlink(target, marker());
    expectUnknown("symbolic links");
    std::filesystem::remove(marker());
  }
}

TEST_F(AProcess, WhoseMarkerIsADeviceIsUnknown) {
  proc_.addFlatpak(kPID, "org.example.Photos");
  std::filesystem::remove(marker());
  if (::mknod(marker().c_str(), S_IFCHR | 0666, makedev(1, 5)) != 0)
    GTEST_SKIP() << "only root makes devices";
  expectUnknown("marker");
}

TEST_F(AProcess, WhoseRootCannotBeOpenedIsUnknown) {
  proc_.addUnconfined(kPID);
  proc_.remove(kPID, "root");
  expectUnknown("root: No such file");
  std::filesystem::create_symlink("root", proc_.path(kPID, "root"));
  expectUnknown("root: Too many levels");
  proc_.remove(kPID, "root");
  proc_.write(kPID, "root", "");
  expectUnknown("root: Not a directory");
}

// The test that must not run as root, who reads everything: in a process of its own, as nobody.
TEST_F(AProcess, ThatMayNotBeReadIsUnknown) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can speak as another user";
  proc_.addUnconfined(kPID);
  ::chmod(proc_.path().c_str(), 0755);
  for (const char* name : {"root", "ns", "attr/current", "cgroup"}) {
    ::chmod(proc_.path(kPID, name).c_str(), 0);
    const pid_t child = ::fork();
    if (child == 0) {
      if (::setuid(65534) != 0) ::_exit(2);
      const auto found = facts();
      const bool isRight = found.confinement == Confinement::kUnknown &&
                           found.reason.find("Permission denied") != std::string::npos;
      ::_exit(isRight ? 0 : 1);
    }
    int status = 0;
    ::waitpid(child, &status, 0);
    EXPECT_EQ(status, 0) << name;
    ::chmod(proc_.path(kPID, name).c_str(), 0755);
  }
  expectUnconfined();
}

TEST_F(AProcess, OfWhichAnythingIsMissingIsUnknown) {
  for (const char* name : {"ns/user", "ns/mnt", "cgroup", "exe"}) {
    proc_.addUnconfined(kPID);
    expectUnconfined();
    proc_.remove(kPID, name);
    expectUnknown("No such file");
  }
  proc_.addUnconfined(kPID);
  proc_.remove(kPID, "attr");  // there is no security module
  expectUnconfined();
}

TEST_F(AProcess, InForeignNamespacesWithoutASandboxIsUnknown) {
  for (const char* kind : {"user", "mnt"}) {
    proc_.addUnconfined(kPID);
    proc_.setNamespace(kPID, kind, "foreign");
    expectUnknown("namespaces");
  }
}

TEST_F(AProcess, ThatIsABareProxyIsUnknown) {
  proc_.addUnconfined(kPID);
  for (const char* program :
       {"/usr/bin/xdg-dbus-proxy", "/opt/xdg-dbus-proxy (deleted)", "/xdg-dbus-proxy", "xdg-dbus-proxy"}) {
    proc_.setProgram(kPID, program);
    expectUnknown("proxy");
  }
  for (const char* program : {"/usr/bin/xdg-dbus-proxy/x", "/usr/bin/proxy", "/memfd:x (deleted)"}) {
    proc_.setProgram(kPID, program);
    expectUnconfined();
  }
}

TEST_F(AProcess, InASnapIsWhatItsLabelSays) {
  proc_.addUnconfined(kPID);
  proc_.setNamespace(kPID, "mnt", "foreign");
  proc_.write(kPID, "attr/current", "snap.photos.viewer (enforce)\n");
  expectConfined("photos_viewer");
  proc_.write(kPID, "attr/current", "unconfined\n");
  proc_.write(kPID, "attr/apparmor/current", "snap.photos.other (complain)\n");
  expectConfined("photos_other");
}

TEST_F(AProcess, WithALabelOfNoSnapIsNoSnapWhateverItsUnitIsCalled) {
  proc_.addUnconfined(kPID);
  proc_.write(kPID, "attr/apparmor/current", "unconfined\n");
  proc_.setControlGroup(kPID,
                        "/user.slice/user-1000.slice/user@1000.service/app.slice/"
                        "snap.photos.viewer-0b1c2d3e.scope");
  expectUnconfined();
}

TEST_F(AProcess, InASnapIsWhatItsControlGroupSays) {
  proc_.addUnconfined(kPID);
  proc_.remove(kPID, "attr/current");  // no security module tells more
  proc_.setControlGroup(kPID,
                        "/user.slice/user-1000.slice/user@1000.service/app.slice/"
                        "snap.photos.viewer-b1e9ec07-e2a0-4a3f-8f2c-0a4a5cd3f3f2.scope");
  expectConfined("photos_viewer");
}

TEST_F(AProcess, OfASnapThatIsNoApplicationOfItIsUnknown) {
  proc_.addUnconfined(kPID);
  proc_.write(kPID, "attr/current", "snap.photos.hook.configure (enforce)\n");
  expectUnknown("no application of it");
}

TEST_F(AProcess, ThatTwoKindsOfSandboxClaimIsUnknown) {
  proc_.addFlatpak(kPID, "org.example.Photos");
  proc_.write(kPID, "attr/current", "snap.photos.viewer (enforce)\n");
  expectUnknown("two kinds");
}

TEST_F(AProcess, OfAUnitOfTheUsersManagerMayBeItsApplication) {
  proc_.addUnconfined(kPID);
  proc_.setControlGroup(
      kPID, "/user.slice/user-1000.slice/user@1000.service/app.slice/app-gnome-org.example.Photos-12.scope");
  expectUnconfined({"org.example.Photos"});
  proc_.setControlGroup(
      kPID, "/user.slice/user-1001.slice/user@1001.service/app.slice/app-gnome-org.example.Photos-12.scope");
  expectUnconfined();
}

TEST_F(AProcess, WhoseControlGroupsAreManyIsOfTheManagersOne) {
  proc_.addUnconfined(kPID);
  const std::string unit =
      "/user.slice/user-1000.slice/user@1000.service/app.slice/app-org.example.Photos-12.scope";
  proc_.write(kPID, "cgroup", "5:cpu,cpuacct:/x\n1:name=systemd:" + unit + "\n0::/\n");
  expectUnconfined({"org.example.Photos"});
  proc_.write(kPID, "cgroup", "");
  expectUnconfined();
}

TEST_F(AProcess, WhoseFilesAreEndlessIsUnknown) {
  proc_.addUnconfined(kPID);
  proc_.remove(kPID, "cgroup");
  std::filesystem::create_symlink("/dev/zero", proc_.path(kPID, "cgroup"));
  expectUnknown("too large");
}

TEST(ThisProcess, IsInItsOwnNamespaces) {
  const auto found = clients::ProcessInspector("/proc", ::geteuid()).inspect(::getpid());
  EXPECT_EQ(found.confinement, Confinement::kUnconfined) << found.reason;
}

}  // namespace
