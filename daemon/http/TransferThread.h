// Exchanges with a server, all on one thread.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "host/RVDKeychainManager.h"
#include "host/RVLog.h"
#include "host/TKFacebookRequests.h"

namespace http {

inline constexpr std::size_t kMaximumBodySize = 1024 * 1024;  // bytes of an answer's body
inline constexpr std::size_t kMaximumHeaderSize = 64 * 1024;  // bytes of all its header lines

// One POST of a form.
struct Transfer {
  std::string url;  // one that readServerURL allows; anything else fails before a connection is made
  std::vector<std::pair<std::string, std::string>> form;  // names and values, sent in this order
  std::optional<RVSecret> bearerToken;                    // none, or an empty one: no Authorization header
  std::string acceptLanguage;                             // empty: no Accept-Language header
  std::chrono::milliseconds timeout{60'000};              // for the whole exchange
  std::string caFile;       // PEM file of the authorities to trust; empty: the system's
  bool mayEndLate = false;  // whether stop() gives it the time that it allows
};

class OpenTransfer;

// Carries out any number of transfers at a time. Nothing is sent twice: no redirect is followed, no
// connection is used again, nothing is retried. The environment (proxies, for example) has no say.
//
// Called from any thread, handlers included.
class TransferThread {
 public:
  using ID = std::uint64_t;

  // log: outlives this object.
  explicit TransferThread(RVLogService& log);
  TransferThread(const TransferThread&) = delete;
  TransferThread& operator=(const TransferThread&) = delete;

  // As stop(0).
  ~TransferThread();

  // Sends the transfer and returns at once. The handler runs exactly once, on the transfer thread, and
  // is destroyed there right afterwards; what it throws is logged. It does not wait for another transfer.
  // It receives either the body (of any status, a redirect's included) or an error (see
  // TransferErrorCode), never both, and the response wherever the server sent a status. Once the thread
  // has stopped the handler is destroyed unused, on the calling thread.
  ID start(Transfer transfer, TKFacebookRequestHandler handler);

  // Has the handler run with the error as if a transfer had failed with it.
  void fail(RVError error, TKFacebookRequestHandler handler);

  // Ends the transfer, which fails with kCancelled; one that has ended already is left alone. Returns at
  // once and runs no handler itself.
  void cancel(ID transfer);

  // Has the work run on the transfer thread when the time has passed. It does not wait; what it throws is
  // logged. It is destroyed unused where the thread is told to stop before.
  void after(std::chrono::milliseconds time, std::function<void()> work);

  // Ends all transfers and the thread: each fails with kStopping, those with mayEndLate only after
  // they had `grace` to end by themselves. Returns when every handler has run and the thread has ended. Not
  // called from a handler.
  void stop(std::chrono::milliseconds grace);

 private:
  struct Failure {
    RVError error;
    TKFacebookRequestHandler handler;
  };
  struct Timer {
    std::chrono::steady_clock::time_point at;
    std::function<void()> work;
  };
  // What other threads have asked for since the transfer thread last looked.
  struct Orders {
    std::vector<std::pair<ID, std::unique_ptr<OpenTransfer>>> started;
    std::vector<Failure> failures;
    std::vector<ID> cancelled;
    std::vector<Timer> timers;
    std::optional<std::chrono::steady_clock::time_point> stopBy;
  };

  void run();
  Orders takeOrders();
  bool carryOut(Orders orders);
  void open(ID id, std::unique_ptr<OpenTransfer> transfer);
  void deliverFinished();
  void end(ID id, const RVError& error);
  void runDueTimers();
  void endAll(bool thoseThatMayEndLate);
  std::chrono::milliseconds longestWait() const;
  // Runs the work; what it throws is logged under the name of what it is.
  void guarded(const char* what, const std::function<void()>& work);
  void runHandler(TKFacebookRequestHandler handler,
                  std::optional<std::string> body,
                  const std::optional<TKHTTPResponse>& response,
                  const std::optional<RVError>& error);

  RVLogService& log_;
  void* const multi_;  // CURLM*

  std::mutex mutex_;
  ID lastID_ = 0;
  bool hasStopped_ = false;  // the thread takes no more orders
  Orders orders_;

  // The transfer thread's own.
  std::map<ID, std::unique_ptr<OpenTransfer>> open_;
  std::multimap<std::chrono::steady_clock::time_point, std::function<void()>> timers_;
  std::optional<std::chrono::steady_clock::time_point> stopBy_;

  std::mutex stopMutex_;  // one stop at a time
  std::thread thread_;
};

}  // namespace http
