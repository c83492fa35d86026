// What the user reads: alerts made by the plug-in with the compiled string table.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "daemon/plugins/StringTable.h"
#include "tests/fakes/FakeHost.h"

namespace support {

// The texts of one alert.
struct AlertTexts {
  std::string title;
  std::string message;
  std::string allowButton;
  std::string doNotAllowButton;
};

// A request that leads to an alert.
struct ConsentRequest {
  RVPermissionSet permissions;
  std::optional<std::string> audience;
};

// An application called "Photo App" that asks for access again and again, of a user who never answers.
class SentenceMaker {
 public:
  // The texts in this language, or in English where it has none.
  explicit SentenceMaker(const std::string& language = "en");

  // What the server answers for permissions that the plug-in does not know.
  void setDescription(const std::string& description);

  // Absent where no alert is shown.
  std::optional<AlertTexts> alertFor(const ConsentRequest& request);

 private:
  fakes::FakeHost host_;
  plugins::StringTable table_;
  std::unique_ptr<TKFacebookAccountAccessPlugin> plugin_;
};

// Every kind of clause with every other: reading (nothing; basic, of the profile, of one, two and many things
// of the user's, of friends', of both), posting (not at all; for each audience and for none), managing
// (nothing, one, two and all things), with and without a permission that the plug-in does not know.
std::vector<ConsentRequest> everyCombination();

// Each permission that the plug-in knows, alone; the ones that post, for each audience and for none.
std::vector<ConsentRequest> everyPermissionAlone();

}  // namespace support
