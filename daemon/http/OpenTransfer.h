// One transfer while it lasts: its settings, and what has come of its answer.
#pragma once

#include <curl/curl.h>

#include <memory>
#include <optional>
#include <string>

#include "daemon/http/TransferThread.h"

namespace http {

// How a transfer ended; see TransferThread::start.
struct TransferOutcome {
  std::optional<std::string> body;
  std::optional<TKHTTPResponse> response;
  std::optional<RVError> error;
};

// Used on the transfer thread alone once it has been made.
class OpenTransfer {
 public:
  OpenTransfer(Transfer transfer, TKFacebookRequestHandler handler);
  OpenTransfer(const OpenTransfer&) = delete;
  OpenTransfer& operator=(const OpenTransfer&) = delete;
  ~OpenTransfer();

  // Sets the transfer up. Returns why it cannot be sent; handle() is null then.
  std::optional<RVError> prepare();

  // The CURL easy handle, owned by this object.
  CURL* handle() const { return handle_.get(); }

  bool mayEndLate() const { return transfer_.mayEndLate; }

  // What came of it. Called once, after libcurl has said that the transfer is done.
  TransferOutcome takeOutcome(CURLcode result);

  // Called once.
  TKFacebookRequestHandler takeHandler() { return std::move(handler_); }

 private:
  static std::size_t receiveHeader(char* bytes, std::size_t size, std::size_t count, void* self) noexcept;
  static std::size_t receiveBody(char* bytes, std::size_t size, std::size_t count, void* self) noexcept;
  static curl_socket_t openSocket(void* self, curlsocktype purpose, curl_sockaddr* address) noexcept;

  template <typename Value>
  void set(CURLoption option, Value value);
  bool addHeader(const std::string& name, std::string_view value);
  bool writeHeaders();
  void writeForm();
  void setWhatIsSent(const std::string& url);
  void setLimits();
  void setTrust();
  RVError errorOf(CURLcode result) const;
  std::string trustProblem(CURLcode result) const;

  Transfer transfer_;
  TKFacebookRequestHandler handler_;

  std::unique_ptr<CURL, decltype(&curl_easy_cleanup)> handle_;
  std::unique_ptr<curl_slist, decltype(&curl_slist_free_all)> headers_;
  std::string form_;
  bool isEncrypted_ = false;
  bool areSettingsTaken_ = true;

  std::size_t headerSize_ = 0;
  std::string body_;
  bool isTooLarge_ = false;
  bool isPeerRefused_ = false;
};

// Overwrites what a text that may hold a token holds.
void wipeText(std::string& text);

}  // namespace http
