#include "tests/fakes/FakeFacebookRequests.h"

#include <chrono>
#include <iterator>
#include <stdexcept>
#include <utility>

namespace fakes {

FakeReply FakeReply::withBody(std::string body, int statusCode) {
  return {std::move(body), TKHTTPResponse{statusCode}, std::nullopt, Delivery::kOtherThread};
}

FakeReply FakeReply::withError(RVError error) {
  return {std::nullopt, std::nullopt, std::move(error), Delivery::kOtherThread};
}

FakeReply FakeReply::withoutAnything() {
  return {};
}

FakeReply FakeReply::dropped() {
  return {std::nullopt, std::nullopt, std::nullopt, Delivery::kDropped};
}

FakeReply FakeReply::thrown() {
  return {std::nullopt, std::nullopt, std::nullopt, Delivery::kThrown};
}

FakeReply FakeReply::held() const {
  FakeReply reply = *this;
  reply.delivery = Delivery::kHeld;
  return reply;
}

class FakeFacebookRequests::Authorization final : public TKFacebookAuthorizationRequest {
 public:
  Authorization(FakeFacebookRequests& owner, std::shared_ptr<FakeAuthorizationExchange> exchange)
      : owner_(owner),
        exchange_(std::move(exchange)) {}

  void setAccessToken(std::optional<RVSecret> accessToken) override {
    owner_.begin("authorization.setAccessToken");
    const std::lock_guard lock(owner_.mutex_);
    exchange_->tokenWasSet = true;
    exchange_->accessToken = std::move(accessToken);
  }

  void performRequestWithHandler(TKFacebookRequestHandler handler) override {
    owner_.begin("authorization.performRequestWithHandler");
    {
      const std::lock_guard lock(owner_.mutex_);
      exchange_->performed = true;
    }
    owner_.perform(owner_.authorizationReplies_, std::move(handler));
  }

 private:
  FakeFacebookRequests& owner_;
  const std::shared_ptr<FakeAuthorizationExchange> exchange_;
};

class FakeFacebookRequests::Description final : public TKFacebookPermissionDescriptionRequest {
 public:
  Description(FakeFacebookRequests& owner, std::shared_ptr<FakeDescriptionExchange> exchange)
      : owner_(owner),
        exchange_(std::move(exchange)) {}

  void setAccessToken(std::optional<RVSecret> accessToken) override {
    owner_.begin("description.setAccessToken");
    const std::lock_guard lock(owner_.mutex_);
    exchange_->tokenWasSet = true;
    exchange_->accessToken = std::move(accessToken);
  }

  void performRequestWithHandler(TKFacebookRequestHandler handler) override {
    owner_.begin("description.performRequestWithHandler");
    {
      const std::lock_guard lock(owner_.mutex_);
      exchange_->performed = true;
    }
    owner_.perform(owner_.descriptionReplies_, std::move(handler));
  }

 private:
  FakeFacebookRequests& owner_;
  const std::shared_ptr<FakeDescriptionExchange> exchange_;
};

class FakeFacebookRequests::Session final : public TKFacebookSession {
 public:
  explicit Session(FakeFacebookRequests& owner)
      : owner_(owner) {}

  void revokeAccessTokenForAppWithID(const std::string& appID) override {
    owner_.begin("session.revokeAccessTokenForAppWithID");
    const std::lock_guard lock(owner_.mutex_);
    owner_.revokedAppIDs_.push_back(appID);
  }

