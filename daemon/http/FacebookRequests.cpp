#include "daemon/http/FacebookRequests.h"

#include <functional>
#include <mutex>
#include <stdexcept>
#include <utility>
#include <vector>

#include "daemon/http/TransferErrors.h"
#include "daemon/requests/RequestContext.h"
#include "host/Constants.h"

namespace http {
namespace {

using requests::RequestContext;
using Form = FacebookServer::Form;

void addIfPresent(Form& form, const std::string& name, const std::optional<std::string>& value) {
  if (value) form.emplace_back(name, *value);
}

// The names joined by commas, in the set's own order.
std::string joined(const RVPermissionSet& permissions) {
  std::string list;
  const char* separator = "";
  for (const std::string& permission : permissions) {
    list.append(separator).append(permission);
    separator = ",";
  }
  return list;
}

// A name with a comma in it would reach the server as two others, which nobody was asked about.
bool isListable(const RVPermissionSet& permissions) {
  for (const std::string& permission : permissions)
    if (permission.find(',') != std::string::npos) return false;
  return true;
}

// One exchange on behalf of a request, from its start until its handler has run.
class Exchange {
 public:
  Exchange(std::shared_ptr<RequestContext> context, TKFacebookRequestHandler handler)
      : context_(std::move(context)),
        handler_(std::move(handler)) {}

  // Whether the request may wait for an answer.
  bool beginWaiting() {
    if (context_ == nullptr) return true;
    waiting_ = context_->beginWaiting();
    return waiting_ != nullptr;
  }

  // Has this run when the request becomes void, as long as the answer has not come.
  void onVoid(std::function<void()> callback) {
    if (context_ == nullptr) return;
    auto registration = context_->onVoid(std::move(callback));
    const std::lock_guard lock(mutex_);
    if (!hasEnded_) registrations_.push_back(std::move(registration));
  }

  void handle(const std::optional<std::string>& body,
              const std::optional<TKHTTPResponse>& response,
              const std::optional<RVError>& error) {
    std::vector<RequestContext::Registration> registrations;  // dropped without the lock: that may wait
    {
      const std::lock_guard lock(mutex_);
      hasEnded_ = true;
      std::swap(registrations, registrations_);
    }
    const RequestContext::Scope scope(context_);
    const TKFacebookRequestHandler handler = std::exchange(handler_, nullptr);
    // Before the caller is answered, who may then ask again at once.
    waiting_.reset();
    handler(body, response, error);
  }

 private:
  // The context comes first: what follows refers to it.
  const std::shared_ptr<RequestContext> context_;
  std::unique_ptr<RequestContext::Waiting> waiting_;
  TKFacebookRequestHandler handler_;
  std::mutex mutex_;
  bool hasEnded_ = false;
  std::vector<RequestContext::Registration> registrations_;
};

}  // namespace

// What all requests and sessions of one factory share.
class FacebookRequests::Shared : public std::enable_shared_from_this<Shared> {
 public:
  Shared(FacebookServer& server, Revocations& revocations)
      : server_(server),
        revocations_(revocations) {}

  // Why a request for the permissions is not to be sent at all.
  std::optional<RVError> problemWith(const std::optional<RVPermissionSet>& permissions) const {
    if (permissions && !isListable(*permissions))
      return transferError(TransferErrorCode::kNotSendable, "a permission's name holds a comma");
    return server_.problem();
  }

  // For the request that is current on this thread. problem: why it is not to be sent at all. appID: of the
  // app that is authorized; absent where none is.
  void send(const std::string& exchangeName,
            Form form,
            std::optional<RVSecret> token,
            const std::optional<RVError>& problem,
            const std::optional<std::string>& appID,
            TKFacebookRequestHandler handler) {
    const auto exchange = std::make_shared<Exchange>(RequestContext::current(), std::move(handler));
    if (!exchange->beginWaiting()) return fail(exchange, transferError(TransferErrorCode::kCancelled));
    if (problem) return fail(exchange, *problem);
    const auto begin = [self = shared_from_this(), exchange, exchangeName](Form whole,
                                                                           std::optional<RVSecret> signing) {
      const auto transfer = self->server_.begin(
          exchangeName, std::move(whole), std::move(signing), [exchange](const auto&... answer) {
            exchange->handle(answer...);
          });
      if (!transfer) return;
      exchange->onVoid([&transfers = self->server_.transfers(), transfer] { transfers.cancel(*transfer); });
    };
    if (!appID) return begin(std::move(form), std::move(token));
    const auto waiter = revocations_.beforeAuthorizing(
        *appID,
        [self = shared_from_this(), exchange, begin, form = std::move(form), token = std::move(token)](
            const std::optional<RVError>& error) {
          if (error) return self->fail(exchange, *error);
          begin(form, token);
        });
    if (waiter == 0) return;
    exchange->onVoid([&revocations = revocations_, waiter] {
      if (const auto continuation = revocations.giveUp(waiter))
        continuation(transferError(TransferErrorCode::kCancelled));
    });
  }

