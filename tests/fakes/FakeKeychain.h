// Credentials in memory.
#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "host/RVDAccountStore.h"
#include "host/RVDKeychainManager.h"
#include "tests/fakes/Fake.h"

namespace fakes {

class FakeKeychain final : public RVDKeychainManager, public Fake {
 public:
  FakeKeychain();

  std::shared_ptr<const RVAccountCredential> credentialForAccount(
      const RVAccount& account,
      const std::optional<std::string>& clientID) override;
  std::optional<RVError> setCredentialForAccount(const RVAccount& account,
                                                 const std::optional<std::string>& clientID) override;
  std::optional<RVError> removeCredentialForAccount(const RVAccount& account,
                                                    const std::optional<std::string>& clientID) override;

  // What setting up an account does: stores its own credential, or removes it.
  void setMasterToken(const std::string& accountID, std::optional<std::string> token);
  // Stores a client's credential as an earlier run left it.
  void putCredential(const std::string& accountID, const std::string& clientID, const std::string& token);

  // From now on writing and removing change nothing and this comes back; absent: they work again.
  void failWritesWith(std::optional<RVError> error);

  // What is stored, without a call being written down.
  std::shared_ptr<const RVAccountCredential> stored(const std::string& accountID,
                                                    const std::optional<std::string>& clientID) const;
  std::size_t storedCount() const;
  // Account and client ID of every removal, in order.
  std::vector<std::pair<std::string, std::optional<std::string>>> removals() const;

 private:
  using Key = std::pair<std::string, std::optional<std::string>>;

  mutable std::mutex mutex_;
  std::map<Key, std::shared_ptr<const RVAccountCredential>> credentials_;
  std::optional<RVError> writeError_;
  std::vector<Key> removals_;
};

}  // namespace fakes
