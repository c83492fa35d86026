// Credentials, each sealed by itself, in the daemon's own database.
#pragma once

#include <filesystem>
#include <memory>
#include <optional>
#include <vector>

#include "base/Result.h"
#include "daemon/credentials/CredentialStore.h"
#include "daemon/credentials/SealingKey.h"
#include "daemon/records/Database.h"
#include "daemon/state/Directory.h"
#include "host/RVLog.h"

namespace credentials {

// docs/storage.md describes how a credential is sealed. Nothing can be stored for an account that is not
// there, and what is stored goes with its account. Thread-safe.
class SealedStore final : public CredentialStore {
 public:
  // Reads the key (SealingKey::open). Where credentials are stored but their key is gone, an error goes to
  // the log; they cannot be read from then on. The database outlives the store; the log is not kept.
  static base::Result<std::unique_ptr<SealedStore>> open(
      records::Database& database,
      const state::Directory& directory,
      const std::optional<std::filesystem::path>& handedInKey,
      RVLogService& log);

  base::Result<std::optional<RVAccountCredential>> read(const Place& place) override;
  base::Result<void> write(const Place& place, const RVAccountCredential& credential) override;
  base::Result<void> remove(const Place& place) override;
  base::Result<std::vector<Place>> places() override;

 private:
  SealedStore(records::Database& database, SealingKey key);

  records::Database& database_;
  const SealingKey key_;
};

}  // namespace credentials