 private:
  FakeFacebookRequests& owner_;
};

FakeFacebookRequests::FakeFacebookRequests()
    : Fake("facebookRequests"),
      authorizationReplies_{FakeReply::withBody(R"({"access_token":"client-token","permissions":[]})")},
      descriptionReplies_{FakeReply::withBody(R"("do something new")")},
      thread_([this] { deliverAll(); }) {
}

FakeFacebookRequests::~FakeFacebookRequests() {
  dropHeld();
  {
    const std::lock_guard lock(mutex_);
    ending_ = true;
  }
  changed_.notify_all();
  thread_.join();
}

std::shared_ptr<TKFacebookAuthorizationRequest> FakeFacebookRequests::initWithAppId(
    const std::string& appId,
    const std::string& bundleId,
    const std::optional<RVPermissionSet>& permissions,
    const std::optional<std::string>& audience) {
  begin("initWithAppId");
  auto exchange = std::make_shared<FakeAuthorizationExchange>();
  exchange->appId = appId;
  exchange->bundleId = bundleId;
  exchange->permissions = permissions;
  exchange->audience = audience;
  const std::lock_guard lock(mutex_);
  authorizations_.push_back(exchange);
  return std::make_shared<Authorization>(*this, std::move(exchange));
}

std::shared_ptr<TKFacebookPermissionDescriptionRequest> FakeFacebookRequests::initWithPermissions(
    const RVPermissionSet& permissions,
    const std::optional<std::string>& audience) {
  begin("initWithPermissions");
  auto exchange = std::make_shared<FakeDescriptionExchange>();
  exchange->permissions = permissions;
  exchange->audience = audience;
  const std::lock_guard lock(mutex_);
  descriptions_.push_back(exchange);
  return std::make_shared<Description>(*this, std::move(exchange));
}

std::shared_ptr<TKFacebookSession> FakeFacebookRequests::initSession() {
  begin("initSession");
  const std::lock_guard lock(mutex_);
  ++sessionsMade_;
  return std::make_shared<Session>(*this);
}

void FakeFacebookRequests::replyToAuthorizations(std::vector<FakeReply> replies) {
  const std::lock_guard lock(mutex_);
  authorizationReplies_.assign(replies.begin(), replies.end());
}

void FakeFacebookRequests::replyToDescriptions(std::vector<FakeReply> replies) {
  const std::lock_guard lock(mutex_);
  descriptionReplies_.assign(replies.begin(), replies.end());
}

bool FakeFacebookRequests::waitForHeld(std::size_t count) {
  std::unique_lock lock(mutex_);
  return changed_.wait_for(lock, std::chrono::seconds(30), [&] { return held_.size() >= count; });
}

void FakeFacebookRequests::releaseHeld() {
  {
    const std::lock_guard lock(mutex_);
    std::move(held_.begin(), held_.end(), std::back_inserter(due_));
    held_.clear();
  }
  changed_.notify_all();
}

void FakeFacebookRequests::dropHeld() {
  {
    const std::lock_guard lock(mutex_);
    for (Delivery& delivery : held_) delivery.reply.delivery = FakeReply::Delivery::kDropped;
  }
  releaseHeld();
}

void FakeFacebookRequests::waitUntilDelivered() {
  std::unique_lock lock(mutex_);
  changed_.wait(lock, [&] { return due_.empty() && !delivering_; });
}

std::vector<FakeAuthorizationExchange> FakeFacebookRequests::authorizations() const {
  const std::lock_guard lock(mutex_);
  std::vector<FakeAuthorizationExchange> copies;
  for (const auto& exchange : authorizations_) copies.push_back(*exchange);
  return copies;
}

std::vector<FakeDescriptionExchange> FakeFacebookRequests::descriptions() const {
  const std::lock_guard lock(mutex_);
  std::vector<FakeDescriptionExchange> copies;
  for (const auto& exchange : descriptions_) copies.push_back(*exchange);
  return copies;
}

std::size_t FakeFacebookRequests::sessionsMade() const {
  const std::lock_guard lock(mutex_);
  return sessionsMade_;
}

std::vector<std::string> FakeFacebookRequests::revokedAppIDs() const {
  const std::lock_guard lock(mutex_);
  return revokedAppIDs_;
}

std::size_t FakeFacebookRequests::handlerExceptions() const {
  const std::lock_guard lock(mutex_);
  return handlerExceptions_;
}

void FakeFacebookRequests::perform(std::deque<FakeReply>& replies, TKFacebookRequestHandler handler) {
  {
    const std::lock_guard lock(mutex_);
    FakeReply reply = replies.front();
    if (replies.size() > 1) replies.pop_front();
    if (reply.delivery == FakeReply::Delivery::kThrown)
      throw std::runtime_error("the exchange could not be started");
    auto& destination = reply.delivery == FakeReply::Delivery::kHeld ? held_ : due_;
    destination.push_back({std::move(reply), std::move(handler)});
  }
  changed_.notify_all();
}

void FakeFacebookRequests::deliverAll() {
  std::unique_lock lock(mutex_);
  for (;;) {
    changed_.wait(lock, [&] { return ending_ || !due_.empty(); });
    if (due_.empty()) return;
    Delivery delivery = std::move(due_.front());
    due_.pop_front();
    delivering_ = true;
    lock.unlock();
    bool threw = false;
    if (delivery.reply.delivery != FakeReply::Delivery::kDropped) {
      try {
        delivery.handler(delivery.reply.body, delivery.reply.response, delivery.reply.error);
      } catch (...) {
        threw = true;
      }
    }
    delivery.handler = nullptr;
    lock.lock();
    if (threw) ++handlerExceptions_;
    delivering_ = false;
    changed_.notify_all();
  }
}

}  // namespace fakes
