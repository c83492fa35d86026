#include "daemon/records/Database.h"

#include <sqlite3.h>

#include <optional>
#include <utility>

#include "daemon/log/Log.h"
#include "daemon/records/Schema.h"

namespace records {
namespace {

constexpr const char* kFileName = "accounts.db";
constexpr const char* kJournalSuffix = "-journal";
constexpr const char* kUnfinishedName = "accounts.db.new";

// secure_delete: what was deleted is overwritten. EXTRA: the end of a transaction is on the disk, its
// journal's removal included. The journal is a rollback journal: with a single connection it costs nothing
// that matters, and no second and third file has to be looked after.
constexpr const char* kSettings =
    "PRAGMA journal_mode = DELETE;"
    "PRAGMA synchronous = EXTRA;"
    "PRAGMA secure_delete = ON;"
    "PRAGMA foreign_keys = ON;"
    "PRAGMA cell_size_check = ON;"
    "PRAGMA temp_store = MEMORY;"
    "PRAGMA mmap_size = 0;";
constexpr int kBusyMilliseconds = 5000;  // somebody looks at the file with a tool of their own

base::Result<void> makeEmpty(const state::Directory& directory) {
  const std::string journal = std::string(kUnfinishedName) + kJournalSuffix;
  if (auto removed = directory.removeFile(journal); !removed) return removed;
  if (auto made = directory.replaceFile(kUnfinishedName, ""); !made) return made;
  {
    auto connection = Connection::open(directory.path() / kUnfinishedName);
    if (!connection) return connection.failure();
    if (auto migrated = migrate(*connection, 0, kSchemaVersion); !migrated) return migrated;
  }
  // The journal of a database that is gone or set aside must not be rolled back into this one.
  if (auto removed = directory.removeFile(std::string(kFileName) + kJournalSuffix); !removed) return removed;
  return directory.rename(kUnfinishedName, kFileName);
}

base::Result<Connection> openSound(const state::Directory& directory) {
  const std::string path = directory.path() / kFileName;
  auto connection = Connection::open(path);
  if (!connection) return connection;
  const auto version = schemaVersion(*connection);
  if (!version) return version.failure();
  if (*version > kSchemaVersion)
    return base::Failure{base::FailureKind::kRefused,
                         path +
                             " was written by a newer version of rvd; install that one, or move the file"
                             " away to begin anew"};
  if (*version < 1) return base::Failure{base::FailureKind::kDamaged, "it has no tables"};
  // First, so that a damaged database is set aside as it was found.
  if (auto sound = checkSoundness(*connection, *version); !sound) return sound.failure();
  if (auto migrated = migrate(*connection, *version, kSchemaVersion); !migrated) return migrated.failure();
  return connection;
}

base::Result<void> setAside(const state::Directory& directory, const std::string& reason, RVLogService& log) {
  const auto aside = directory.setAside(kFileName);
  if (!aside) return aside.failure();
  logging::error(log,
                 "%@ is damaged (%@). It was set aside as %@ and an empty one begun: accounts have to be "
                 "added again, and every client will ask again.",
                 {RVValue(kFileName), RVValue(reason), RVValue(*aside)});
  return {};
}

}  // namespace

void Connection::Close::operator()(sqlite3* connection) const {
  sqlite3_close_v2(connection);
}

void Connection::Finalize::operator()(sqlite3_stmt* statement) const {
  sqlite3_finalize(statement);
}

Connection::Connection(std::unique_ptr<sqlite3, Close> handle)
    : handle_(std::move(handle)) {
}

base::Result<Connection> Connection::open(const std::string& path) {
  sqlite3* opened = nullptr;
  const int flags =
      SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOFOLLOW | SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_EXRESCODE;
  const int code = sqlite3_open_v2(path.c_str(), &opened, flags, nullptr);
  Connection connection{std::unique_ptr<sqlite3, Close>(opened)};
  if (code != SQLITE_OK) return databaseFailure(opened, code);
  sqlite3_busy_timeout(opened, kBusyMilliseconds);
  sqlite3_db_config(opened, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
  sqlite3_db_config(opened, SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
  if (auto set = connection.execute(kSettings); !set) return set.failure();
  return connection;
}

base::Result<std::unique_ptr<Statement>> Connection::prepare(const char* sql) {
  auto found = statements_.find(std::string_view(sql));
  if (found == statements_.end()) {
    sqlite3_stmt* prepared = nullptr;
    const int code =
        sqlite3_prepare_v3(handle_.get(), sql, -1, SQLITE_PREPARE_PERSISTENT, &prepared, nullptr);
    if (code != SQLITE_OK) return databaseFailure(handle_.get(), code);
    found = statements_.try_emplace(sql, prepared).first;
  }
  return std::make_unique<Statement>(handle_.get(), found->second.get());
}

base::Result<void> Connection::execute(const std::string& script) {
  const int code = sqlite3_exec(handle_.get(), script.c_str(), nullptr, nullptr, nullptr);
  if (code != SQLITE_OK) return databaseFailure(handle_.get(), code);
  return {};
}

std::int64_t Connection::changes() const {
  return sqlite3_changes64(handle_.get());
}

bool Connection::isInTransaction() const {
  return sqlite3_get_autocommit(handle_.get()) == 0;
}

Database::Database(Connection connection)
    : connection_(std::move(connection)) {
}

base::Result<std::unique_ptr<Database>> Database::open(const state::Directory& directory, RVLogService& log) {
  const auto exists = directory.checkFile(kFileName);
  if (!exists) return exists.failure();
  bool isMissing = !*exists;
  std::optional<Connection> connection;
  if (!isMissing) {
    auto opened = openSound(directory);
    if (opened) {
      connection = *std::move(opened);
    } else if (opened.failure().kind == base::FailureKind::kDamaged) {
      if (auto aside = setAside(directory, opened.failure().message, log); !aside) return aside.failure();
      isMissing = true;
    } else {
      return opened.failure();
    }
  }
  if (isMissing) {
    if (auto made = makeEmpty(directory); !made) return made.failure();
    auto opened = openSound(directory);
    if (!opened) return opened.failure();
    connection = *std::move(opened);
  }
  return std::unique_ptr<Database>(new Database(*std::move(connection)));
}

base::Result<void> Database::read(const Work& work) {
  const std::lock_guard lock(mutex_);
  return work(connection_);
}

base::Result<void> Database::write(const Work& work) {
  const std::lock_guard lock(mutex_);
  // Also when the work throws for want of memory.
  struct Rollback {
    Connection& connection;
    ~Rollback() {
      if (connection.isInTransaction()) (void)connection.execute("ROLLBACK");
    }
  } const rollback{connection_};
  if (auto begun = connection_.run("BEGIN IMMEDIATE"); !begun) return begun;
  if (auto done = work(connection_); !done) return done;
  return connection_.run("COMMIT");
}

}  // namespace records
