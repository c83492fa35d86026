// What was decided about each client's access.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <shared_mutex>
#include <string>
#include <string_view>
#include <vector>

#include "base/Result.h"
#include "daemon/records/AuthorizationRecord.h"
#include "daemon/records/Database.h"
#include "daemon/state/Clock.h"
#include "host/RVLog.h"

namespace records {

// Reads come from memory and never wait for the disk; a write is on the disk when it returns. Thread-safe.
class AuthorizationRecords {
 public:
  // Reads every record. One that cannot be read is removed, with an error in the log, so that no credential
  // is handed out on the strength of it. The database and the log outlive the object.
  static base::Result<std::unique_ptr<AuthorizationRecords>> load(Database& database,
                                                                  RVLogService& log,
                                                                  state::Clock clock);

  // Has the listener called after each write, on the thread that wrote, with the account type whose records
  // changed. Set before the first write; must not write itself.
  void onChange(std::function<void(const std::string& accountType)> listener);

  std::optional<AuthorizationRecord> find(std::string_view accountType, std::string_view clientId) const;

  // In byte order of the client IDs.
  std::vector<AuthorizationRecord> list(std::string_view accountType) const;

  // Whether there is a record of the client that was made with stronger evidence than this. A caller of this
  // evidence is then not the client that the record is about.
  bool isStronger(std::string_view accountType, std::string_view clientId, clients::Evidence evidence) const;

  // Stores what a caller brought about in place of the client's earlier record, with the current time as its
  // `changed`. kRefused, and the earlier record stays, where that was made with stronger evidence.
  base::Result<void> put(AuthorizationRecord record);

  // The same for what the user did without a caller: the earlier record's evidence stays, and a first record
  // has none.
  base::Result<void> putForUser(AuthorizationRecord record);

  base::Result<void> removeAll(const std::string& accountType);

  // Removes a standing refusal. kNotFound: the client has no record. kRefused: it holds a grant.
  base::Result<void> forgetRefusal(const std::string& accountType, const std::string& clientId);

 private:
  using OfType = std::map<std::string, AuthorizationRecord, std::less<>>;

  AuthorizationRecords(Database& database, RVLogService& log, state::Clock clock);
  base::Result<void> reload();
  base::Result<void> removeUnreadable();
  base::Result<void> replace(AuthorizationRecord record, bool isForUser);
  // Runs the work and, where it succeeded, lets memory follow.
  base::Result<void> write(const std::string& accountType,
                           const Database::Work& work,
                           const std::function<void(OfType& ofType)>& follow);

  Database& database_;
  RVLogService& log_;
  const state::Clock clock_;
  std::function<void(const std::string&)> listener_;
  std::mutex writes_;  // held from before a write until memory shows it
  mutable std::shared_mutex mutex_;
  std::map<std::string, OfType, std::less<>> records_;  // guarded by mutex_
};

}  // namespace records
