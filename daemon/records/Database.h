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

namespace records {

// An open database. Used by one thread at a time.
class Connection {
 public:
  // path: of an existing file, or ":memory:". The connection comes back with every setting that
  // docs/storage.md names.
  static base::Result<Connection> open(const std::string& path);

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

  // Runs several statements, none of which is kept.
  base::Result<void> execute(const std::string& script);

  // How many rows the last write changed.
  std::int64_t changes() const;

  bool isInTransaction() const;

 private:
  struct Close {
    void operator()(sqlite3* connection) const;
  };
  struct Finalize {
    void operator()(sqlite3_stmt* statement) const;
  };

  explicit Connection(std::unique_ptr<sqlite3, Close> handle);

  std::unique_ptr<sqlite3, Close> handle_;
  std::map<std::string, std::unique_ptr<sqlite3_stmt, Finalize>, std::less<>> statements_;
};

// `accounts.db` in the state directory: one connection, used by one thread at a time. Thread-safe. The work
// handed to read and write runs on the calling thread, under the database's lock: it calls neither read nor
// write, nor anything that waits.
class Database {
 public:
  using Work = std::function<base::Result<void>(Connection&)>;

  // Opens the database, or makes an empty one where there is none. One that is damaged is set aside under
  // another name, with an error in the log, and an empty one is begun. kRefused: a file that others could
  // have touched, or one written by a newer version; nothing is changed then. The log is not kept.
  static base::Result<std::unique_ptr<Database>> open(const state::Directory& directory, RVLogService& log);

  base::Result<void> read(const Work& work);

  // Runs the work in one transaction, which is on the disk when a success comes back. Where the work fails,
  // nothing of it is; where the disk fails while the transaction is ended, either all of it is or nothing.
  base::Result<void> write(const Work& work);

 private:
  explicit Database(Connection connection);

  std::mutex mutex_;
  Connection connection_;  // guarded by mutex_
};

}  // namespace records
