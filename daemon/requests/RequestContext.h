// What the daemon's services know about the request that they are called for.
#pragma once

#include <atomic>
#include <functional>
#include <list>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "daemon/clients/Evidence.h"
#include "host/Values.h"

namespace requests {

// Why a request became void.
enum class VoidReason {
  kCallerGone,
  kAccountRemoved,
  kClientRevoked,
  kStopping,
  kLimitReached,
  kOutdated,        // another request of the client was decided meanwhile; it is begun anew
  kWeakerEvidence,  // a record of its client was made with stronger evidence than the request has
};

// Counts the requests that wait, for each client and in all. Implemented by the request table.
class WaitingLimiter {
 public:
  virtual ~WaitingLimiter() = default;
  // Whether one more request of the client may wait; where it may, it is counted until endWaiting.
  virtual bool beginWaiting(const std::string& clientKey) = 0;
  virtual void endWaiting(const std::string& clientKey) = 0;
};

// Tells clients apart for what is counted and shared out between them. Those that nothing is known about are
// one, since they are as many as somebody makes of them; who is known with another certainty may be another.
std::string shareKeyOf(const std::string& clientKey, clients::Evidence evidence);

// One request on its way through a plug-in. A request that is void has no effect any more: its alert is
// taken down, its transfers are ended, and no record, credential or log entry is written for it.
//
// Thread-safe. Services find the request of a plug-in's call as the calling thread's current one, and
// keep it with what they start for it (a transfer, an account object).
class RequestContext {
 public:
  // clientKey: tells clients apart for the limits. limiter: may be null (nothing is counted). details: see
  // clientDetails.
  RequestContext(std::string clientKey,
                 std::shared_ptr<WaitingLimiter> limiter,
                 RVDictionary details = {},
                 clients::Evidence evidence = clients::Evidence::kUnknown);
  RequestContext(const RequestContext&) = delete;
  RequestContext& operator=(const RequestContext&) = delete;
  ~RequestContext();

  const std::string& clientKey() const { return clientKey_; }

  std::string shareKey() const { return shareKeyOf(clientKey_, evidence_); }

  // What an alert tells about the client besides the plug-in's words, by the keys of Agent1's description.
  const RVDictionary& clientDetails() const { return details_; }

  // How it was known, when the request came, which application its client is. Unknown where its client has no
  // ID, and for what the user has the daemon do.
  clients::Evidence evidence() const { return evidence_; }

  bool isVoid() const { return voidReason().has_value(); }
  std::optional<VoidReason> voidReason() const;

  // Makes the request void and runs what was registered with onVoid, on this thread. Waits for an
  // effect that is being written (see unlessVoid); once this has returned, none is written any more. The
  // first reason stays, but for kOutdated, which every other one replaces.
  void makeVoid(VoidReason reason);

  // The same without waiting: an effect that is being written may still come to its end, but none begins.
  void beginVoid(VoidReason reason);

  // Unregisters when it is dropped; the callback does not run after that, nor is it still running.
  class Registration {
   public:
    Registration() = default;
    Registration(Registration&& other) noexcept;
    Registration& operator=(Registration&& other) noexcept;
    ~Registration();

   private:
    friend class RequestContext;
    Registration(RequestContext* context, std::list<std::function<void()>>::iterator entry);
    RequestContext* context_ = nullptr;
    std::list<std::function<void()>>::iterator entry_;
  };

  // Has the callback run once when the request becomes void, or now where it is. The context must
  // outlive the registration. Callbacks do not register, drop registrations or wait.
  [[nodiscard]] Registration onVoid(std::function<void()> callback);

  // Runs the work, which writes an effect of the request, unless the request is void. Returns whether it
  // ran. The work may call unlessVoid again.
  bool unlessVoid(const std::function<void()>& work);

  // Held while the request waits for the user or the server.
  class Waiting {
   public:
    explicit Waiting(RequestContext* context);
    Waiting(const Waiting&) = delete;
    Waiting& operator=(const Waiting&) = delete;
    ~Waiting();

   private:
    RequestContext* context_;
  };

  // Counts the request as a waiting one until the returned object goes; a request that waits twice at the
  // same time counts once. Null where the request is void, or where a limit is reached: it is then made
  // void for that reason.
  [[nodiscard]] std::unique_ptr<Waiting> beginWaiting();

  // Says that the request has stored what was decided about its client.
  void decisionStored() { hasStoredDecision_ = true; }
  bool hasStoredDecision() const { return hasStoredDecision_; }

  // Says that what is decided about the client has changed since the request began: what it still wants to
  // ask may be settled already.
  void outdate() { isOutdated_ = true; }
  bool isOutdated() const { return isOutdated_; }

  // The request that the calling thread is working for; null where it works for none.
  static std::shared_ptr<RequestContext> current();

  // Makes a request the calling thread's current one as long as the scope lives.
  class Scope {
   public:
    explicit Scope(std::shared_ptr<RequestContext> context);
    Scope(const Scope&) = delete;
    Scope& operator=(const Scope&) = delete;
    ~Scope();

   private:
    std::shared_ptr<RequestContext> previous_;
  };

 private:
  void endWaiting();

  const std::string clientKey_;
  const std::shared_ptr<WaitingLimiter> limiter_;
  const RVDictionary details_;
  const clients::Evidence evidence_;

  // Locks are taken in this order: effects_, reasonMutex_; callbacksMutex_, reasonMutex_; waitingMutex_,
  // the limiter's own.
  std::recursive_mutex effects_;  // held while an effect is written
  mutable std::mutex reasonMutex_;
  std::optional<VoidReason> reason_;

  std::recursive_mutex callbacksMutex_;
  std::list<std::function<void()>> callbacks_;

  std::mutex waitingMutex_;
  int waiting_ = 0;

  std::atomic_bool hasStoredDecision_ = false;
  std::atomic_bool isOutdated_ = false;
};

}  // namespace requests
