// A server on a loopback port that says exactly the bytes that a test wants said.
#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <list>
#include <map>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

namespace support {

// One HTTP request as it came over the wire.
struct HeardRequest {
  std::string head;  // request line and header lines, the empty line included
  std::string body;

  std::string method() const;
  std::string path() const;
  // The header's value, empty where there is none. The name in lower case.
  std::string header(const std::string& name) const;
  // The body's fields, decoded.
  std::multimap<std::string, std::string> form() const;
};

// The server's end of a connection, during its responder.
class LoopbackConnection {
 public:
  explicit LoopbackConnection(int socket)
      : socket_(socket) {}

  // Returns false where the client has gone.
  bool send(std::string_view bytes);
  // Waits until the client has gone or the time is over; returns whether it has gone.
  bool waitUntilClientGoes(std::chrono::milliseconds limit = std::chrono::seconds(30));
  // Ends the connection with a reset when the responder returns.
  void reset();

 private:
  const int socket_;
};

// Serves from construction to destruction, each connection on a thread of its own and for one request.
class LoopbackServer {
 public:
  using Responder = std::function<void(LoopbackConnection& connection, const HeardRequest& request)>;

  explicit LoopbackServer(Responder responder);
  // Gives every request the same bytes.
  explicit LoopbackServer(std::string answer);
  ~LoopbackServer();

  int port() const { return port_; }
  std::string url() const { return "http://127.0.0.1:" + std::to_string(port_); }

  // The requests that have come whole, in that order.
  std::vector<HeardRequest> heard() const;
  int connectionCount() const { return connectionCount_; }
  // Waits for that many requests, for half a minute at most; returns whether they came.
  [[nodiscard]] bool waitForRequests(std::size_t count);

 private:
  void acceptAll();
  void serve(int socket);

  const Responder responder_;
  int listener_ = -1;
  int port_ = 0;
  std::atomic<int> connectionCount_ = 0;
  mutable std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<HeardRequest> heard_;
  std::vector<int> openSockets_;
  std::list<std::thread> connections_;
  std::thread acceptor_;
};

// "HTTP/1.1 200 OK" with the length of the body and nothing else.
std::string httpAnswer(std::string_view body, int status = 200, std::string_view headers = {});

}  // namespace support
