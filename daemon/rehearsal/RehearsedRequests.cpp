#include "daemon/rehearsal/RehearsedRequests.h"

#include <nlohmann/json.hpp>
#include <utility>

namespace rehearsal {
namespace {

// A description in the form in which the server sends one.
std::string inventedDescription(const RVPermissionSet& permissions) {
  std::string names;
  for (const std::string& permission : permissions) names += (names.empty() ? "" : ", ") + permission;
  return nlohmann::json("[the server's description of " + names + "]")
      .dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
}

}  // namespace

class RehearsedRequests::Authorization final : public TKFacebookAuthorizationRequest {
 public:
  Authorization(RehearsedRequests& requests, std::optional<RVError> problem)
      : requests_(requests),
        problem_(std::move(problem)) {}

  void setAccessToken(std::optional<RVSecret>) override {}
  void performRequestWithHandler(TKFacebookRequestHandler handler) override {
    requests_.performAuthorization(problem_, std::move(handler));
  }

 private:
  RehearsedRequests& requests_;
  const std::optional<RVError> problem_;
};

class RehearsedRequests::Description final : public TKFacebookPermissionDescriptionRequest {
 public:
  Description(RehearsedRequests& requests, Exchange exchange, std::optional<RVError> problem)
      : requests_(requests),
        exchange_(std::move(exchange)),
        problem_(std::move(problem)) {}

  void setAccessToken(std::optional<RVSecret> accessToken) override { isSigned_ = accessToken.has_value(); }
  void performRequestWithHandler(TKFacebookRequestHandler handler) override {
    requests_.performDescription(exchange_, isSigned_, problem_, std::move(handler));
  }

 private:
  RehearsedRequests& requests_;
  const Exchange exchange_;
  const std::optional<RVError> problem_;
  bool isSigned_ = false;
};

class RehearsedRequests::Session final : public TKFacebookSession {
 public:
  void revokeAccessTokenForAppWithID(const std::string&) override {}
};

RehearsedRequests::RehearsedRequests(ProblemWithSending problem, std::optional<Server> server)
    : problem_(std::move(problem)),
      server_(std::move(server)) {
}

RehearsedRequests::~RehearsedRequests() {
  finish();
}

std::shared_ptr<TKFacebookAuthorizationRequest> RehearsedRequests::initWithAppId(
    const std::string& appId,
    const std::string& bundleId,
    const std::optional<RVPermissionSet>& permissions,
    const std::optional<std::string>& audience) {
  {
    const std::lock_guard lock(mutex_);
    authorization_ = {{"authorize", appId, bundleId, permissions, audience}};
  }
  return std::make_shared<Authorization>(*this, problem_(permissions));
}

std::shared_ptr<TKFacebookPermissionDescriptionRequest> RehearsedRequests::initWithPermissions(
    const RVPermissionSet& permissions,
    const std::optional<std::string>& audience) {
  Exchange exchange{"describe", std::nullopt, std::nullopt, permissions, audience};
  {
    const std::lock_guard lock(mutex_);
    description_ = {exchange};
  }
  return std::make_shared<Description>(*this, std::move(exchange), problem_(permissions));
}

std::shared_ptr<TKFacebookSession> RehearsedRequests::initSession() {
  return std::make_shared<Session>();
}

void RehearsedRequests::finish() {
  std::vector<std::thread> threads;
  {
    const std::lock_guard lock(mutex_);
    threads.swap(threads_);
  }
  for (std::thread& thread : threads) thread.join();
}

void RehearsedRequests::performAuthorization(const std::optional<RVError>& problem,
                                             TKFacebookRequestHandler handler) {
  if (!problem) {
    const std::lock_guard lock(mutex_);
    authorization_->isSent = true;
  }
  onThread([problem, handler = std::move(handler)] {
    if (problem) handler(std::nullopt, std::nullopt, problem);
  });
}

void RehearsedRequests::performDescription(const Exchange& exchange,
                                           bool isSigned,
                                           const std::optional<RVError>& problem,
                                           TKFacebookRequestHandler handler) {
  if (!problem) {
    const std::lock_guard lock(mutex_);
    description_->isSent = true;
    hasInventedDescription_ = !server_;
  }
  if (server_ && !problem) {
    const auto request = server_->requests->initWithPermissions(*exchange.permissions, exchange.audience);
    request->setAccessToken(isSigned ? server_->accountToken() : std::nullopt);
    request->performRequestWithHandler(std::move(handler));
    return;
  }
  std::optional<std::string> body;
  if (!problem) body = inventedDescription(*exchange.permissions);
  onThread([problem, body, handler = std::move(handler)] {
    handler(body, problem ? std::nullopt : std::optional(TKHTTPResponse{200}), problem);
  });
}

void RehearsedRequests::onThread(std::function<void()> work) {
  const std::lock_guard lock(mutex_);
  threads_.emplace_back([work = std::move(work)]() mutable {
    try {
      work();
    } catch (...) {  // A handler's exception reaches nobody, as on the thread of real answers.
    }
    work = nullptr;
  });
}

std::optional<RehearsedRequests::Prepared> RehearsedRequests::authorization() const {
  const std::lock_guard lock(mutex_);
  return authorization_;
}

std::optional<RehearsedRequests::Prepared> RehearsedRequests::description() const {
  const std::lock_guard lock(mutex_);
  return description_;
}

bool RehearsedRequests::hasInventedDescription() const {
  const std::lock_guard lock(mutex_);
  return hasInventedDescription_;
}

}  // namespace rehearsal