  void revoke(const std::string& appID) {
    const auto owed = revocations_.owe(std::string(RVAccountTypeIdentifierFacebook), appID);
    if (owed) return;
    throw std::runtime_error("the server cannot be told to forget a token: " + owed.failure().message);
  }

 private:
  // Never on the caller's stack.
  void fail(const std::shared_ptr<Exchange>& exchange, RVError error) {
    server_.transfers().fail(std::move(error),
                             [exchange](const auto&... answer) { exchange->handle(answer...); });
  }

  FacebookServer& server_;
  Revocations& revocations_;
};

namespace {

// The two request classes differ in what they send alone.
template <typename Interface>
class Request final : public Interface {
 public:
  Request(std::shared_ptr<FacebookRequests::Shared> shared,
          std::string exchangeName,
          Form form,
          std::optional<RVError> problem,
          std::optional<std::string> appID = std::nullopt)
      : shared_(std::move(shared)),
        exchangeName_(std::move(exchangeName)),
        form_(std::move(form)),
        problem_(std::move(problem)),
        appID_(std::move(appID)) {}

  void setAccessToken(std::optional<RVSecret> accessToken) override { accessToken_ = std::move(accessToken); }

  void performRequestWithHandler(TKFacebookRequestHandler handler) override {
    shared_->send(exchangeName_,
                  std::move(form_),
                  std::exchange(accessToken_, std::nullopt),
                  problem_,
                  appID_,
                  std::move(handler));
  }

 private:
  const std::shared_ptr<FacebookRequests::Shared> shared_;
  const std::string exchangeName_;
  Form form_;
  const std::optional<RVError> problem_;
  const std::optional<std::string> appID_;
  std::optional<RVSecret> accessToken_;
};

class Session final : public TKFacebookSession {
 public:
  explicit Session(std::shared_ptr<FacebookRequests::Shared> shared)
      : shared_(std::move(shared)) {}

  void revokeAccessTokenForAppWithID(const std::string& appID) override { shared_->revoke(appID); }

 private:
  const std::shared_ptr<FacebookRequests::Shared> shared_;
};

}  // namespace

FacebookRequests::FacebookRequests(FacebookServer& server, Revocations& revocations)
    : shared_(std::make_shared<Shared>(server, revocations)) {
}

FacebookRequests::~FacebookRequests() = default;

std::shared_ptr<TKFacebookAuthorizationRequest> FacebookRequests::initWithAppId(
    const std::string& appId,
    const std::string& bundleId,
    const std::optional<RVPermissionSet>& permissions,
    const std::optional<std::string>& audience) {
  Form form{{"app_id", appId}, {"bundle_id", bundleId}};
  if (permissions) form.emplace_back("permissions", joined(*permissions));
  addIfPresent(form, "audience", audience);
  return std::make_shared<Request<TKFacebookAuthorizationRequest>>(
      shared_, "authorize", std::move(form), shared_->problemWith(permissions), appId);
}

std::shared_ptr<TKFacebookPermissionDescriptionRequest> FacebookRequests::initWithPermissions(
    const RVPermissionSet& permissions,
    const std::optional<std::string>& audience) {
  Form form{{"permissions", joined(permissions)}};
  addIfPresent(form, "audience", audience);
  return std::make_shared<Request<TKFacebookPermissionDescriptionRequest>>(
      shared_, "describe", std::move(form), shared_->problemWith(permissions));
}

std::optional<RVError> FacebookRequests::problemWithSending(
    const std::optional<RVPermissionSet>& permissions) const {
  return shared_->problemWith(permissions);
}

std::shared_ptr<TKFacebookSession> FacebookRequests::initSession() {
  return std::make_shared<Session>(shared_);
}

}  // namespace http
