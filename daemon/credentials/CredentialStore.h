// Where credentials are kept.
#pragma once

#include <optional>
#include <string>
#include <tuple>
#include <vector>

#include "base/Result.h"
#include "host/RVDKeychainManager.h"

namespace credentials {

// What a credential is stored under: a client's, or, without a client ID, the account's own.
struct Place {
  std::string accountId;
  std::optional<std::string> clientId;

  friend bool operator==(const Place&, const Place&) = default;
  friend bool operator<(const Place& a, const Place& b) {
    return std::tie(a.accountId, a.clientId) < std::tie(b.accountId, b.clientId);
  }
};

// Keeps credentials and knows nothing of grants and requests: the Keychain does. Once a writing call has
// returned a success, its effect survives the end of the process; after a failure nobody knows how much was
// done. Thread-safe; no call waits for the user.
class CredentialStore {
 public:
  virtual ~CredentialStore() = default;

  // Absent where nothing is stored there. kDamaged: what is stored there cannot be read, now or later.
  virtual base::Result<std::optional<RVAccountCredential>> read(const Place& place) = 0;

  // Stores the credential in place of what was there.
  virtual base::Result<void> write(const Place& place, const RVAccountCredential& credential) = 0;

  // Nothing there is a success.
  virtual base::Result<void> remove(const Place& place) = 0;

  // Where something is stored, each place once, in no order.
  virtual base::Result<std::vector<Place>> places() = 0;
};

}  // namespace credentials
