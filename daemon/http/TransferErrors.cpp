#include "daemon/http/TransferErrors.h"

namespace http {
namespace {

std::string description(TransferErrorCode code) {
  switch (code) {
    case TransferErrorCode::kNoServer:
      return "No Facebook server is set up: the setting URL of the section [Server] is missing.";
    case TransferErrorCode::kServerNotAllowed:
      return "The Facebook server cannot be used";
    case TransferErrorCode::kCouldNotConnect:
      return "The Facebook server could not be reached";
    case TransferErrorCode::kServerNotTrusted:
      return "No trusted connection to the Facebook server could be made";
    case TransferErrorCode::kTimedOut:
      return "The Facebook server did not answer in time";
    case TransferErrorCode::kConnectionBroken:
      return "The connection to the Facebook server broke";
    case TransferErrorCode::kUnreadableAnswer:
      return "The Facebook server's answer is not HTTP";
    case TransferErrorCode::kNoBody:
      return "The Facebook server's answer has no body";
    case TransferErrorCode::kAnswerTooLarge:
      return "The Facebook server's answer is too large";
    case TransferErrorCode::kNotSendable:
      return "The request to the Facebook server cannot be sent";
    case TransferErrorCode::kCancelled:
      return "The exchange with the Facebook server was cancelled";
    case TransferErrorCode::kStopping:
      return "The daemon is stopping";
    case TransferErrorCode::kFailed:
      break;
  }
  return "The exchange with the Facebook server failed";
}

}  // namespace

RVError transferError(TransferErrorCode code, const std::string& detail) {
  std::string text = description(code);
  if (text.back() != '.') text += detail.empty() ? "." : ": " + detail + ".";
  return {std::string(kRVTransferErrorDomain),
          static_cast<std::int64_t>(code),
          {{std::string(kRVErrorLocalizedDescriptionKey), std::move(text)}}};
}

}  // namespace http
