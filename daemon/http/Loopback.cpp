#include "daemon/http/Loopback.h"

#include <cstring>

namespace http {

bool isLoopback(const sockaddr& address, socklen_t length) {
  if (address.sa_family == AF_INET && length >= sizeof(sockaddr_in)) {
    sockaddr_in v4;
    std::memcpy(&v4, &address, sizeof v4);
    return isLoopbackIPv4(v4.sin_addr);
  }
  if (address.sa_family == AF_INET6 && length >= sizeof(sockaddr_in6)) {
    sockaddr_in6 v6;
    std::memcpy(&v6, &address, sizeof v6);
    return IN6_IS_ADDR_LOOPBACK(&v6.sin6_addr) != 0;
  }
  return false;
}

}  // namespace http
