// A process file system of a test's own.
#pragma once

#include <sys/types.h>

#include <filesystem>
#include <string>

#include "tests/support/TemporaryDirectory.h"

namespace support {

// One tree with the test's own process, "self", and others. Namespaces are files, which are the same where
// they are links to the same one.
class FakeProc {
 public:
  FakeProc() {
    for (const char* name : {"user", "mnt"}) {
      tree_.write(std::string("namespaces/ours-") + name, "");
      tree_.write(std::string("namespaces/foreign-") + name, "");
    }
    std::filesystem::create_directories(tree_.path("self/ns"));
    link("self/ns/user", "namespaces/ours-user");
    link("self/ns/mnt", "namespaces/ours-mnt");
  }

  const std::string& path() const { return tree_.path(); }
  // Of a process's file.
  std::string path(pid_t pid, const std::string& name) const { return tree_.path(relative(pid, name)); }

  // A program that runs as the user's own do.
  void addUnconfined(pid_t pid) {
    std::filesystem::create_directories(path(pid, "root"));
    std::filesystem::create_directories(path(pid, "ns"));
    setNamespace(pid, "user", "ours");
    setNamespace(pid, "mnt", "ours");
    write(pid, "cgroup", "0::/user.slice/user-1000.slice/session-2.scope\n");
    write(pid, "attr/current", "unconfined\n");
    setProgram(pid, "/usr/bin/example");
  }
  // A program in a Flatpak sandbox.
  void addFlatpak(pid_t pid, const std::string& id) {
    addUnconfined(pid);
    setNamespace(pid, "user", "foreign");
    setNamespace(pid, "mnt", "foreign");
    write(pid, "root/.flatpak-info", "[Application]\nname=" + id + "\nruntime=runtime/x\n");
    setProgram(pid, "/usr/bin/xdg-dbus-proxy");
  }

  void write(pid_t pid, const std::string& name, const std::string& content) {
    tree_.write(relative(pid, name), content);
  }
  void setControlGroup(pid_t pid, const std::string& path) { write(pid, "cgroup", "0::" + path + "\n"); }
  // whose: "ours" or "foreign".
  void setNamespace(pid_t pid, const std::string& kind, const std::string& whose) {
    link(relative(pid, "ns/" + kind), "namespaces/" + whose + "-" + kind);
  }
  void setProgram(pid_t pid, const std::string& program) {
    remove(pid, "exe");
    std::filesystem::create_symlink(program, path(pid, "exe"));
  }
  void remove(pid_t pid, const std::string& name) { std::filesystem::remove_all(path(pid, name)); }
  void remove(pid_t pid) { std::filesystem::remove_all(tree_.path(std::to_string(pid))); }

 private:
  static std::string relative(pid_t pid, const std::string& name) { return std::to_string(pid) + "/" + name; }
  void link(const std::string& name, const std::string& target) {
    std::filesystem::remove(tree_.path(name));
    std::filesystem::create_symlink(tree_.path(target), tree_.path(name));
  }

  TemporaryDirectory tree_;
};

}  // namespace support
