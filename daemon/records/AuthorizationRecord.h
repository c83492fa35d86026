// One decision about one client's access, and its row in the database.
#pragma once

#include <chrono>
#include <optional>
#include <string>

#include "base/Result.h"
#include "daemon/clients/Evidence.h"
#include "daemon/records/Database.h"
#include "host/Values.h"

namespace records {

struct AuthorizationRecord {
  std::string accountType;
  std::string clientId;
  bool granted = false;
  std::optional<RVPermissionSet> permissions;
  std::optional<RVDictionary> options;
  std::chrono::sys_seconds changed{};
  // How it was known, when the record was made, which application the client is. Unknown: the user made it.
  clients::Evidence evidence = clients::Evidence::kUnknown;

  friend bool operator==(const AuthorizationRecord&, const AuthorizationRecord&) = default;
};

// The columns that readAuthorization takes, for a SELECT.
inline constexpr const char* kSelectAuthorizations =
    "SELECT account_type, client_id, granted, permissions, options, changed, evidence, digest FROM "
    "authorizations";

// The record of the statement's current row. kDamaged where the row's digest does not fit its content, or
// where a text in it is no value: such a record says nothing that could be believed.
base::Result<AuthorizationRecord> readAuthorization(const Statement& row);

// Puts the record in place of the client's earlier one.
base::Result<void> writeAuthorization(Connection& connection, const AuthorizationRecord& record);

}  // namespace records
