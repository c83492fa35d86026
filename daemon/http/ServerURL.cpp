#include "daemon/http/ServerURL.h"

#include <arpa/inet.h>
#include <curl/curl.h>
#include <strings.h>

#include <algorithm>
#include <memory>
#include <variant>

#include "daemon/http/Loopback.h"

namespace http {
namespace {

using URL = std::unique_ptr<CURLU, decltype(&curl_url_cleanup)>;

// A part of the URL, empty where the URL has none.
std::string partOf(const URL& url, CURLUPart part) {
  char* text = nullptr;
  if (curl_url_get(url.get(), part, &text, 0) != CURLUE_OK) return {};
  const std::unique_ptr<char, decltype(&curl_free)> owned(text, &curl_free);
  return text;
}

bool isLoopbackHost(const std::string& host) {
  if (strcasecmp(host.c_str(), "localhost") == 0) return true;
  if (host == "[::1]") return true;
  in_addr address{};
  return inet_pton(AF_INET, host.c_str(), &address) == 1 && isLoopbackIPv4(address);
}

// Bytes that no URL holds as they are. Readers of URLs differ in what they make of them, so nothing that
// holds one is read at all; a host name in another script is written in its ASCII form.
bool isOutOfPlace(char character) {
  const auto byte = static_cast<unsigned char>(character);
  return byte <= 0x20 || byte >= 0x7f || character == '\\';
}

using Reading = std::variant<ServerURL, std::string>;  // the URL, or the problem

Reading read(const std::string& text) {
  if (text.empty()) return "is empty";
  if (std::any_of(text.begin(), text.end(), isOutOfPlace))
    return "holds a blank, a backslash or a character outside ASCII";
  if (text.find('?') != std::string::npos) return "has a query";
  if (text.find('#') != std::string::npos) return "has a fragment";

  const URL url(curl_url(), &curl_url_cleanup);
  switch (curl_url_set(url.get(), CURLUPART_URL, text.c_str(), CURLU_DISALLOW_USER)) {
    case CURLUE_OK:
      break;
    case CURLUE_USER_NOT_ALLOWED:
      return "has a user name";
    case CURLUE_UNSUPPORTED_SCHEME:
      return "is neither https nor http";
    default:
      return "cannot be read as a URL";
  }
  const std::string scheme = partOf(url, CURLUPART_SCHEME);
  const std::string host = partOf(url, CURLUPART_HOST);
  const bool isEncrypted = scheme == "https";
  if (!isEncrypted && scheme != "http") return "is neither https nor http";
  if (host.empty()) return "has no host";
  if (!partOf(url, CURLUPART_ZONEID).empty()) return "has a network interface in its host";
  if (!isEncrypted && !isLoopbackHost(host))
    return "is plain http to a host that is not this machine's loopback address";

  std::string normal = partOf(url, CURLUPART_URL);
  if (normal.empty()) return "cannot be read as a URL";
  while (normal.back() == '/') normal.pop_back();
  return ServerURL{std::move(normal), isEncrypted};
}

}  // namespace

std::optional<std::string> problemWithServerURL(const std::string& text) {
  const Reading reading = read(text);
  const auto* problem = std::get_if<std::string>(&reading);
  return problem != nullptr ? std::optional(*problem) : std::nullopt;
}

std::optional<ServerURL> readServerURL(const std::string& text) {
  const Reading reading = read(text);
  const auto* url = std::get_if<ServerURL>(&reading);
  return url != nullptr ? std::optional(*url) : std::nullopt;
}

}  // namespace http
