#include "daemon/http/FacebookRequests.h"

#include <mutex>
#include <utility>
#include <vector>

#include "daemon/http/ServerURL.h"
#include "daemon/http/TransferErrors.h"
#include "daemon/requests/RequestContext.h"

namespace http {
namespace {

using requests::RequestContext;
using Form = std::vector<std::pair<std::string, std::string>>;

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

  // Ends the transfer when the request becomes void, as long as the answer has not come.
  void endWhenVoid(TransferThread& transfers, TransferThread::ID transfer) {
    if (context_ == nullptr) return;
    auto registration = context_->onVoid([&transfers, transfer] { transfers.cancel(transfer); });
    const std::lock_guard lock(mutex_);
    if (!hasEnded_) registration_ = std::move(registration);
  }

  void handle(const std::optional<std::string>& body,
              const std::optional<TKHTTPResponse>& response,
              const std::optional<RVError>& error) {
    RequestContext::Registration registration;  // dropped without the lock: that may wait
    {
      const std::lock_guard lock(mutex_);
      hasEnded_ = true;
      std::swap(registration, registration_);
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
  RequestContext::Registration registration_;
};

}  // namespace

// What all requests and sessions of one factory share.
class FacebookRequests::Server {
 public:
  Server(TransferThread& transfers,
         FacebookServerSettings settings,
         std::function<std::optional<RVSecret>()> masterToken,
         std::string acceptLanguage,
         RVLogService& log)
      : transfers_(transfers),
        settings_(std::move(settings)),
        masterToken_(std::move(masterToken)),
        acceptLanguage_(std::move(acceptLanguage)),
        log_(log) {}

  // Why a request for the permissions is not to be sent at all.
  std::optional<RVError> problemWith(const std::optional<RVPermissionSet>& permissions) const {
    if (permissions && !isListable(*permissions))
      return transferError(TransferErrorCode::kNotSendable, "a permission's name holds a comma");
    if (!settings_.url) return transferError(TransferErrorCode::kNoServer);
    return std::nullopt;
  }

  // For the request that is current on this thread. problem: why it is not to be sent at all.
  void send(const std::string& exchangeName,
            Form form,
            std::optional<RVSecret> token,
            const std::optional<RVError>& problem,
            TKFacebookRequestHandler handler) const {
    const auto exchange = std::make_shared<Exchange>(RequestContext::current(), std::move(handler));
    const auto handle = [exchange](const auto&... answer) { exchange->handle(answer...); };
    if (!exchange->beginWaiting())
      return transfers_.fail(transferError(TransferErrorCode::kCancelled), handle);
    if (problem) return transfers_.fail(*problem, handle);
    const auto transfer =
        transfers_.start(transferFor(exchangeName, std::move(form), std::move(token)), handle);
    exchange->endWhenVoid(transfers_, transfer);
  }

  void revoke(const std::string& appID) const {
    const auto report = [&log = log_, appID](const auto&, const auto&, const std::optional<RVError>& error) {
      // The answer is of no interest, so one without a body will do.
      if (!error || error->code == static_cast<std::int64_t>(TransferErrorCode::kNoBody)) return;
      std::optional<RVValue> text;
      if (const auto description = error->localizedDescription()) text = *description;
      log.RVLog(kRVLogLevelError,
                kRVLogFacilityDaemon,
                "daemon/http/FacebookRequests",
                "FacebookRequests::revoke",
                __LINE__,
                "The server was not told to forget the token of app %@: %@",
                {RVValue(appID), text});
    };
    if (!settings_.url) return transfers_.fail(transferError(TransferErrorCode::kNoServer), report);
    Transfer transfer = transferFor("revoke", {{"app_id", appID}}, masterToken_());
    transfer.mayEndLate = true;
    transfers_.start(std::move(transfer), report);
  }

 private:
  Transfer transferFor(const std::string& exchangeName, Form form, std::optional<RVSecret> token) const {
    // A URL that cannot be used is passed on as it is: the transfer fails and says why.
    const std::optional<ServerURL> server = readServerURL(*settings_.url);
    Transfer transfer;
    transfer.url = server ? server->text + "/" + exchangeName : *settings_.url;
    transfer.form = std::move(form);
    transfer.bearerToken = std::move(token);
    transfer.acceptLanguage = acceptLanguage_;
    transfer.timeout = settings_.timeout;
    transfer.caFile = settings_.caFile;
    return transfer;
  }

  TransferThread& transfers_;
  const FacebookServerSettings settings_;
  const std::function<std::optional<RVSecret>()> masterToken_;
  const std::string acceptLanguage_;
  RVLogService& log_;
};

namespace {

// The two request classes differ in what they send alone.
template <typename Interface>
class Request final : public Interface {
 public:
  Request(std::shared_ptr<const FacebookRequests::Server> server,
          std::string exchangeName,
          Form form,
          std::optional<RVError> problem)
      : server_(std::move(server)),
        exchangeName_(std::move(exchangeName)),
        form_(std::move(form)),
        problem_(std::move(problem)) {}

  void setAccessToken(std::optional<RVSecret> accessToken) override { accessToken_ = std::move(accessToken); }

  void performRequestWithHandler(TKFacebookRequestHandler handler) override {
    server_->send(exchangeName_,
                  std::move(form_),
                  std::exchange(accessToken_, std::nullopt),
                  problem_,
                  std::move(handler));
  }

 private:
  const std::shared_ptr<const FacebookRequests::Server> server_;
  const std::string exchangeName_;
  Form form_;
  const std::optional<RVError> problem_;
  std::optional<RVSecret> accessToken_;
};

class Session final : public TKFacebookSession {
 public:
  explicit Session(std::shared_ptr<const FacebookRequests::Server> server)
      : server_(std::move(server)) {}

  void revokeAccessTokenForAppWithID(const std::string& appID) override { server_->revoke(appID); }

 private:
  const std::shared_ptr<const FacebookRequests::Server> server_;
};

}  // namespace

FacebookRequests::FacebookRequests(TransferThread& transfers,
                                   FacebookServerSettings settings,
                                   std::function<std::optional<RVSecret>()> masterToken,
                                   std::string acceptLanguage,
                                   RVLogService& log)
    : server_(std::make_shared<const Server>(transfers,
                                             std::move(settings),
                                             std::move(masterToken),
                                             std::move(acceptLanguage),
                                             log)) {
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
      server_, "authorize", std::move(form), server_->problemWith(permissions));
}

std::shared_ptr<TKFacebookPermissionDescriptionRequest> FacebookRequests::initWithPermissions(
    const RVPermissionSet& permissions,
    const std::optional<std::string>& audience) {
  Form form{{"permissions", joined(permissions)}};
  addIfPresent(form, "audience", audience);
  return std::make_shared<Request<TKFacebookPermissionDescriptionRequest>>(
      server_, "describe", std::move(form), server_->problemWith(permissions));
}

std::optional<RVError> FacebookRequests::problemWithSending(
    const std::optional<RVPermissionSet>& permissions) const {
  return server_->problemWith(permissions);
}

std::shared_ptr<TKFacebookSession> FacebookRequests::initSession() {
  return std::make_shared<Session>(server_);
}

}  // namespace http
