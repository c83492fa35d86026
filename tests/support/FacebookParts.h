// The daemon's makers of Facebook requests, each with what it works with.
#pragma once

#include <chrono>
#include <deque>
#include <memory>
#include <string>
#include <utility>

#include "daemon/http/FacebookRequests.h"
#include "tests/support/StoredState.h"

namespace support {

// Over a state directory with one account. What could not be sent is tried again when somebody asks for it,
// and after no pause.
class FacebookParts {
 public:
  FacebookParts() { state.addAccount("master-canary"); }

  // Belongs to this object.
  http::FacebookRequests& requestsTo(http::FacebookServerSettings settings, std::string language = "") {
    auto& server = servers_.emplace_back(transfers, std::move(settings), std::move(language));
    const std::vector<records::OwedRevocation> owed = valueOf(state.outbox.list());
    auto& revocations = revocations_.emplace_back(
        owed,
        http::Revocations::Stores{state.outbox, *state.accounts, *state.records},
        http::Revocations::Means{
            [this](const std::string&) { return masterToken; },
            [this](const std::string& account) { state.keychain->eraseAccount(account); },
            [&server](const auto& appID, auto token, auto handler) {
              server.beginRevocation(appID, std::move(token), std::move(handler));
            },
            [this](auto pause, auto work) { transfers.after(pause, std::move(work)); },
            [](auto work) {
              work();
              return true;
            },
            [](int) { return std::chrono::hours(1); }},
        state.log);
    return requests_.emplace_back(server, revocations);
  }

  http::Revocations& revocations() { return revocations_.back(); }

  TemporaryDirectory directory;
  StoredState state{directory.path("rvd")};
  std::optional<RVSecret> masterToken{RVSecret("master-canary")};

 private:
  std::deque<http::FacebookServer> servers_;
  std::deque<http::Revocations> revocations_;
  std::deque<http::FacebookRequests> requests_;

 public:
  // Goes first: its handlers use the others.
  http::TransferThread transfers{state.log};
};

}  // namespace support
