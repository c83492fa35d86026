#include "daemon/records/Statement.h"

#include <sqlite3.h>

namespace records {

base::Failure databaseFailure(sqlite3* connection, int code) {
  const int primary = code & 0xff;
  const bool isDamaged = primary == SQLITE_CORRUPT || primary == SQLITE_NOTADB;
  const char* text = connection != nullptr ? sqlite3_errmsg(connection) : sqlite3_errstr(code);
  return {isDamaged ? base::FailureKind::kDamaged : base::FailureKind::kFailed,
          std::string("the database answers: ") + text};
}

Statement::Statement(sqlite3* connection, sqlite3_stmt* statement)
    : connection_(connection),
      statement_(statement) {
}

Statement::~Statement() {
  sqlite3_reset(statement_);
  sqlite3_clear_bindings(statement_);
}

void Statement::note(int code) {
  if (failed_ == SQLITE_OK) failed_ = code;
}

Statement& Statement::bind(std::string_view text) {
  // A null pointer would be NULL, which an empty text is not.
  const char* bytes = text.data() != nullptr ? text.data() : "";
  note(sqlite3_bind_text64(statement_, ++parameter_, bytes, text.size(), SQLITE_TRANSIENT, SQLITE_UTF8));
  return *this;
}

Statement& Statement::bind(const std::optional<std::string>& text) {
  if (text) return bind(std::string_view(*text));
  note(sqlite3_bind_null(statement_, ++parameter_));
  return *this;
}

Statement& Statement::bind(std::int64_t number) {
  note(sqlite3_bind_int64(statement_, ++parameter_, number));
  return *this;
}

Statement& Statement::bind(const Blob& blob) {
  note(
      sqlite3_bind_blob64(statement_, ++parameter_, blob.bytes.c_str(), blob.bytes.size(), SQLITE_TRANSIENT));
  return *this;
}

base::Result<bool> Statement::step() {
  if (failed_ != SQLITE_OK) return databaseFailure(nullptr, failed_);
  const int code = sqlite3_step(statement_);
  if (code == SQLITE_ROW) return true;
  if (code == SQLITE_DONE) return false;
  return databaseFailure(connection_, code);
}

base::Result<void> Statement::run() {
  for (;;) {
    const auto row = step();
    if (!row) return row.failure();
    if (!*row) return {};
  }
}

std::string Statement::text(int column) const {
  // The pointer first: asking for it may change the size.
  const auto* bytes = reinterpret_cast<const char*>(sqlite3_column_text(statement_, column));
  const auto size = static_cast<std::size_t>(sqlite3_column_bytes(statement_, column));
  return bytes != nullptr ? std::string(bytes, size) : std::string();
}

std::optional<std::string> Statement::optionalText(int column) const {
  if (sqlite3_column_type(statement_, column) == SQLITE_NULL) return std::nullopt;
  return text(column);
}

std::int64_t Statement::number(int column) const {
  return sqlite3_column_int64(statement_, column);
}

std::string Statement::blob(int column) const {
  const auto* bytes = static_cast<const char*>(sqlite3_column_blob(statement_, column));
  const auto size = static_cast<std::size_t>(sqlite3_column_bytes(statement_, column));
  return bytes != nullptr ? std::string(bytes, size) : std::string();
}

}  // namespace records
