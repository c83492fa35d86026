// The revocations that the server is owed, until it has answered each.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <list>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "base/Result.h"
#include "daemon/records/Outbox.h"
#include "host/RVDKeychainManager.h"
#include "host/RVLog.h"
#include "host/TKFacebookRequests.h"

namespace http {

// Tells the server what is in the outbox: at once when it is put there and at each start, and again after
// growing pauses until the server has answered. It has answered when an HTTP response came, whatever it
// says, save one of status 429, or 500 and above: those are made by whatever stands before a server that is
// down or overloaded.
//
// Thread-safe. Tokens are read, exchanges begun and continuations run without a lock of this object.
class Revocations {
 public:
  struct Stores {
    records::Outbox& outbox;
    records::Accounts& accounts;
    const records::AuthorizationRecords& records;
  };
  // What it works with.
  struct Means {
    // The own token of an account, also of a retired one; absent where it is lost. May take its time.
    std::function<base::Result<std::optional<RVSecret>>(const std::string& account)> tokenOf;
    // Deletes what is stored for an account that has just been removed. May take its time.
    std::function<void(const std::string& account)> erase;
    // Begins the exchange and returns at once; see FacebookServer::beginRevocation.
    std::function<void(const std::string& appID, std::optional<RVSecret>, TKFacebookRequestHandler)> send;
    // Returns at once and runs the work when the pause is over, on a thread where it must not wait; not at
    // all when the daemon stops before.
    std::function<void(std::chrono::milliseconds pause, std::function<void()> work)> after;
    // Runs the work soon, where it may wait. False, and the work is not run, where that cannot be.
    std::function<bool(std::function<void()> work)> run;
    // How long to wait after so many failures in a row.
    std::function<std::chrono::milliseconds(int failures)> pauseAfter = growingPause;
  };
  // error: absent where the server is owed nothing any more, else why it could not be told.
  using Continuation = std::function<void(const std::optional<RVError>& error)>;
  using WaiterID = std::uint64_t;

  // owed: what is in the outbox. Stores and log outlive the object, which outlives whatever the means have
  // begun.
  Revocations(std::vector<records::OwedRevocation> owed, Stores stores, Means means, RVLogService& log);
  Revocations(const Revocations&) = delete;
  Revocations& operator=(const Revocations&) = delete;

  // One second, doubling up to an hour.
  static std::chrono::milliseconds growingPause(int failures);

  // Has the listener called, on any thread, with the account type for which something else is owed now.
  // Set before the first call of another method.
  void onChange(std::function<void(const std::string& accountType)> listener);

  // Has everything tried that is owed.
  void start();

  // Owes the server a revocation of the app's token for the account that plug-ins work with, and has it
  // tried. Durable when it returns. See Outbox::owe.
  base::Result<void> owe(const std::string& accountType, const std::string& appID);

  // In the order in which they were begun.
  std::vector<records::OwedRevocation> list(std::string_view accountType) const;

  // The app is about to be authorized anew: a revocation that reached the server only after that would
  // take the new token away. Where nothing is owed for the app, runs the continuation at once, on this
  // thread, and answers 0. Otherwise has what is owed tried, and runs the continuation, on any thread,
  // when all of it was answered or when one try has failed.
  WaiterID beforeAuthorizing(const std::string& appID, Continuation continuation);

  // Drops the continuation of a waiter that waits no more; returns it, or nothing where it has been run.
  Continuation giveUp(WaiterID waiter);

  // Removes the account, which has been retired, with all that is stored for it as soon as nothing is owed
  // for it: now, on this thread, or later. What cannot be done then, the next start does.
  void accountWasRetired(const std::string& account);

 private:
  using Key = std::pair<std::string, std::string>;  // account, app ID
  struct Entry {
    records::OwedRevocation owed;
    std::int64_t number = 0;  // for the order
    bool isBeingTried = false;
    bool wasOwedAgain = false;  // since the try was begun
    int failures = 0;           // in a row, of this run of the daemon
    std::uint64_t pause = 0;    // the one that counts
  };
  struct Waiter {
    WaiterID id;
    std::string appID;
    Continuation continuation;
  };
  // What a try has come to, to be done without the lock.
  struct Consequences {
    std::vector<Continuation> continuations;
    std::optional<RVError> error;  // for them
    std::string changedType;       // empty: nothing has changed
    std::string removedAccount;    // empty: none
    bool tryAgain = false;
  };

  void attempt(const Key& key);
  void attempted(const Key& key, std::optional<RVError> error);
  std::optional<RVError> settle(const Key& key, Entry& entry, Consequences& consequences);
  void failed(const Key& key, Entry& entry, const RVError& error, Consequences& consequences);
  void pauseIsOver(const Key& key, std::uint64_t pause);
  void beginPause(const Key& key, Entry& entry);
  bool isOwedForApp(const std::string& appID) const;
  bool isOwedForAccount(const std::string& account) const;
  bool removeIfRetired(const std::string& account);
  std::vector<Continuation> takeWaiters(const std::string& appID);
  void announce(const std::string& accountType) const;

  const Stores stores_;
  const Means means_;
  RVLogService& log_;
  std::function<void(const std::string&)> listener_;

  mutable std::mutex mutex_;  // held while a store writes
  std::map<Key, Entry> entries_;
  std::list<Waiter> waiters_;
  std::int64_t lastNumber_ = 0;
  std::uint64_t lastPause_ = 0;
  WaiterID lastWaiter_ = 0;
};

}  // namespace http
