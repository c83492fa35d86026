#include "daemon/http/Revocations.h"

#include <algorithm>

#include "daemon/http/TransferErrors.h"
#include "daemon/log/Log.h"

namespace http {
namespace {

using std::chrono::milliseconds;

constexpr int kTooManyRequests = 429;
constexpr int kFirstServerError = 500;

// Made by whatever stands before a server that is down or overloaded.
bool isMadeForTheServer(int statusCode) {
  return statusCode == kTooManyRequests || statusCode >= kFirstServerError;
}

bool hasCode(const std::optional<RVError>& error, TransferErrorCode code) {
  return error && error->code == static_cast<std::int64_t>(code);
}

// Why the server has not answered; absent where it has.
std::optional<RVError> whyUnanswered(const std::optional<TKHTTPResponse>& response,
                                     const std::optional<RVError>& error) {
  if (!response) return error;
  const bool isWhole = !error || hasCode(error, TransferErrorCode::kAnswerTooLarge) ||
                       hasCode(error, TransferErrorCode::kNoBody);
  if (!isWhole) return error;
  if (!isMadeForTheServer(response->statusCode)) return std::nullopt;
  return transferError(TransferErrorCode::kFailed,
                       "the server is not at work: status " + std::to_string(response->statusCode));
}

std::string textOf(const RVError& error) {
  return error.localizedDescription().value_or("The exchange failed.");
}

}  // namespace

Revocations::Revocations(std::vector<records::OwedRevocation> owed,
                         Stores stores,
                         Means means,
                         RVLogService& log)
    : stores_(stores),
      means_(std::move(means)),
      log_(log) {
  for (records::OwedRevocation& revocation : owed) {
    Entry& entry = entries_[{revocation.account, revocation.appId}];
    entry.owed = std::move(revocation);
    entry.number = ++lastNumber_;
  }
}

milliseconds Revocations::growingPause(int failures) {
  return std::min(std::chrono::seconds(1) * (1 << std::clamp(failures - 1, 0, 12)),
                  std::chrono::seconds(3600));
}

void Revocations::onChange(std::function<void(const std::string&)> listener) {
  listener_ = std::move(listener);
}

void Revocations::announce(const std::string& accountType) const {
  if (listener_ && !accountType.empty()) listener_(accountType);
}

void Revocations::start() {
  std::vector<std::pair<Key, std::uint64_t>> pauses;
  {
    const std::lock_guard lock(mutex_);
    for (auto& [key, entry] : entries_) pauses.emplace_back(key, entry.pause);
  }
  for (const auto& [key, pause] : pauses) pauseIsOver(key, pause);
}

base::Result<void> Revocations::owe(const std::string& accountType, const std::string& appID) {
  Key key;
  bool isToBeTried = false;
  {
    const std::lock_guard lock(mutex_);
    auto owed = stores_.outbox.owe(accountType, appID, stores_.accounts, stores_.records);
    if (!owed) return owed.failure();
    key = {owed->account, owed->appId};
    Entry& entry = entries_[key];
    if (entry.number == 0) entry.number = ++lastNumber_;
    entry.owed = *std::move(owed);
    // What the server answers to a try that was begun before says nothing about this revocation.
    entry.wasOwedAgain = entry.isBeingTried;
    isToBeTried = !std::exchange(entry.isBeingTried, true);
  }
  announce(accountType);
  if (isToBeTried) attempt(key);
  return {};
}

std::vector<records::OwedRevocation> Revocations::list(std::string_view accountType) const {
  std::map<std::int64_t, records::OwedRevocation> inOrder;
  {
    const std::lock_guard lock(mutex_);
    for (const auto& [key, entry] : entries_)
      if (entry.owed.accountType == accountType) inOrder.emplace(entry.number, entry.owed);
  }
  std::vector<records::OwedRevocation> all;
  all.reserve(inOrder.size());
  for (auto& [number, owed] : inOrder) all.push_back(std::move(owed));
  return all;
}

Revocations::WaiterID Revocations::beforeAuthorizing(const std::string& appID, Continuation continuation) {
  WaiterID waiter = 0;
  std::vector<Key> toBeTried;
  {
    const std::lock_guard lock(mutex_);
    if (isOwedForApp(appID)) {
      waiter = ++lastWaiter_;
      waiters_.push_back({waiter, appID, std::exchange(continuation, nullptr)});
      for (auto& [key, entry] : entries_)
        if (key.second == appID && !std::exchange(entry.isBeingTried, true)) toBeTried.push_back(key);
    }
  }
  if (continuation) continuation(std::nullopt);
  for (const Key& key : toBeTried) attempt(key);
  return waiter;
}

Revocations::Continuation Revocations::giveUp(WaiterID waiter) {
  const std::lock_guard lock(mutex_);
  const auto entry =
      std::find_if(waiters_.begin(), waiters_.end(), [&](const Waiter& one) { return one.id == waiter; });
  if (entry == waiters_.end()) return nullptr;
  Continuation continuation = std::move(entry->continuation);
  waiters_.erase(entry);
  return continuation;
}

void Revocations::accountWasRetired(const std::string& account) {
  bool isRemoved = false;
  {
    const std::lock_guard lock(mutex_);
    isRemoved = !isOwedForAccount(account) && removeIfRetired(account);
  }
  if (isRemoved) means_.erase(account);
}

// One try of an entry that is marked as being tried. Called without the lock.
void Revocations::attempt(const Key& key) {
  const auto& [account, appID] = key;
  auto token = means_.tokenOf(account);
  if (!token)
    return attempted(key,
                     transferError(TransferErrorCode::kNotSendable,
                                   "the account's own token cannot be read: " + token.failure().message));
  if (!*token)
    logging::error(
        log_,
        "The account's own token is lost, so the server is asked unsigned to forget the token of app %@.",
        {RVValue(appID)});
  means_.send(appID,
              *std::move(token),
              [this, key](const auto&, const auto& response, const std::optional<RVError>& error) {
                attempted(key, whyUnanswered(response, error));
              });
}

void Revocations::attempted(const Key& key, std::optional<RVError> error) {
  Consequences consequences;
  {
    const std::lock_guard lock(mutex_);
    const auto found = entries_.find(key);
    if (found == entries_.end()) return;
    Entry& entry = found->second;
    if (!error) error = settle(key, entry, consequences);
    if (error) failed(key, found->second, *error, consequences);
  }
  announce(consequences.changedType);
  // Where no thread is left for it, the next start does it.
  if (const std::string& account = consequences.removedAccount; !account.empty())
    (void)means_.run([this, account] { means_.erase(account); });
  for (const Continuation& continuation : consequences.continuations) continuation(consequences.error);
  if (consequences.tryAgain) attempt(key);
}

// The server has answered. Returns why the revocation stays owed all the same.
std::optional<RVError> Revocations::settle(const Key& key, Entry& entry, Consequences& consequences) {
  if (std::exchange(entry.wasOwedAgain, false)) {
    consequences.tryAgain = true;
    return std::nullopt;
  }
  if (const auto removed = stores_.outbox.remove(entry.owed); !removed)
    return transferError(TransferErrorCode::kFailed,
                         "its answer could not be written down: " + removed.failure().message);
  if (entry.failures > 0)
    logging::notice(log_, "The server was told to forget the token of app %@.", {RVValue(key.second)});
  consequences.changedType = entry.owed.accountType;
  entries_.erase(key);
  if (!isOwedForAccount(key.first) && removeIfRetired(key.first)) consequences.removedAccount = key.first;
  if (!isOwedForApp(key.second)) consequences.continuations = takeWaiters(key.second);
  return std::nullopt;
}

void Revocations::failed(const Key& key, Entry& entry, const RVError& error, Consequences& consequences) {
  consequences.error = error;
  consequences.continuations = takeWaiters(key.second);
  entry.isBeingTried = false;
  entry.wasOwedAgain = false;
  // That the daemon stops says nothing about the server.
  if (hasCode(error, TransferErrorCode::kStopping)) return;
  ++entry.owed.attempts;
  entry.owed.failure = textOf(error);
  consequences.changedType = entry.owed.accountType;
  if (const auto noted = stores_.outbox.noteFailure(entry.owed); !noted)
    logging::error(log_, "A failed revocation could not be noted: %@", {RVValue(noted.failure().message)});
  if (++entry.failures == 1)
    logging::error(
        log_,
        "The server could not be told to forget the token of app %@; it is tried again until it is. %@",
        {RVValue(key.second), RVValue(*entry.owed.failure)});
  beginPause(key, entry);
}

void Revocations::beginPause(const Key& key, Entry& entry) {
  entry.pause = ++lastPause_;
  means_.after(means_.pauseAfter(entry.failures),
               [this, key, pause = entry.pause] { pauseIsOver(key, pause); });
}

void Revocations::pauseIsOver(const Key& key, std::uint64_t pause) {
  {
    const std::lock_guard lock(mutex_);
    const auto found = entries_.find(key);
    if (found == entries_.end() || found->second.pause != pause) return;
    if (std::exchange(found->second.isBeingTried, true)) return;
  }
  if (means_.run([this, key] { attempt(key); })) return;
  const std::lock_guard lock(mutex_);
  const auto found = entries_.find(key);
  found->second.isBeingTried = false;
  beginPause(key, found->second);
}

// The following are called with the lock held.

bool Revocations::isOwedForApp(const std::string& appID) const {
  return std::any_of(
      entries_.begin(), entries_.end(), [&](const auto& entry) { return entry.first.second == appID; });
}

bool Revocations::isOwedForAccount(const std::string& account) const {
  return std::any_of(
      entries_.begin(), entries_.end(), [&](const auto& entry) { return entry.first.first == account; });
}

// Returns whether the account was one and is no more.
bool Revocations::removeIfRetired(const std::string& account) {
  const auto retired = stores_.accounts.retired();
  const auto removed = [&]() -> base::Result<bool> {
    if (!retired) return retired.failure();
    const bool isRetired = std::any_of(
        retired->begin(), retired->end(), [&](const auto& one) { return one.identifier == account; });
    if (!isRetired) return false;
    const auto done = stores_.accounts.remove(account);
    if (!done) return done.failure();
    return true;
  }();
  if (removed) return *removed;
  logging::error(log_,
                 "The removed account %@ is erased at the next start only: %@",
                 {RVValue(account), RVValue(removed.failure().message)});
  return false;
}

std::vector<Revocations::Continuation> Revocations::takeWaiters(const std::string& appID) {
  std::vector<Continuation> taken;
  for (auto waiter = waiters_.begin(); waiter != waiters_.end();) {
    if (waiter->appID != appID) {
      ++waiter;
      continue;
    }
    taken.push_back(std::move(waiter->continuation));
    waiter = waiters_.erase(waiter);
  }
  return taken;
}

}  // namespace http
