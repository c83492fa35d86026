#include "daemon/http/OpenTransfer.h"

#include <openssl/x509.h>
#include <sys/socket.h>

#include <algorithm>
#include <chrono>
#include <utility>

#include "daemon/http/Loopback.h"
#include "daemon/http/ServerURL.h"
#include "daemon/http/TransferErrors.h"

namespace http {
namespace {

constexpr std::chrono::milliseconds kConnectTimeout{20'000};

bool isControlCharacter(char character) {
  const auto byte = static_cast<unsigned char>(character);
  return byte < 0x20 || byte == 0x7f;
}

// Appends without leaving a copy of the bytes in memory that the text has outgrown.
void appendWiping(std::string& text, const char* bytes, std::size_t size) {
  if (text.capacity() < text.size() + size) {
    std::string larger;
    larger.reserve(std::max(2 * text.capacity(), text.size() + size));
    larger = text;
    wipeText(text);
    text.swap(larger);
  }
  text.append(bytes, size);
}

long milliseconds(std::chrono::milliseconds duration) {
  return static_cast<long>(std::max<std::chrono::milliseconds::rep>(duration.count(), 1));
}

}  // namespace

void wipeText(std::string& text) {
  RVSecret::wipe(text.data(), text.size());
}

OpenTransfer::OpenTransfer(Transfer transfer, TKFacebookRequestHandler handler)
    : transfer_(std::move(transfer)),
      handler_(std::move(handler)),
      handle_(nullptr, &curl_easy_cleanup),
      headers_(nullptr, &curl_slist_free_all) {
}

OpenTransfer::~OpenTransfer() {
  wipeText(body_);
}

std::optional<RVError> OpenTransfer::prepare() {
  if (const auto problem = problemWithServerURL(transfer_.url))
    return transferError(TransferErrorCode::kServerNotAllowed, "its URL " + *problem);
  const std::optional<ServerURL> url = readServerURL(transfer_.url);
  isEncrypted_ = url->isEncrypted;

  handle_.reset(curl_easy_init());
  if (handle_ == nullptr) return transferError(TransferErrorCode::kFailed);
  if (!writeHeaders()) {
    handle_.reset();
    return transferError(TransferErrorCode::kNotSendable,
                         "the access token holds characters that no header can carry");
  }
  writeForm();
  setWhatIsSent(url->text);
  setLimits();
  setTrust();
  if (areSettingsTaken_) return std::nullopt;
  handle_.reset();
  return transferError(TransferErrorCode::kFailed, "libcurl does not take the settings");
}

template <typename Value>
void OpenTransfer::set(CURLoption option, Value value) {
  if (curl_easy_setopt(handle_.get(), option, value) != CURLE_OK) areSettingsTaken_ = false;
}

// False where the value holds what would end the header and begin another.
bool OpenTransfer::addHeader(const std::string& name, std::string_view value) {
  if (std::any_of(value.begin(), value.end(), isControlCharacter)) return false;
  std::string line = name + ":";
  line.reserve(line.size() + 1 + value.size());
  if (!value.empty()) line.append(" ").append(value);
  curl_slist* list = curl_slist_append(headers_.get(), line.c_str());
  wipeText(line);
  if (list == nullptr) return false;
  static_cast<void>(headers_.release());
  headers_.reset(list);
  return true;
}

bool OpenTransfer::writeHeaders() {
  addHeader("Expect", "");  // an empty value takes libcurl's own header out
  if (!transfer_.acceptLanguage.empty()) addHeader("Accept-Language", transfer_.acceptLanguage);
  if (!transfer_.bearerToken || transfer_.bearerToken->empty()) return true;
  // Made in one piece, so that no growing string leaves a part of the token behind.
  const std::string_view token = transfer_.bearerToken->reveal();
  std::string value;
  value.reserve(sizeof "Bearer " + token.size());
  value.append("Bearer ").append(token);
  const bool isAdded = addHeader("Authorization", value);
  wipeText(value);
  transfer_.bearerToken.reset();
  return isAdded;
}

void OpenTransfer::writeForm() {
  const auto escape = [this](const std::string& text) -> std::string {
    const std::unique_ptr<char, decltype(&curl_free)> escaped(
        curl_easy_escape(handle_.get(), text.c_str(), static_cast<int>(text.size())), &curl_free);
    if (escaped == nullptr) areSettingsTaken_ = false;
    return escaped != nullptr ? escaped.get() : "";
  };
  for (const auto& [name, value] : transfer_.form) {
    if (!form_.empty()) form_ += '&';
    form_ += escape(name) + "=" + escape(value);
  }
}

void OpenTransfer::setWhatIsSent(const std::string& url) {
  set(CURLOPT_URL, url.c_str());
  set(CURLOPT_HTTPHEADER, headers_.get());
  set(CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(form_.size()));
  set(CURLOPT_POSTFIELDS, form_.c_str());
  set(CURLOPT_PROTOCOLS_STR, isEncrypted_ ? "https" : "http");
  set(CURLOPT_HTTP_VERSION, static_cast<long>(CURL_HTTP_VERSION_1_1));
  set(CURLOPT_PROXY, "");  // otherwise the environment's
  set(CURLOPT_FOLLOWLOCATION, 0L);
  // libcurl repeats a request whose kept connection turns out to be dead.
  set(CURLOPT_FRESH_CONNECT, 1L);
  set(CURLOPT_FORBID_REUSE, 1L);
}

void OpenTransfer::setLimits() {
  set(CURLOPT_NOSIGNAL, 1L);
  set(CURLOPT_TIMEOUT_MS, milliseconds(transfer_.timeout));
  set(CURLOPT_CONNECTTIMEOUT_MS, milliseconds(std::min(transfer_.timeout, kConnectTimeout)));
  // Giving up does not wait for a name server that does not answer: the thread that asks it is left
  // to end by itself.
  set(CURLOPT_QUICK_EXIT, 1L);
  // Refuses by what the server announces; what it then sends is counted in receiveBody.
  set(CURLOPT_MAXFILESIZE_LARGE, static_cast<curl_off_t>(kMaximumBodySize));
  set(CURLOPT_HEADERFUNCTION, &OpenTransfer::receiveHeader);
  set(CURLOPT_HEADERDATA, static_cast<void*>(this));
  set(CURLOPT_WRITEFUNCTION, &OpenTransfer::receiveBody);
  set(CURLOPT_WRITEDATA, static_cast<void*>(this));
}

void OpenTransfer::setTrust() {
  set(CURLOPT_OPENSOCKETFUNCTION, &OpenTransfer::openSocket);
  set(CURLOPT_OPENSOCKETDATA, static_cast<void*>(this));
  set(CURLOPT_SSLVERSION, static_cast<long>(CURL_SSLVERSION_TLSv1_2));
  set(CURLOPT_SSL_VERIFYPEER, 1L);
  set(CURLOPT_SSL_VERIFYHOST, 2L);
  if (transfer_.caFile.empty()) return;
  set(CURLOPT_CAINFO, transfer_.caFile.c_str());
  set(CURLOPT_CAPATH, static_cast<char*>(nullptr));  // the system's authorities do not count beside it
}

std::size_t OpenTransfer::receiveHeader(char*, std::size_t size, std::size_t count, void* self) noexcept {
  auto* transfer = static_cast<OpenTransfer*>(self);
  transfer->headerSize_ += size * count;
  if (transfer->headerSize_ <= kMaximumHeaderSize) return size * count;
  transfer->isTooLarge_ = true;
  return 0;
}

std::size_t OpenTransfer::receiveBody(char* bytes, std::size_t size, std::size_t count, void* self) noexcept {
  auto* transfer = static_cast<OpenTransfer*>(self);
  if (size * count > kMaximumBodySize - transfer->body_.size()) {
    transfer->isTooLarge_ = true;
    return 0;
  }
  appendWiping(transfer->body_, bytes, size * count);
  return size * count;
}

// The address is the one that is connected to, whatever a name in the URL resolved to.
curl_socket_t OpenTransfer::openSocket(void* self, curlsocktype, curl_sockaddr* address) noexcept {
  auto* transfer = static_cast<OpenTransfer*>(self);
  if (!transfer->isEncrypted_ && !isLoopback(address->addr, address->addrlen)) {
    transfer->isPeerRefused_ = true;
    return CURL_SOCKET_BAD;
  }
  return socket(address->family, address->socktype | SOCK_CLOEXEC, address->protocol);
}

TransferOutcome OpenTransfer::takeOutcome(CURLcode result) {
  TransferOutcome outcome;
  long status = 0;
  curl_easy_getinfo(handle_.get(), CURLINFO_RESPONSE_CODE, &status);
  if (status >= 200) outcome.response = TKHTTPResponse{static_cast<int>(status)};
  if (result != CURLE_OK)
    outcome.error = errorOf(result);
  else if (body_.empty())
    outcome.error = transferError(TransferErrorCode::kNoBody);
  else
    outcome.body = std::move(body_);
  return outcome;
}

RVError OpenTransfer::errorOf(CURLcode result) const {
  if (isTooLarge_) return transferError(TransferErrorCode::kAnswerTooLarge);
  if (isPeerRefused_)
    return transferError(TransferErrorCode::kServerNotAllowed,
                         "without encryption only this machine's loopback address is spoken to");
  // libcurl's fixed text of the code. Its longer one (CURLOPT_ERRORBUFFER) may quote the answer.
  const std::string text = curl_easy_strerror(result);
  switch (result) {
    case CURLE_COULDNT_RESOLVE_HOST:
    case CURLE_COULDNT_CONNECT:
      return transferError(TransferErrorCode::kCouldNotConnect, text);
    case CURLE_SSL_CONNECT_ERROR:
    case CURLE_PEER_FAILED_VERIFICATION:
    case CURLE_SSL_CACERT_BADFILE:
    case CURLE_SSL_CERTPROBLEM:
    case CURLE_SSL_CIPHER:
    case CURLE_SSL_ISSUER_ERROR:
      return transferError(TransferErrorCode::kServerNotTrusted, trustProblem(result));
    case CURLE_OPERATION_TIMEDOUT:
      return transferError(TransferErrorCode::kTimedOut);
    case CURLE_GOT_NOTHING:
    case CURLE_PARTIAL_FILE:
    case CURLE_RECV_ERROR:
    case CURLE_SEND_ERROR:
      return transferError(TransferErrorCode::kConnectionBroken, text);
    case CURLE_UNSUPPORTED_PROTOCOL:
    case CURLE_WEIRD_SERVER_REPLY:
    case CURLE_BAD_CONTENT_ENCODING:
      return transferError(TransferErrorCode::kUnreadableAnswer);
    case CURLE_FILESIZE_EXCEEDED:
      return transferError(TransferErrorCode::kAnswerTooLarge);
    default:
      return transferError(TransferErrorCode::kFailed, text);
  }
}

std::string OpenTransfer::trustProblem(CURLcode result) const {
  if (result == CURLE_SSL_CACERT_BADFILE)
    return "the file of trusted authorities cannot be read: " + transfer_.caFile;
  if (result != CURLE_PEER_FAILED_VERIFICATION) return curl_easy_strerror(result);
  // libcurl leaves it as unspecified where the certificate is good, and its host is not.
  long verification = X509_V_ERR_UNSPECIFIED;
  curl_easy_getinfo(handle_.get(), CURLINFO_SSL_VERIFYRESULT, &verification);
  if (verification == X509_V_OK || verification == X509_V_ERR_UNSPECIFIED)
    return "its certificate is for another host";
  return X509_verify_cert_error_string(verification);
}

}  // namespace http
