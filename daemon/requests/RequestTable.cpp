#include "daemon/requests/RequestTable.h"

#include <algorithm>
#include <atomic>
#include <exception>
#include <iterator>
#include <thread>
#include <utility>

namespace requests {
namespace {

// A list of permissions without its order and repetitions: the names in byte order, then what is no name.
RVValue asSet(const RVValue& permissions) {
  if (permissions.array() == nullptr) return permissions;
  RVPermissionSet names;
  RVArray others;
  for (const RVValue& element : *permissions.array()) {
    if (element.string() != nullptr)
      names.insert(*element.string());
    else
      others.push_back(element);
  }
  RVArray all(names.begin(), names.end());
  all.insert(all.end(), others.begin(), others.end());
  return all;
}

std::optional<RVValue> valueForKey(const RVDictionary& options, std::string_view key) {
  const RVValue* value = RVValueForKey(options, key);
  return value != nullptr ? std::optional(*value) : std::nullopt;
}

}  // namespace

RequestKey RequestKey::forOptions(std::string clientKey,
                                  clients::Evidence evidence,
                                  std::string accountType,
                                  const RVDictionary& options) {
  RequestKey key{std::move(clientKey),
                 std::move(accountType),
                 valueForKey(options, RVFacebookAppIdKey),
                 valueForKey(options, RVFacebookPermissionsKey),
                 valueForKey(options, RVFacebookAudienceKey),
                 evidence};
  if (key.permissions) key.permissions = asSet(*key.permissions);
  return key;
}

struct RequestTable::Request {
  const RequestKey key;
  const bool isShared;
  const std::shared_ptr<WaitingLimiter> limiter;
  const Work work;
  const std::shared_ptr<RequestContext> context;
  std::vector<Caller> callers;  // protected by the table's lock
};

// What is owed to the callers of a request: pays with a failure when the plug-in lets go of it unpaid.
//
// What the plug-in answers on the thread of its call is held back until the call has returned, because
// a call that throws has failed, whatever it said before. An answer on another thread is paid at once.
class RequestTable::Debt {
 public:
  Debt(RequestTable* table, std::shared_ptr<Request> request)
      : table_(table),
        request_(std::move(request)) {}
  Debt(const Debt&) = delete;
  Debt& operator=(const Debt&) = delete;
  ~Debt() { pay({}); }

  void run(const Work& work, const std::shared_ptr<Debt>& self) {
    callThread_ = std::this_thread::get_id();
    isCalling_ = true;
    work([self](bool granted, const std::optional<RVError>& error) {
      self->answer({Outcome::Kind::kDecided, granted, error});
    });
    isCalling_ = false;
    if (held_) pay(*std::move(held_));
  }

  void pay(Outcome outcome) {
    if (!isPaid_.test_and_set()) table_->finish(request_, std::move(outcome));
  }

 private:
  void answer(Outcome outcome) {
    if (std::this_thread::get_id() != callThread_ || !isCalling_)
      pay(std::move(outcome));
    else if (!held_)
      held_ = std::move(outcome);
  }

