// What has been begun and must be brought to its end, also by the next run.
#pragma once

#include <cstdint>
#include <string>

#include "base/Result.h"
#include "daemon/records/Accounts.h"
#include "daemon/records/AuthorizationRecords.h"
#include "daemon/records/Database.h"
#include "daemon/records/Outbox.h"
#include "host/RVLog.h"

namespace records {

// Something that takes access away in several steps. It is written down before the first step and crossed
// out after the last, so that a daemon that was killed in between does the rest when it starts again:
// access that somebody took away stays taken away.
struct Intent {
  enum class Kind : std::int64_t { kRevokeClient = 1, kRevokeAll = 2, kRemoveAccount = 3 };
  Kind kind = Kind::kRevokeClient;
  std::string accountType;
  std::string subject;  // the client ID, nothing, the account's identifier
};

// Thread-safe.
class Intents {
 public:
  // The database outlives the object.
  explicit Intents(Database& database);

  // Writes the intent down, durable when it returns; answers the number to finish it by.
  base::Result<std::int64_t> begin(const Intent& intent);

  base::Result<void> finish(std::int64_t number);

  // At start, before anybody is served: does what is left of each intent to records and accounts, with a
  // log line for each, and crosses it out. What the server has to be told goes to the outbox first; it may
  // be told a second time. Credentials are left to the keychain's reconcile(), to be called next.
  base::Result<void> completeInterrupted(AuthorizationRecords& records,
                                         Accounts& accounts,
                                         Outbox& outbox,
                                         RVLogService& log);

 private:
  Database& database_;
};

}  // namespace records
