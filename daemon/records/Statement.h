// One SQL statement on its way.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/Result.h"

struct sqlite3;
struct sqlite3_stmt;

namespace records {

// Blobs are told from texts by their type.
struct Blob {
  std::string bytes;
};

// What went wrong, in SQLite's words. code: SQLite's, extended or not; kDamaged where the file is no sound
// database. connection: may be null.
base::Failure databaseFailure(sqlite3* connection, int code);

// A prepared statement in use; reset and given back for the next use when this object goes. Parameters are
// bound in order, the first call being ?1. A failure to bind shows at the next step. Used only within the
// Database call that handed it out.
class Statement {
 public:
  Statement(sqlite3* connection, sqlite3_stmt* statement);
  Statement(const Statement&) = delete;
  Statement& operator=(const Statement&) = delete;
  ~Statement();

  Statement& bind(std::string_view text);
  Statement& bind(const std::string& text) { return bind(std::string_view(text)); }
  Statement& bind(const std::optional<std::string>& text);  // absent: NULL
  Statement& bind(std::int64_t number);
  Statement& bind(const Blob& blob);

  // Goes to the next row; false where there is none left.
  base::Result<bool> step();
  // Runs a statement that gives no rows, or whose rows do not matter.
  base::Result<void> run();

  // Columns of the current row, from 0.
  std::string text(int column) const;
  std::optional<std::string> optionalText(int column) const;  // NULL: absent
  std::int64_t number(int column) const;
  std::string blob(int column) const;

 private:
  void note(int code);

  sqlite3* const connection_;
  sqlite3_stmt* const statement_;
  int parameter_ = 0;
  int failed_ = 0;  // the code of the first binding that failed
};

}  // namespace records
