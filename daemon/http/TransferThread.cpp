#include "daemon/http/TransferThread.h"

#include <curl/curl.h>

#include <algorithm>
#include <exception>
#include <stdexcept>
#include <utility>

#include "daemon/http/CurlLibrary.h"
#include "daemon/http/OpenTransfer.h"
#include "daemon/http/TransferErrors.h"
#include "daemon/log/Log.h"

namespace http {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

void* newMulti() {
  setUpCurlLibrary();
  void* multi = curl_multi_init();
  if (multi == nullptr) throw std::runtime_error("libcurl gives no multi handle");
  return multi;
}

}  // namespace

TransferThread::TransferThread(RVLogService& log)
    : log_(log),
      multi_(newMulti()),
      thread_([this] { run(); }) {
}

TransferThread::~TransferThread() {
  stop(milliseconds(0));
  curl_multi_cleanup(multi_);
}

TransferThread::ID TransferThread::start(Transfer transfer, TKFacebookRequestHandler handler) {
  auto opened = std::make_unique<OpenTransfer>(std::move(transfer), std::move(handler));
  const std::lock_guard lock(mutex_);
  const ID id = ++lastID_;
  if (hasStopped_) return id;
  orders_.started.emplace_back(id, std::move(opened));
  curl_multi_wakeup(multi_);
  return id;
}

void TransferThread::fail(RVError error, TKFacebookRequestHandler handler) {
  Failure failure{std::move(error), std::move(handler)};
  const std::lock_guard lock(mutex_);
  if (hasStopped_) return;
  orders_.failures.push_back(std::move(failure));
  curl_multi_wakeup(multi_);
}

void TransferThread::cancel(ID transfer) {
  const std::lock_guard lock(mutex_);
  if (hasStopped_) return;
  orders_.cancelled.push_back(transfer);
  curl_multi_wakeup(multi_);
}

void TransferThread::after(milliseconds time, std::function<void()> work) {
  Timer timer{steady_clock::now() + time, std::move(work)};
  const std::lock_guard lock(mutex_);
  if (hasStopped_) return;
  orders_.timers.push_back(std::move(timer));
  curl_multi_wakeup(multi_);
}

void TransferThread::stop(milliseconds grace) {
  const std::lock_guard stopping(stopMutex_);
  if (!thread_.joinable()) return;
  {
    const std::lock_guard lock(mutex_);
    orders_.stopBy = steady_clock::now() + grace;
  }
  curl_multi_wakeup(multi_);
  thread_.join();
}

void TransferThread::run() {
  while (carryOut(takeOrders())) {
    int running = 0;
    curl_multi_perform(multi_, &running);
    deliverFinished();
    runDueTimers();
    curl_multi_poll(multi_, nullptr, 0, static_cast<int>(longestWait().count()), nullptr);
  }
}

TransferThread::Orders TransferThread::takeOrders() {
  const std::lock_guard lock(mutex_);
  return std::exchange(orders_, {});
}

// Returns whether the thread goes on.
bool TransferThread::carryOut(Orders orders) {
  if (orders.stopBy) stopBy_ = orders.stopBy;
  for (auto& [error, handler] : orders.failures)
    runHandler(std::move(handler), std::nullopt, std::nullopt, error);
  for (auto& [id, transfer] : orders.started) open(id, std::move(transfer));
  for (const ID id : orders.cancelled) end(id, transferError(TransferErrorCode::kCancelled));
  for (auto& [at, work] : orders.timers) timers_.emplace(at, std::move(work));
  if (!stopBy_) return true;

  timers_.clear();
  endAll(steady_clock::now() >= *stopBy_);
  if (!open_.empty()) return true;
  const std::lock_guard lock(mutex_);
  // Handlers that have just run may have ordered something more.
  hasStopped_ = orders_.started.empty() && orders_.failures.empty();
  return !hasStopped_;
}

void TransferThread::open(ID id, std::unique_ptr<OpenTransfer> transfer) {
  std::optional<RVError> error = transfer->prepare();
  if (!error && curl_multi_add_handle(multi_, transfer->handle()) != CURLM_OK)
    error = transferError(TransferErrorCode::kFailed);
  if (error)
    runHandler(transfer->takeHandler(), std::nullopt, std::nullopt, error);
  else
    open_.emplace(id, std::move(transfer));
}

void TransferThread::deliverFinished() {
  int remaining = 0;
  while (const CURLMsg* message = curl_multi_info_read(multi_, &remaining)) {
    if (message->msg != CURLMSG_DONE) continue;
    CURL* const handle = message->easy_handle;
    const CURLcode result = message->data.result;
    const auto entry = std::find_if(
        open_.begin(), open_.end(), [handle](const auto& one) { return one.second->handle() == handle; });
    if (entry == open_.end()) continue;
    const std::unique_ptr<OpenTransfer> transfer = std::move(entry->second);
    open_.erase(entry);
    curl_multi_remove_handle(multi_, handle);
    TransferOutcome outcome = transfer->takeOutcome(result);
    runHandler(transfer->takeHandler(), std::move(outcome.body), outcome.response, outcome.error);
  }
}

void TransferThread::runDueTimers() {
  // Not those that are set by what runs here: transfers come in between.
  const auto due = timers_.upper_bound(steady_clock::now());
  std::vector<std::function<void()>> works;
  for (auto timer = timers_.begin(); timer != due; timer = timers_.erase(timer))
    works.push_back(std::move(timer->second));
  for (const auto& work : works) guarded("What was to run after a pause", work);
}

void TransferThread::end(ID id, const RVError& error) {
  const auto entry = open_.find(id);
  if (entry == open_.end()) return;
  const std::unique_ptr<OpenTransfer> transfer = std::move(entry->second);
  open_.erase(entry);
  curl_multi_remove_handle(multi_, transfer->handle());
  runHandler(transfer->takeHandler(), std::nullopt, std::nullopt, error);
}

void TransferThread::endAll(bool thoseThatMayEndLate) {
  std::vector<ID> ended;
  for (const auto& [id, transfer] : open_)
    if (thoseThatMayEndLate || !transfer->mayEndLate()) ended.push_back(id);
  for (const ID id : ended) end(id, transferError(TransferErrorCode::kStopping));
}

milliseconds TransferThread::longestWait() const {
  constexpr milliseconds kUntilWoken = std::chrono::hours(1);
  const auto until = [&](steady_clock::time_point time) {
    return std::clamp(
        std::chrono::ceil<milliseconds>(time - steady_clock::now()), milliseconds(0), kUntilWoken);
  };
  if (!stopBy_) return timers_.empty() ? kUntilWoken : until(timers_.begin()->first);
  return open_.empty() ? milliseconds(0) : until(*stopBy_);
}

void TransferThread::guarded(const char* what, const std::function<void()>& work) {
  try {
    work();
  } catch (const std::exception& exception) {
    logging::error(log_, "%@ threw: %@", {RVValue(what), RVValue(exception.what())});
  } catch (...) {
    logging::error(log_, "%@ threw something that is no std::exception", {RVValue(what)});
  }
}

void TransferThread::runHandler(TKFacebookRequestHandler handler,
                                std::optional<std::string> body,
                                const std::optional<TKHTTPResponse>& response,
                                const std::optional<RVError>& error) {
  guarded("The handler of a transfer", [&] { handler(body, response, error); });
  if (body) wipeText(*body);
}

}  // namespace http
