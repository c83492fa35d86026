// Which addresses never leave this machine.
#pragma once

#include <netinet/in.h>
#include <sys/socket.h>

namespace http {

// 127.0.0.0/8.
inline bool isLoopbackIPv4(const in_addr& address) {
  return (ntohl(address.s_addr) >> 24) == 127;
}

// 127.0.0.0/8 or ::1; an IPv4 address in an IPv6 one is not.
bool isLoopback(const sockaddr& address, socklen_t length);

}  // namespace http
