// Which store holds the credentials, and how they come into another.
#pragma once

#include <cstdint>
#include <string>

#include "base/Result.h"
#include "daemon/credentials/CredentialStore.h"
#include "daemon/records/Database.h"
#include "host/RVLog.h"

namespace credentials {

// The numbers stand in the database.
enum class StoreKind : std::int64_t {
  kNone = 0,  // none yet: there are no credentials
  kSealed = 1,
  kSecretService = 2,
};

// What the database says about where its credentials are.
struct StoreChoice {
  StoreKind store = StoreKind::kNone;
  bool hasLeftovers = false;  // the other store may hold copies
  std::string name;           // tells this database from others in a store that they share

  static base::Result<StoreChoice> read(records::Database& database);
};

// At start, before anybody is served: has all credentials in the store `wanted`, and nowhere else.
//
// Where the other one holds them, what may be read of them is moved, all or nothing: copied, read back,
// then settled in the database, then deleted from the other store. A failure says why they cannot be moved
// and what to do; the other store holds them all then, and the next call tries again. Copies that an
// interrupted move has left are deleted; where they cannot be, that is logged, and the next start does it.
//
// other: may be null where `choice` is for `wanted` and knows of no leftovers.
base::Result<void> keepCredentialsIn(StoreKind wanted,
                                     CredentialStore& store,
                                     CredentialStore* other,
                                     records::Database& database,
                                     StoreChoice choice,
                                     RVLogService& log);

}  // namespace credentials
