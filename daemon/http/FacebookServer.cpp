#include "daemon/http/FacebookServer.h"

#include "daemon/http/ServerURL.h"
#include "daemon/http/TransferErrors.h"

namespace http {

FacebookServer::FacebookServer(TransferThread& transfers,
                               FacebookServerSettings settings,
                               std::string acceptLanguage)
    : transfers_(transfers),
      settings_(std::move(settings)),
      acceptLanguage_(std::move(acceptLanguage)) {
}

std::optional<TransferThread::ID> FacebookServer::begin(const std::string& exchange,
                                                        Form form,
                                                        std::optional<RVSecret> token,
                                                        TKFacebookRequestHandler handler) {
  return begin(transferFor(exchange, std::move(form), std::move(token)), std::move(handler));
}

void FacebookServer::beginRevocation(const std::string& appID,
                                     std::optional<RVSecret> token,
                                     TKFacebookRequestHandler handler) {
  Transfer transfer = transferFor("revoke", {{"app_id", appID}}, std::move(token));
  transfer.mayEndLate = true;
  begin(std::move(transfer), std::move(handler));
}

std::optional<TransferThread::ID> FacebookServer::begin(Transfer transfer, TKFacebookRequestHandler handler) {
  if (settings_.url) return transfers_.start(std::move(transfer), std::move(handler));
  transfers_.fail(*problem(), std::move(handler));
  return std::nullopt;
}

std::optional<RVError> FacebookServer::problem() const {
  if (settings_.url) return std::nullopt;
  return transferError(TransferErrorCode::kNoServer);
}

Transfer FacebookServer::transferFor(const std::string& exchange,
                                     Form form,
                                     std::optional<RVSecret> token) const {
  Transfer transfer;
  if (settings_.url) {
    // A URL that cannot be used is passed on as it is: the transfer fails and says why.
    const std::optional<ServerURL> server = readServerURL(*settings_.url);
    transfer.url = server ? server->text + "/" + exchange : *settings_.url;
  }
  transfer.form = std::move(form);
  transfer.bearerToken = std::move(token);
  transfer.acceptLanguage = acceptLanguage_;
  transfer.timeout = settings_.timeout;
  transfer.caFile = settings_.caFile;
  return transfer;
}

}  // namespace http
