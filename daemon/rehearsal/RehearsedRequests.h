// The exchanges with the server, written down instead of being carried out.
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "host/TKFacebookRequests.h"

namespace rehearsal {

// What an exchange says; the token that signs it is not kept.
struct Exchange {
  std::string name;  // "authorize" or "describe"
  std::optional<std::string> appID;
  std::optional<std::string> bundleID;
  std::optional<RVPermissionSet> permissions;
  std::optional<std::string> audience;

  friend bool operator==(const Exchange&, const Exchange&) = default;
};

// Why an exchange about these permissions is never sent; absent where it is.
using ProblemWithSending =
    std::function<std::optional<RVError>(const std::optional<RVPermissionSet>& permissions)>;

// What to ask the real server by.
struct Server {
  std::shared_ptr<TKFacebookRequestFactory> requests;
  std::function<std::optional<RVSecret>()> accountToken;  // signs what a plug-in signs with a stand-in
};

// An authorization is never sent: its handler is destroyed unused, so that nobody takes an answer of ours for
// the server's. A description is asked of the real server where there is one to ask; otherwise a text takes
// its place that names the permissions. What could not even be sent is answered with the error that the real
// classes give. Handlers run, and are destroyed, on threads of this object's. Thread-safe.
class RehearsedRequests final : public TKFacebookRequestFactory {
 public:
  // server: absent where none is asked.
  RehearsedRequests(ProblemWithSending problem, std::optional<Server> server);
  ~RehearsedRequests() override;

  std::shared_ptr<TKFacebookAuthorizationRequest> initWithAppId(
      const std::string& appId,
      const std::string& bundleId,
      const std::optional<RVPermissionSet>& permissions,
      const std::optional<std::string>& audience) override;
  std::shared_ptr<TKFacebookPermissionDescriptionRequest> initWithPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& audience) override;
  std::shared_ptr<TKFacebookSession> initSession() override;

  // Waits until every handler of ours has run and is destroyed. Not from a handler.
  void finish();

  // The newest exchange of each kind; absent where none was prepared.
  struct Prepared {
    Exchange exchange;
    bool isSent = false;  // whether it goes to the server where nothing is rehearsed
  };
  std::optional<Prepared> authorization() const;
  std::optional<Prepared> description() const;
  // Whether a text of ours has taken the place of a description.
  bool hasInventedDescription() const;

 private:
  class Authorization;
  class Description;
  class Session;

  void performAuthorization(const std::optional<RVError>& problem, TKFacebookRequestHandler handler);
  void performDescription(const Exchange& exchange,
                          bool isSigned,
                          const std::optional<RVError>& problem,
                          TKFacebookRequestHandler handler);
  void onThread(std::function<void()> work);

  const ProblemWithSending problem_;
  const std::optional<Server> server_;
  mutable std::mutex mutex_;  // guards everything below
  std::optional<Prepared> authorization_;
  std::optional<Prepared> description_;
  bool hasInventedDescription_ = false;
  std::vector<std::thread> threads_;
};

}  // namespace rehearsal