  RequestTable* const table_;
  const std::shared_ptr<Request> request_;
  std::atomic_flag isPaid_;
  std::thread::id callThread_;  // set before the completion exists
  // Of the call's thread alone.
  bool isCalling_ = false;
  std::optional<Outcome> held_;
};

RequestTable::RequestTable(RequestPool& pool, Observer observer)
    : pool_(pool),
      observer_(std::move(observer)) {
}

void RequestTable::submit(RequestKey key,
                          Caller caller,
                          std::shared_ptr<WaitingLimiter> limiter,
                          RVDictionary details,
                          Work work) {
  const auto request =
      makeRequest(std::move(key), true, std::move(limiter), std::move(details), std::move(work));
  std::optional<VoidReason> reason;
  {
    const std::lock_guard lock(mutex_);
    const auto [first, last] = requests_.equal_range(request->key.clientKey);
    const auto equal = std::find_if(first, last, [&](const auto& entry) {
      const Request& other = *entry.second;
      return other.isShared && other.key == request->key && !other.context->isVoid();
    });
    if (equal != last) {
      requestsOfCaller_.emplace(caller.name, equal->second);
      equal->second->callers.push_back(std::move(caller));
      return;
    }
    request->callers.push_back(std::move(caller));
    reason = add(request);
  }
  begin(request, reason);
}

void RequestTable::submitAlone(RequestKey key,
                               Caller caller,
                               std::shared_ptr<WaitingLimiter> limiter,
                               Work work) {
  const auto request = makeRequest(std::move(key), false, std::move(limiter), {}, std::move(work));
  request->callers.push_back(std::move(caller));
  std::optional<VoidReason> reason;
  {
    const std::lock_guard lock(mutex_);
    reason = add(request);
  }
  begin(request, reason);
}

std::shared_ptr<RequestTable::Request> RequestTable::makeRequest(RequestKey key,
                                                                 bool isShared,
                                                                 std::shared_ptr<WaitingLimiter> limiter,
                                                                 RVDictionary details,
                                                                 Work work) {
  auto context = std::make_shared<RequestContext>(key.clientKey, limiter, std::move(details), key.evidence);
  return std::make_shared<Request>(
      Request{std::move(key), isShared, std::move(limiter), std::move(work), std::move(context), {}});
}

// The lock is held. Answers why the request is to be void from the start, where it is.
std::optional<VoidReason> RequestTable::add(const std::shared_ptr<Request>& request) {
  for (const Caller& caller : request->callers) requestsOfCaller_.emplace(caller.name, request);
  requests_.emplace(request->key.clientKey, request);
  for (const auto& [reason, selection] : barriers_)
    if (selection(request->key)) return reason;
  return std::nullopt;
}

void RequestTable::begin(const std::shared_ptr<Request>& request, std::optional<VoidReason> reason) {
  const auto debt = std::make_shared<Debt>(this, request);
  if (reason) {
    request->context->makeVoid(*reason);
    return debt->pay({});
  }
  pool_.submit([this, debt, request] {
    const RequestContext::Scope scope(request->context);
    try {
      if (!request->context->isVoid()) debt->run(request->work, debt);
      return;
    } catch (const std::exception& exception) {
      observer_.failed(exception.what());
    } catch (...) {
      observer_.failed("an exception of an unknown type");
    }
    debt->pay({});
  });
}

void RequestTable::finish(const std::shared_ptr<Request>& request, Outcome outcome) {
  std::vector<Caller> callers;
  std::shared_ptr<Request> renewed;
  std::optional<VoidReason> reason;
  {
    const std::lock_guard lock(mutex_);
    callers.swap(request->callers);
    const auto remove = [&](auto& map, const std::string& key) {
      auto [entry, last] = map.equal_range(key);
      while (entry != last) entry = entry->second == request ? map.erase(entry) : std::next(entry);
    };
    remove(requests_, request->key.clientKey);
    for (const Caller& caller : callers) remove(requestsOfCaller_, caller.name);
    if (request->context->hasStoredDecision()) {
      const auto [first, last] = requests_.equal_range(request->key.clientKey);
      for (auto entry = first; entry != last; ++entry)
        if (entry->second->key.accountType == request->key.accountType) entry->second->context->outdate();
    }
    // Within the lock, so that no caller that leaves and no barrier is missed.
    if (request->context->voidReason() == VoidReason::kOutdated && !callers.empty()) {
      const auto& details = request->context->clientDetails();
      renewed = makeRequest(request->key, request->isShared, request->limiter, details, request->work);
      renewed->callers.swap(callers);
      reason = add(renewed);
    }
  }
  observer_.ended(request->context);
  if (renewed != nullptr) return begin(renewed, reason);
  if (const auto voidReason = request->context->voidReason())
    outcome = {*voidReason == VoidReason::kLimitReached ? Outcome::Kind::kLimitReached : Outcome::Kind::kVoid,
               false,
               std::nullopt};
  for (const Caller& caller : callers) caller.answer(outcome);
}

void RequestTable::callerLeft(const std::string& name) {
  std::vector<Caller> left;  // destroyed without the lock
  std::vector<std::shared_ptr<Request>> abandoned;
  {
    const std::lock_guard lock(mutex_);
    const auto [first, last] = requestsOfCaller_.equal_range(name);
    for (auto entry = first; entry != last; ++entry) {
      auto& callers = entry->second->callers;
      const auto gone = std::stable_partition(
          callers.begin(), callers.end(), [&](const Caller& caller) { return caller.name != name; });
      std::move(gone, callers.end(), std::back_inserter(left));
      callers.erase(gone, callers.end());
      if (callers.empty()) abandoned.push_back(entry->second);
    }
    requestsOfCaller_.erase(first, last);
    // From here on nobody can join them.
    for (const auto& request : abandoned) {
      auto [entry, end] = requests_.equal_range(request->key.clientKey);
      while (entry != end) entry = entry->second == request ? requests_.erase(entry) : std::next(entry);
    }
  }
  for (const auto& request : abandoned) request->context->beginVoid(VoidReason::kCallerGone);
}

RequestTable::Barrier RequestTable::makeVoid(VoidReason reason, Selection selection) {
  std::vector<std::shared_ptr<RequestContext>> selected;
  std::unique_lock lock(mutex_);
  for (const auto& [client, request] : requests_)
    if (selection(request->key)) selected.push_back(request->context);
  const auto entry = barriers_.emplace(barriers_.end(), reason, std::move(selection));
  lock.unlock();
  for (const auto& context : selected) context->makeVoid(reason);
  return Barrier(this, entry);
}

RequestTable::Barrier::Barrier(RequestTable* table,
                               std::list<std::pair<VoidReason, Selection>>::iterator entry)
    : table_(table),
      entry_(entry) {
}

RequestTable::Barrier::Barrier(Barrier&& other) noexcept
    : table_(std::exchange(other.table_, nullptr)),
      entry_(other.entry_) {
}

RequestTable::Barrier::~Barrier() {
  if (table_ == nullptr) return;
  const std::lock_guard lock(table_->mutex_);
  table_->barriers_.erase(entry_);
}

}  // namespace requests
