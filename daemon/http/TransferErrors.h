// Why a transfer failed.
#pragma once

#include <string>

#include "host/Values.h"

namespace http {

// The codes of errors in the domain kRVTransferErrorDomain. They are shown to clients and kept in no
// store; a new one is added at the end.
enum class TransferErrorCode {
  kNoServer = 1,      // no server URL is set
  kServerNotAllowed,  // the URL is unusable, or names a server that may not be spoken to
  kCouldNotConnect,   // the name was not found, or nobody answered at the address
  kServerNotTrusted,  // no TLS connection to a server with a trusted certificate came about
  kTimedOut,          // the exchange did not end in time
  kConnectionBroken,  // the connection ended before the answer did
  kUnreadableAnswer,  // what came is not HTTP
  kNoBody,            // an answer came, without a body
  kAnswerTooLarge,    // the answer's header or body is over the limit
  kNotSendable,       // a value that the exchange cannot carry: see the description
  kCancelled,         // nobody wants the answer any more
  kStopping,          // the daemon is stopping
  kFailed,            // anything else
};

// An error with a description for people. The text is one of ours and quotes nothing that was sent or
// received. detail: where not empty, put behind it after a colon; the caller sees to it that it holds
// neither token nor body.
RVError transferError(TransferErrorCode code, const std::string& detail = {});

}  // namespace http
