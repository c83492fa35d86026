// The server that is spoken to: where it is, and how an exchange with it begins.
#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "daemon/http/TransferThread.h"
#include "host/RVDKeychainManager.h"
#include "host/TKFacebookRequests.h"

namespace http {

struct FacebookServerSettings {
  std::optional<std::string> url;    // absent: every exchange fails and says so
  std::chrono::seconds timeout{60};  // for one exchange
  std::string caFile;                // PEM file of the authorities to trust; empty: the system's
};

// Thread-safe.
class FacebookServer {
 public:
  using Form = std::vector<std::pair<std::string, std::string>>;

  // transfers: outlives this object. acceptLanguage: the user's languages, as the header of that name lists
  // them; may be empty.
  FacebookServer(TransferThread& transfers, FacebookServerSettings settings, std::string acceptLanguage);

  // Begins the exchange of that name and returns at once. The handler: as with TransferThread::start.
  // Absent where there is no server; the handler is then given the error.
  std::optional<TransferThread::ID> begin(const std::string& exchange,
                                          Form form,
                                          std::optional<RVSecret> token,
                                          TKFacebookRequestHandler handler);

  // Has the server forget the token of the app that it issued to the account whose own token is given.
  // When the daemon stops the exchange is given a moment more.
  void beginRevocation(const std::string& appID,
                       std::optional<RVSecret> token,
                       TKFacebookRequestHandler handler);

  // Why nothing can be sent, whatever it is; absent where something can.
  std::optional<RVError> problem() const;

  TransferThread& transfers() { return transfers_; }

 private:
  Transfer transferFor(const std::string& exchange, Form form, std::optional<RVSecret> token) const;
  std::optional<TransferThread::ID> begin(Transfer transfer, TKFacebookRequestHandler handler);

  TransferThread& transfers_;
  const FacebookServerSettings settings_;
  const std::string acceptLanguage_;
};

}  // namespace http
