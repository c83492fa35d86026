// The plug-in over a fake host, and what came of a call of it.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "tests/fakes/FakeHost.h"
#include "tests/support/PluginTestAccess.h"

namespace plugin_tests {

// Collects what a completion is given. Handed to the plug-in as often as a test likes.
class Answers {
 public:
  struct Answer {
    bool granted = false;
    std::optional<RVError> error;
    std::thread::id thread;
  };

  RVDAccessCompletion completion() {
    return [state = state_](bool granted, const std::optional<RVError>& error) {
      {
        const std::lock_guard lock(state->mutex);
        state->answers.push_back({granted, error, std::this_thread::get_id()});
      }
      state->changed.notify_all();
    };
  }

  // Waits for the first answer, for half a minute at most.
  Answer wait() {
    std::unique_lock lock(state_->mutex);
    if (!state_->changed.wait_for(lock, std::chrono::seconds(30), [&] { return !state_->answers.empty(); })) {
      ADD_FAILURE() << "the completion was not called";
      return {};
    }
    return state_->answers.front();
  }

  std::size_t count() const {
    const std::lock_guard lock(state_->mutex);
    return state_->answers.size();
  }

 private:
  struct State {
    mutable std::mutex mutex;
    std::condition_variable changed;
    std::vector<Answer> answers;
  };
  const std::shared_ptr<State> state_ = std::make_shared<State>();
};

inline RVDictionary optionsFor(const std::vector<std::string>& permissions,
                               const std::optional<std::string>& audience = std::nullopt,
                               const std::string& appID = "111") {
  RVDictionary options;
  options.emplace(RVFacebookAppIdKey, appID);
  options.emplace(RVFacebookPermissionsKey, RVArray(permissions.begin(), permissions.end()));
  if (audience) options.emplace(RVFacebookAudienceKey, *audience);
  return options;
}

// What is kept of such options.
inline RVDictionary keptOptions(const std::string& appID,
                                const std::optional<std::string>& audience = std::nullopt) {
  RVDictionary options;
  options.emplace(RVFacebookAppIdKey, appID);
  if (audience) options.emplace(RVFacebookAudienceKey, *audience);
  return options;
}

inline std::string answerOfServer(const std::vector<std::string>& granted,
                                  const std::string& token = "client-token") {
  std::string list;
  for (const std::string& name : granted) list += (list.empty() ? "\"" : ",\"") + name + "\"";
  return R"({"access_token":")" + token + R"(","permissions":[)" + list + "]}";
}

class PluginTest : public testing::Test {
 protected:
  static constexpr const char* kClientID = "org.example.PhotoApp";

  PluginTest() { TKFacebookAccountAccessPluginTestAccess::forgetPreferencesQueue(); }
  // The queue's thread ends before the host that made it.
  ~PluginTest() override { TKFacebookAccountAccessPluginTestAccess::forgetPreferencesQueue(); }

  // Asks and waits for the answer, which has to be the only one.
  Answers::Answer request(const std::shared_ptr<const RVDClient>& client,
                          const RVDictionary& options,
                          bool allowUserInteraction = true) {
    Answers answers;
    plugin.handleAccessRequestToAccountsOfType(
        host.accountType, client, options, host.store, allowUserInteraction, answers.completion());
    return onlyAnswerOf(answers);
  }

  Answers::Answer onlyAnswerOf(Answers& answers) {
    const Answers::Answer answer = answers.wait();
    host.facebookRequests.waitUntilDelivered();
    EXPECT_EQ(answers.count(), 1U);
    return answer;
  }

  void storeRecord(const std::shared_ptr<const RVDClient>& client,
                   bool granted,
                   std::optional<RVPermissionSet> permissions,
                   std::optional<RVDictionary> options) {
    RVDClientAuthorization authorization(client);
    authorization.setIsGranted(granted);
    authorization.setGrantedPermissions(std::move(permissions));
    authorization.setOptions(std::move(options));
    host.store->records().setAuthorization(authorization, *client, *host.accountType);
    host.journal->clear();
  }

  std::optional<RVDClientAuthorization> record(const std::string& clientID = kClientID) {
    return host.store->records().record(clientID, RVAccountTypeIdentifierFacebook);
  }

  fakes::FakeHost host;
  TKFacebookAccountAccessPlugin plugin{host.services()};
  const TKFacebookAccountAccessPluginTestAccess access{plugin};
};

// What every line of the plug-in's log has in common.
inline void expectPlaceOfEveryLine(const fakes::FakeLog& log, const std::string& operation) {
  for (const auto& line : log.lines()) {
    EXPECT_EQ(line.facility, kRVLogFacilityDaemon);
    EXPECT_EQ(line.sourceFile, "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin");
    EXPECT_EQ(line.functionName, "-[TKFacebookAccountAccessPlugin " + operation + "]");
    EXPECT_GT(line.line, 0);
  }
}

// Level and text of every line.
inline std::vector<std::pair<int, std::string>> linesOf(const fakes::FakeLog& log) {
  std::vector<std::pair<int, std::string>> lines;
  for (const auto& line : log.lines()) lines.emplace_back(line.level, line.text);
  return lines;
}

// An error without any user-info.
inline RVError bareError(int code) {
  return {std::string(RVErrorDomain), code, {}};
}

inline RVError describedError(int code, const std::string& description) {
  return {std::string(RVErrorDomain), code, {{std::string(kRVErrorLocalizedDescriptionKey), description}}};
}

}  // namespace plugin_tests
