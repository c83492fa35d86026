#include "tests/support/LoopbackServer.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <utility>

namespace support {
namespace {

std::string decoded(std::string_view text) {
  std::string plain;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '%' && i + 2 < text.size()) {
      plain += static_cast<char>(std::stoi(std::string(text.substr(i + 1, 2)), nullptr, 16));
      i += 2;
    } else {
      plain += text[i] == '+' ? ' ' : text[i];
    }
  }
  return plain;
}

std::optional<HeardRequest> readRequest(int socket) {
  std::string bytes;
  char buffer[4096];
  for (;;) {
    const std::size_t end = bytes.find("\r\n\r\n");
    if (end != std::string::npos) {
      HeardRequest request{bytes.substr(0, end + 4), bytes.substr(end + 4)};
      const std::string length = request.header("content-length");
      if (length.empty() || request.body.size() >= std::stoul(length)) return request;
    }
    const ssize_t count = recv(socket, buffer, sizeof buffer, 0);
    if (count <= 0) return std::nullopt;
    bytes.append(buffer, static_cast<std::size_t>(count));
  }
}

}  // namespace

std::string HeardRequest::method() const {
  return head.substr(0, head.find(' '));
}

std::string HeardRequest::path() const {
  const std::size_t start = head.find(' ') + 1;
  return head.substr(start, head.find(' ', start) - start);
}

std::string HeardRequest::header(const std::string& name) const {
  std::istringstream lines(head);
  for (std::string line; std::getline(lines, line);) {
    const std::size_t colon = line.find(':');
    if (colon != name.size()) continue;
    std::string found = line.substr(0, colon);
    std::transform(found.begin(), found.end(), found.begin(), [](unsigned char c) {
      return static_cast<char>(std::tolower(c));
    });
    if (found != name) continue;
    const std::size_t start = line.find_first_not_of(" \t", colon + 1);
    const std::size_t end = line.find_last_not_of(" \t\r");
    return start <= end && start != std::string::npos ? line.substr(start, end + 1 - start) : std::string();
  }
  return {};
}

std::multimap<std::string, std::string> HeardRequest::form() const {
  std::multimap<std::string, std::string> fields;
  std::istringstream parts(body);
  for (std::string part; std::getline(parts, part, '&');) {
    const std::size_t equals = part.find('=');
    fields.emplace(decoded(part.substr(0, equals)), decoded(part.substr(equals + 1)));
  }
  return fields;
}

bool LoopbackConnection::send(std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t count = ::send(socket_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (count <= 0) return false;
    bytes.remove_prefix(static_cast<std::size_t>(count));
  }
  return true;
}

bool LoopbackConnection::waitUntilClientGoes(std::chrono::milliseconds limit) {
  pollfd one{socket_, POLLIN | POLLRDHUP, 0};
  return poll(&one, 1, static_cast<int>(limit.count())) > 0;
}

void LoopbackConnection::reset() {
  const linger none{1, 0};
  setsockopt(socket_, SOL_SOCKET, SO_LINGER, &none, sizeof none);
}

LoopbackServer::LoopbackServer(Responder responder)
    : responder_(std::move(responder)) {
  listener_ = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t size = sizeof address;
  if (bind(listener_, reinterpret_cast<sockaddr*>(&address), size) != 0 || listen(listener_, 1024) != 0 ||
      getsockname(listener_, reinterpret_cast<sockaddr*>(&address), &size) != 0)
    throw std::runtime_error("no loopback port");
  port_ = ntohs(address.sin_port);
  acceptor_ = std::thread([this] { acceptAll(); });
}

LoopbackServer::LoopbackServer(std::string answer)
    : LoopbackServer([answer = std::move(answer)](LoopbackConnection& connection, const HeardRequest&) {
        connection.send(answer);
      }) {
}

LoopbackServer::~LoopbackServer() {
  shutdown(listener_, SHUT_RDWR);
  acceptor_.join();
  close(listener_);
  {
    const std::lock_guard lock(mutex_);
    for (const int socket : openSockets_) shutdown(socket, SHUT_RDWR);
  }
  for (std::thread& connection : connections_) connection.join();
}

std::vector<HeardRequest> LoopbackServer::heard() const {
  const std::lock_guard lock(mutex_);
  return heard_;
}

bool LoopbackServer::waitForRequests(std::size_t count) {
  std::unique_lock lock(mutex_);
  return changed_.wait_for(lock, std::chrono::seconds(30), [&] { return heard_.size() >= count; });
}

void LoopbackServer::acceptAll() {
  for (;;) {
    const int socket = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
    if (socket < 0) return;
    ++connectionCount_;
    const std::lock_guard lock(mutex_);
    openSockets_.push_back(socket);
    connections_.emplace_back([this, socket] { serve(socket); });
  }
}

void LoopbackServer::serve(int socket) {
  if (const auto request = readRequest(socket)) {
    {
      const std::lock_guard lock(mutex_);
      heard_.push_back(*request);
    }
    changed_.notify_all();
    LoopbackConnection connection(socket);
    responder_(connection, *request);
  }
  const std::lock_guard lock(mutex_);
  openSockets_.erase(std::find(openSockets_.begin(), openSockets_.end(), socket));
  close(socket);
}

std::string httpAnswer(std::string_view body, int status, std::string_view headers) {
  std::string answer = "HTTP/1.1 " + std::to_string(status) + " Status\r\n";
  answer.append(headers).append("Content-Length: " + std::to_string(body.size()) + "\r\n\r\n").append(body);
  return answer;
}

}  // namespace support
