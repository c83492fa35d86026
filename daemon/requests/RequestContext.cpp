#include "daemon/requests/RequestContext.h"

#include <utility>

namespace requests {
namespace {

thread_local std::shared_ptr<RequestContext> currentContext;

void runOnce(std::function<void()>& callback) {
  if (const auto owed = std::exchange(callback, nullptr)) owed();
}

}  // namespace

std::string shareKeyOf(const std::string& clientKey, clients::Evidence evidence) {
  if (evidence == clients::Evidence::kUnknown) return {};
  return std::to_string(static_cast<std::int64_t>(evidence)) + " " + clientKey;
}

RequestContext::RequestContext(std::string clientKey,
                               std::shared_ptr<WaitingLimiter> limiter,
                               RVDictionary details,
                               clients::Evidence evidence)
    : clientKey_(std::move(clientKey)),
      limiter_(std::move(limiter)),
      details_(std::move(details)),
      evidence_(evidence) {
}

RequestContext::~RequestContext() = default;

std::optional<VoidReason> RequestContext::voidReason() const {
  const std::lock_guard lock(reasonMutex_);
  return reason_;
}

void RequestContext::makeVoid(VoidReason reason) {
  beginVoid(reason);
  // Whoever gets this lock from now on sees the reason; whoever had it has written.
  const std::lock_guard effects(effects_);
}

void RequestContext::beginVoid(VoidReason reason) {
  {
    const std::lock_guard lock(reasonMutex_);
    if (reason_ && reason_ != VoidReason::kOutdated) return;
    reason_ = reason;
  }
  const std::lock_guard lock(callbacksMutex_);
  for (auto& callback : callbacks_) runOnce(callback);
}

RequestContext::Registration::Registration(RequestContext* context,
                                           std::list<std::function<void()>>::iterator entry)
    : context_(context),
      entry_(entry) {
}

RequestContext::Registration::Registration(Registration&& other) noexcept
    : context_(std::exchange(other.context_, nullptr)),
      entry_(other.entry_) {
}

RequestContext::Registration& RequestContext::Registration::operator=(Registration&& other) noexcept {
  std::swap(context_, other.context_);
  std::swap(entry_, other.entry_);
  return *this;
}

RequestContext::Registration::~Registration() {
  if (context_ == nullptr) return;
  const std::lock_guard lock(context_->callbacksMutex_);
  context_->callbacks_.erase(entry_);
}

RequestContext::Registration RequestContext::onVoid(std::function<void()> callback) {
  const std::lock_guard lock(callbacksMutex_);
  callbacks_.push_back(std::move(callback));
  // Where the reason is set while we hold the lock, whoever set it comes to the entry after us.
  if (isVoid()) runOnce(callbacks_.back());
  return {this, std::prev(callbacks_.end())};
}

bool RequestContext::unlessVoid(const std::function<void()>& work) {
  const std::lock_guard effects(effects_);
  if (isVoid()) return false;
  work();
  return true;
}

RequestContext::Waiting::Waiting(RequestContext* context)
    : context_(context) {
}

RequestContext::Waiting::~Waiting() {
  context_->endWaiting();
}

std::unique_ptr<RequestContext::Waiting> RequestContext::beginWaiting() {
  if (isVoid()) return nullptr;
  {
    const std::lock_guard lock(waitingMutex_);
    if (waiting_ > 0 || limiter_ == nullptr || limiter_->beginWaiting(shareKey())) {
      ++waiting_;
      return std::make_unique<Waiting>(this);
    }
  }
  makeVoid(VoidReason::kLimitReached);
  return nullptr;
}

void RequestContext::endWaiting() {
  const std::lock_guard lock(waitingMutex_);
  if (--waiting_ == 0 && limiter_ != nullptr) limiter_->endWaiting(shareKey());
}

std::shared_ptr<RequestContext> RequestContext::current() {
  return currentContext;
}

RequestContext::Scope::Scope(std::shared_ptr<RequestContext> context)
    : previous_(std::exchange(currentContext, std::move(context))) {
}

RequestContext::Scope::~Scope() {
  currentContext = std::move(previous_);
}

}  // namespace requests
