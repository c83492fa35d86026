#include "daemon/clients/UnitNames.h"

#include <algorithm>

namespace clients {
namespace {

constexpr std::string_view kSnap = "snap.";
constexpr std::size_t kUUIDSize = 36;

std::vector<std::string_view> split(std::string_view text, char separator) {
  std::vector<std::string_view> parts;
  for (;;) {
    const std::size_t end = text.find(separator);
    parts.push_back(text.substr(0, end));
    if (end == std::string_view::npos) return parts;
    text.remove_prefix(end + 1);
  }
}

bool consistsOf(std::string_view text, std::string_view characters) {
  return !text.empty() && text.find_first_not_of(characters) == std::string_view::npos;
}

bool isSnapName(std::string_view name) {
  return consistsOf(name, "abcdefghijklmnopqrstuvwxyz0123456789-_");
}

// "hook" stands where the application's name stands in the names of hooks.
bool isSnapApplicationName(std::string_view name) {
  return name != "hook" &&
         consistsOf(name, "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-");
}

bool isUUID(std::string_view text) {
  return text.size() == kUUIDSize && consistsOf(text, "0123456789abcdef-") && text[8] == '-' &&
         text[13] == '-' && text[18] == '-' && text[23] == '-' &&
         std::count(text.begin(), text.end(), '-') == 4;
}

bool removeSuffix(std::string_view& text, std::string_view suffix) {
  if (!text.ends_with(suffix)) return false;
  text.remove_suffix(suffix.size());
  return true;
}

// "snap.name.app" alone.
SnapName snapOfName(std::string_view text) {
  const auto parts = split(text, '.');
  if (parts.size() != 3 || !isSnapName(parts[1]) || !isSnapApplicationName(parts[2]))
    return {SnapName::Kind::kOther, ""};
  return {SnapName::Kind::kApplication, std::string(parts[1]) + "_" + std::string(parts[2])};
}

SnapName snapOfUnit(std::string_view unit) {
  if (!unit.starts_with(kSnap)) return {};
  if (removeSuffix(unit, ".service")) return snapOfName(unit);
  if (!removeSuffix(unit, ".scope")) return {};
  if (unit.size() <= kUUIDSize || !isUUID(unit.substr(unit.size() - kUUIDSize)))
    return {SnapName::Kind::kOther, ""};
  unit.remove_suffix(kUUIDSize);
  if (unit.back() != '-' && unit.back() != '.') return {SnapName::Kind::kOther, ""};
  unit.remove_suffix(1);
  return snapOfName(unit);
}

int valueOfHexDigit(char digit) {
  if (digit >= '0' && digit <= '9') return digit - '0';
  if (digit >= 'a' && digit <= 'f') return digit - 'a' + 10;
  return -1;
}

// With the service manager's escapes undone; absent where one is none.
std::optional<std::string> unescaped(std::string_view text) {
  std::string result;
  while (!text.empty()) {
    if (text.front() != '\\') {
      result += text.front();
      text.remove_prefix(1);
      continue;
    }
    if (text.size() < 4 || text[1] != 'x') return std::nullopt;
    const int high = valueOfHexDigit(text[2]);
    const int low = valueOfHexDigit(text[3]);
    if (high < 0 || low < 0) return std::nullopt;
    result += static_cast<char>(high * 16 + low);
    text.remove_prefix(4);
  }
  return result;
}

// The unit whose own control group it is: below the user's manager nothing but slices lead to it.
std::optional<std::string_view> unitOfManager(std::string_view controlGroup, uid_t user) {
  const std::string number = std::to_string(user);
  const std::string manager = "/user.slice/user-" + number + ".slice/user@" + number + ".service/";
  if (!controlGroup.starts_with(manager)) return std::nullopt;
  controlGroup.remove_prefix(manager.size());
  const auto parts = split(controlGroup, '/');
  const bool isOwn = std::all_of(
      parts.begin(), parts.end() - 1, [](std::string_view part) { return part.ends_with(".slice"); });
  if (!isOwn) return std::nullopt;
  return parts.back();
}

}  // namespace

SnapName snapOfLabel(std::string_view label) {
  while (!label.empty() && (label.back() == '\n' || label.back() == '\0')) label.remove_suffix(1);
  if (label.starts_with(kSnap)) return snapOfName(label.substr(0, label.find(" (")));
  // A snap's label below or beside another one is something that no rule here is made for.
  for (const std::string_view mark : {"//snap.", "//&snap.", ":snap."})
    if (label.find(mark) != std::string_view::npos) return {SnapName::Kind::kOther, ""};
  return {};
}

SnapName snapOfControlGroup(std::string_view path) {
  SnapName found;
  for (const std::string_view unit : split(path, '/')) {
    const SnapName snap = snapOfUnit(unit);
    if (snap.kind == SnapName::Kind::kNone) continue;
    if (found.kind != SnapName::Kind::kNone) return {SnapName::Kind::kOther, ""};
    found = snap;
  }
  return found;
}

std::optional<std::string> managedControlGroup(std::string_view content) {
  std::optional<std::string> unified;
  for (const std::string_view line : split(content, '\n')) {
    const std::size_t first = line.find(':');
    const std::size_t second = first == std::string_view::npos ? first : line.find(':', first + 1);
    if (second == std::string_view::npos) continue;
    const std::string_view controllers = line.substr(first + 1, second - first - 1);
    const std::string path(line.substr(second + 1));
    // Where the older hierarchy is there, it is the one that the service manager works with.
    if (controllers == "name=systemd") return path;
    if (line.substr(0, first) == "0" && controllers.empty()) unified = path;
  }
  return unified;
}

std::vector<std::string> applicationsOfUnit(std::string_view controlGroup, uid_t user) {
  const auto found = unitOfManager(controlGroup, user);
  if (!found) return {};
  std::string_view unit = *found;
  const bool isScope = removeSuffix(unit, ".scope");
  if (!isScope && !removeSuffix(unit, ".service")) return {};
  const std::size_t at = isScope ? std::string_view::npos : unit.find('@');
  const bool isInstance = at != std::string_view::npos;
  if (isInstance && at + 1 == unit.size()) return {};
  auto parts = split(unit.substr(0, at), '-');
  if (parts.front() != "app" || std::any_of(parts.begin(), parts.end(), [](auto p) { return p.empty(); }))
    return {};
  parts.erase(parts.begin());

  std::vector<std::string> applications;
  const auto take = [&](std::size_t index) {
    if (index >= parts.size()) return;
    if (auto id = unescaped(parts[index])) applications.push_back(*std::move(id));
  };
  // What stands where: [LAUNCHER-]ID-RANDOM, or [LAUNCHER-]ID where nothing random is there.
  const bool mayEndAtRandom = !isInstance;
  const bool mayEndAtID = !isScope;
  if (mayEndAtRandom && (parts.size() == 2 || parts.size() == 3)) take(parts.size() - 2);
  if (mayEndAtID && (parts.size() == 1 || parts.size() == 2)) take(parts.size() - 1);
  return applications;
}

}  // namespace clients
