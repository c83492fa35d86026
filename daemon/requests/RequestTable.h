// The requests that are on their way.
#pragma once

#include <cstddef>
#include <functional>
#include <list>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "daemon/requests/RequestContext.h"
#include "daemon/requests/RequestPool.h"
#include "host/RVDAccountAccessPlugin.h"
#include "host/Values.h"

namespace requests {

// Who asks for what, by the values that were given.
struct RequestKey {
  std::string clientKey;  // tells clients apart
  std::string accountType;
  std::optional<RVValue> appID;
  std::optional<RVValue> permissions;  // a list is compared as a set of names
  std::optional<RVValue> audience;
  // Two callers that are known with different certainty are not asked for together.
  clients::Evidence evidence = clients::Evidence::kUnknown;

  // The request of a client, with what of its options tells requests apart.
  static RequestKey forOptions(std::string clientKey,
                               clients::Evidence evidence,
                               std::string accountType,
                               const RVDictionary& options);

  friend bool operator==(const RequestKey&, const RequestKey&) = default;
};

// How a request ended.
struct Outcome {
  enum class Kind {
    kDecided,       // granted and error hold the decision
    kVoid,          // the request became void: nothing was decided
    kLimitReached,  // it would have had to wait, and too many do
    kFailed,        // the plug-in's call threw, or dropped its completion
  };
  Kind kind = Kind::kFailed;
  bool granted = false;
  std::optional<RVError> error;
};

// Runs requests on the pool, makes equal ones of one client one, and makes them void.
//
// When a request has stored a decision, the others of its client and account type are outdated: one that
// then has yet to ask the user becomes void for that reason (see AlertService) and is begun anew, with the
// same callers, so that nobody is asked what the decision has settled.
//
// Every caller's answer is called exactly once, on a thread of the pool or the one on which the plug-in
// answers, or on the submitting thread where the request cannot even begin. Thread-safe; no lock is held
// while an answer runs or is destroyed.
class RequestTable {
 public:
  using Answer = std::function<void(const Outcome&)>;
  // A call of the plug-in. Runs with the request's context as the current one; what it throws ends the
  // request as failed.
  using Work = std::function<void(RVDAccessCompletion)>;

  struct Caller {
    std::string name;  // unique on the bus; empty for one that is not missed when it leaves
    Answer answer;
  };

  struct Observer {
    // A plug-in's call threw this.
    std::function<void(const std::string& reason)> failed;
    // A request has come to its end, and those that it outdates know it; its callers are answered next.
    std::function<void(const std::shared_ptr<RequestContext>& context)> ended;
  };

  // pool: outlives this object. observer: its functions are called from any thread and do not throw.
  RequestTable(RequestPool& pool, Observer observer);

  // Has the caller answered by an equal request that is on its way, or begins one. details: see
  // RequestContext.
  void submit(RequestKey key,
              Caller caller,
              std::shared_ptr<WaitingLimiter> limiter,
              RVDictionary details,
              Work work);

  // As submit, but never made one with another request.
  void submitAlone(RequestKey key, Caller caller, std::shared_ptr<WaitingLimiter> limiter, Work work);

  // Forgets the caller's share in its requests. Those that nobody is left to ask for become void; an
  // effect that is being written is not waited for.
  void callerLeft(const std::string& name);

  using Selection = std::function<bool(const RequestKey&)>;

  // As long as it lives, requests of the selection that begin are void from the start.
  class Barrier {
   public:
    Barrier(Barrier&& other) noexcept;
    Barrier& operator=(Barrier&&) = delete;
    ~Barrier();

   private:
    friend class RequestTable;
    Barrier(RequestTable* table, std::list<std::pair<VoidReason, Selection>>::iterator entry);
    RequestTable* table_;
    std::list<std::pair<VoidReason, Selection>>::iterator entry_;
  };

  // Makes the selected requests void and keeps new ones out. When this has returned, no selected request
  // writes anything any more. Not called from a request.
  [[nodiscard]] Barrier makeVoid(VoidReason reason, Selection selection);

 private:
  struct Request;
  class Debt;

  static std::shared_ptr<Request> makeRequest(RequestKey key,
                                              bool isShared,
                                              std::shared_ptr<WaitingLimiter> limiter,
                                              RVDictionary details,
                                              Work work);
  std::optional<VoidReason> add(const std::shared_ptr<Request>& request);
  void begin(const std::shared_ptr<Request>& request, std::optional<VoidReason> reason);
  void finish(const std::shared_ptr<Request>& request, Outcome outcome);

  RequestPool& pool_;
  const Observer observer_;

  std::mutex mutex_;  // protects everything below, and the callers of each request
  std::unordered_multimap<std::string, std::shared_ptr<Request>> requests_;  // by client key
  std::unordered_multimap<std::string, std::shared_ptr<Request>> requestsOfCaller_;
  std::list<std::pair<VoidReason, Selection>> barriers_;
};

}  // namespace requests
