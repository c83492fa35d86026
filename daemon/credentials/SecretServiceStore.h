// Credentials in the desktop's keyring.
#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "base/Result.h"
#include "daemon/credentials/CredentialStore.h"

namespace credentials {

// One item a credential, in the default collection of the secret service on the session bus; docs/storage.md
// describes the items. The keyring keeps nobody on the session bus apart: any program there can read what is
// stored, as long as the keyring is unlocked.
//
// A keyring that is locked, gone or does not answer is a failure (kFailed) of the call alone; nobody is asked
// to unlock it, and the next call finds it as it is then. Thread-safe; every call runs
// on the calling thread, which is not the bus thread.
class SecretServiceStore final : public CredentialStore {
 public:
  // database: tells the credentials of one database from those of another in the same keyring. longest: what
  // a call takes at most.
  explicit SecretServiceStore(std::string database,
                              std::chrono::milliseconds longest = std::chrono::seconds(5));

  base::Result<std::optional<RVAccountCredential>> read(const Place& place) override;
  base::Result<void> write(const Place& place, const RVAccountCredential& credential) override;
  base::Result<void> remove(const Place& place) override;
  base::Result<std::vector<Place>> places() override;

 private:
  const std::string database_;
  const std::chrono::milliseconds longest_;
};

}  // namespace credentials
