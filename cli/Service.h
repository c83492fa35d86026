// The daemon, as rvctl calls it.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/Result.h"
#include "cli/Json.h"

namespace sdbus {
class IConnection;
}

namespace cli {

// Why access was not granted, as the daemon says it.
struct AccessError {
  std::string domain;
  std::int64_t code = 0;
  std::optional<std::string> description;
};

struct Decision {
  bool granted = false;
  std::optional<AccessError> error;  // absent where the daemon gives none
};

struct RequestOptions {
  std::optional<std::string> appID;
  std::optional<std::vector<std::string>> permissions;
  std::optional<std::string> audience;
};

// A request to be explained.
struct ExplainOptions {
  RequestOptions request;
  std::string language;  // empty: the user's
  bool online = false;   // the server may be asked to describe permissions
};

// Every call waits for its answer without a limit. Documents have the keys of the bus interfaces. A failure's
// message says in words what went wrong and what to do; its kind is kRefused where the caller has no access
// to what it asked for.
class Service {
 public:
  // connect: called once, at the first call.
  using Connect = std::function<base::Result<std::unique_ptr<sdbus::IConnection>>()>;
  explicit Service(Connect connect);
  ~Service();

  // com.zentor.rvd.Accounts1
  base::Result<void> registerAs(const std::string& appID);
  base::Result<Decision> requestAccess(const RequestOptions& options);
  base::Result<Json> access();  // "state", "permissions", "options"
  base::Result<Json> credential();

  // com.zentor.rvd.Management1
  // token: a descriptor from which the daemon reads the account's token; stays the caller's.
  base::Result<std::string> addAccount(const std::string& username, int token);
  base::Result<void> removeAccount(const std::string& accountID);
  base::Result<Json> accounts();
  base::Result<Json> authorizations();
  base::Result<Decision> authorize(const std::string& clientID);
  base::Result<Decision> revoke(const std::string& clientID);
  base::Result<Decision> revokeAll();
  base::Result<Json> pendingRevocations();
  base::Result<void> forgetRefusal(const std::string& clientID);
  base::Result<Json> accessLog(std::uint32_t limit);
  base::Result<Json> explain(const std::string& clientID, const ExplainOptions& options);

  base::Result<Json> preference(const std::string& applicationID, const std::string& key);  // null: not set
  base::Result<void> setPreference(const std::string& applicationID,
                                   const std::string& key,
                                   const Json& value);
  base::Result<void> resetPreference(const std::string& applicationID, const std::string& key);
  // Has everybody who keeps preferences read them anew.
  base::Result<void> announcePreferences();

  // Has changes of authorizations and pending revocations noticed from now on.
  base::Result<void> watchAuthorizations();
  // Waits for a change that was not waited for yet; false where none has come in time.
  base::Result<bool> waitForAuthorizations(std::chrono::steady_clock::time_point until);

 private:
  class Proxy;

  // Runs one call; what the bus or the daemon has against it becomes a failure.
  template <typename Call>
  auto call(const Call& body) -> base::Result<decltype(body(std::declval<Proxy&>()))>;

  const Connect connect_;
  std::unique_ptr<sdbus::IConnection> connection_;
  std::unique_ptr<Proxy> proxy_;
};

}  // namespace cli
