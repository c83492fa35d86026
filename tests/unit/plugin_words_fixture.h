// The plug-in over a string table whose texts show which key they stand under and what was put into them.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "tests/unit/plugin_fixture.h"

namespace plugin_tests {

// A format reads as its key with each argument in brackets behind it, the separator as " + ", every other key
// as itself.
class WordsTest : public PluginTest {
 protected:
  WordsTest() {
    const std::vector<std::pair<std::string, int>> formats = {
        {"ACCOUNT_ACCESS_BASIC_MESSAGE", 1},
        {"ACCOUNT_ACCESS_ONE_PERMISSION_SHORT_FORMAT", 2},
        {"ACCOUNT_ACCESS_ONE_PERMISSION_FORMAT", 2},
        {"ACCOUNT_ACCESS_TWO_PERMISSION_FORMAT", 3},
        {"ACCOUNT_ACCESS_THREE_PERMISSION_FORMAT", 4},
        {"ACCOUNT_ACCESS_UNKNOWN_FORMAT", 2},
        {"ACCOUNT_ACCESS_UNKNOWN_ADDITIONAL_FORMAT", 1},
        {"ACCOUNT_ACCESS_EXTENDED_READ", 1},
        {"ACCOUNT_ACCESS_EXTENDED_READ_MULTIPLE", 2},
        {"ACCCOUNT_ACCESS_WRITE", 1},
        {"ACCOUNT_ACCESS_MANAGE", 1},
        {"ACCOUNT_ACCESS_MANAGE_MULTIPLE", 2},
        {"ACCOUNT_ACCESS_EXTENDED_READ_USER", 1},
        {"ACCOUNT_ACCESS_EXTENDED_READ_USER_MULTIPLE", 2},
        {"ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS", 1},
        {"ACCOUNT_ACCESS_EXTENDED_READ_FRIENDS_MULTIPLE", 2},
    };
    for (const auto& [key, arguments] : formats) {
      std::string text = key;
      for (int i = 0; i < arguments; ++i) text += "[%@]";
      host.stringTable.put(key, text);
    }
    host.stringTable.put("WORD_LIST_SEPARATOR", " + ");
  }

  static std::string readName(const std::string& name) { return "FACEBOOK_READ_PERMISSION_" + name; }
  static std::string manageName(const std::string& name) { return "FACEBOOK_MANAGE_PERMISSION_" + name; }
  // The basic-profile name and the friend-list name, as the fixture's table has them.
  const std::string basicProfile = readName("BASIC_PROFILE");
  const std::string friendList = readName("FRIENDS");

  // The keys that have been looked up, in order.
  std::vector<std::string> lookedUp() const {
    std::vector<std::string> keys;
    for (const auto& lookup : host.stringTable.lookups()) keys.push_back(lookup.key);
    return keys;
  }

  const std::shared_ptr<fakes::FakeAccount> account = std::make_shared<fakes::FakeAccount>();
};

// Texts of a fake table, except that there is none at all for some keys.
class TableWithGaps final : public RVStringTable {
 public:
  TableWithGaps(fakes::FakeStringTable& table, RVPermissionSet gaps)
      : table_(table),
        gaps_(std::move(gaps)) {}

  std::optional<std::string> textForKey(std::string_view key,
                                        std::string_view value,
                                        std::string_view table) override {
    if (gaps_.contains(key)) return std::nullopt;
    return table_.textForKey(key, value, table);
  }
  std::string stringWithFormat(std::string_view format,
                               const std::vector<std::optional<RVValue>>& arguments) const override {
    return table_.stringWithFormat(format, arguments);
  }

 private:
  fakes::FakeStringTable& table_;
  const RVPermissionSet gaps_;
};

}  // namespace plugin_tests
