// The database that holds accounts, records, the access log and sealed credentials.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "base/Result.h"
#include "daemon/records/Statement.h"
#include "daemon/state/Directory.h"
#include "host/RVLog.h"

struct sqlite3;

namespace records {

// The database's open connection, as it is lent to one read or write.
class Connection {
 public:
  // A statement of this text, prepared once and kept.
  base::Result<std::unique_ptr<Statement>> prepare(const char* sql);
  // Prepares, binds the arguments in order and runs.
  template <typename... Arguments>
  base::Result<void> run(const char* sql, const Arguments&... arguments) {
    auto statement = prepare(sql);
    if (!statement) return statement.failure();
    ((*statement)->bind(arguments), ...);
    return (*statement)->run();
  }
  // How many rows the last write changed.
  std::int64_t changes() const;

 private:
  friend class Database;
  struct Close {
    void operator()(sqlite3* connection) const;
  };
  struct Finalize {
    void operator()(sqlite3_stmt* statement) const;
  };

  std::unique_ptr<sqlite3, Close> handle_;
  std::map<std::string, std::unique_ptr<sqlite3_stmt, Finalize>, std::less<>> statements_;
};

// `accounts.db` in the state directory. One connection, used by one thread at a time; docs/storage.md
// describes the content. Thread-safe. The work handed to read and write runs on the calling thread, under
// the database's lock: it calls neither read nor write, nor anything that waits.
class Database {
 public:
  // Opens the database, or makes an empty one where there is none. One that is damaged is set aside under
  // another name, with an error in the log, and an empty one is begun. kRefused: a file that others could
  // have touched, or one written by a newer version; nothing is changed then. The directory and the log
  // outlive the database.
  static base::Result<std::unique_ptr<Database>> open(const state::Directory& directory, RVLogService& log);

  Database(const Database&) = delete;
  Database& operator=(const Database&) = delete;
  ~Database();

  base::Result<void> read(const std::function<base::Result<void>(Connection&)>& work);

  // Runs the work in one transaction, which is on the disk when a success comes back; where the work or the
  // commit fails, nothing of it is.
  base::Result<void> write(const std::function<base::Result<void>(Connection&)>& work);

 private:
  explicit Database(Connection connection);

  std::mutex mutex_;
  Connection connection_;
};

}  // namespace records
