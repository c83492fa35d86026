// The one place that says which server may be spoken to.
#pragma once

#include <optional>
#include <string>

namespace http {

// A server URL after it was read and found to be allowed.
struct ServerURL {
  std::string text;          // in its normal form, without a slash at its end
  bool isEncrypted = false;  // https; otherwise plain http to a loopback address
};

// What is wrong with the URL, as the end of a sentence that begins with "The server URL"; nothing where it
// can be used. Allowed are https to any host, and plain http to a loopback address: 127.0.0.0/8, [::1] or
// "localhost". A port and a path may stand in it; a user name, a query or a fragment may not.
std::optional<std::string> problemWithServerURL(const std::string& text);

// The URL; absent where there is a problem with it.
std::optional<ServerURL> readServerURL(const std::string& text);

}  // namespace http
