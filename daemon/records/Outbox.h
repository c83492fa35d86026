// What the server has yet to be told.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "base/Result.h"
#include "daemon/records/Accounts.h"
#include "daemon/records/AuthorizationRecords.h"
#include "daemon/records/Database.h"
#include "daemon/state/Clock.h"
#include "host/RVLog.h"

namespace records {

// A revocation that the server has not answered yet. There is one for an account and an app ID.
struct OwedRevocation {
  std::string accountType;
  std::string account;  // the identifier of the account whose own token signs it; may be retired
  std::string appId;
  std::set<std::string, std::less<>>
      clientIds;  // whose records carried the app ID when it was owed; may be empty
  std::chrono::sys_seconds since{};
  std::int64_t attempts = 0;           // those that failed
  std::optional<std::string> failure;  // of the last one, for a person

  friend bool operator==(const OwedRevocation&, const OwedRevocation&) = default;
};

// The app ID that the record carries, if any.
std::optional<std::string> appIDOf(const AuthorizationRecord& record);

// The table `outbox`. As long as a revocation is in it, its account cannot be removed, only retired.
// Thread-safe.
class Outbox {
 public:
  // The database outlives the object.
  Outbox(Database& database, state::Clock clock);

  // Writes a revocation of the app's token down for the account that plug-ins work with, the first one of
  // the type; it joins the one that is owed already, if any. clientIds are read from the records. Durable
  // when it returns. kNotFound: there is no account.
  base::Result<OwedRevocation> owe(const std::string& accountType,
                                   const std::string& appId,
                                   const Accounts& accounts,
                                   const AuthorizationRecords& records);

  // In the order in which they were begun.
  base::Result<std::vector<OwedRevocation>> list();

  // Keeps the attempts and the failure.
  base::Result<void> noteFailure(const OwedRevocation& revocation);

  // The server has answered.
  base::Result<void> remove(const OwedRevocation& revocation);

  // At start: erases every retired account to which nothing is owed any more, with a log line for each.
  base::Result<void> eraseSettledAccounts(Accounts& accounts, RVLogService& log);

 private:
  Database& database_;
  const state::Clock clock_;
};

}  // namespace records
