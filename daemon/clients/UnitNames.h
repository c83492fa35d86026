// What the names of control groups, units and security labels say about applications.
#pragma once

#include <sys/types.h>

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace clients {

// What a text says about a snap: nothing, which of its applications ("name_app", as its desktop entry is
// called), or something of a snap that is no application of it.
struct SnapName {
  enum class Kind { kNone, kApplication, kOther };
  Kind kind = Kind::kNone;
  std::string applicationID;
};

// By a security label as the kernel gives it: "snap.name.app (enforce)".
SnapName snapOfLabel(std::string_view label);

// By the units in a control group's path: "…/snap.name.app-UUID.scope/…".
SnapName snapOfControlGroup(std::string_view path);

// The control group that the service manager knows a process by, from the content of its file "cgroup".
// Absent where the file names none.
std::optional<std::string> managedControlGroup(std::string_view content);

// The applications that a unit of the user's service manager may have been started as, by its name:
// "app[-LAUNCHER]-ID-RANDOM.scope" or "app[-LAUNCHER]-ID[@RANDOM|-RANDOM].service". Empty where the control
// group is no such unit's own.
std::vector<std::string> applicationsOfUnit(std::string_view controlGroup, uid_t user);

}  // namespace clients
