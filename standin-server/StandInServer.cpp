#include "standin-server/StandInServer.h"

#include <httplib.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <algorithm>
#include <charconv>
#include <filesystem>
#include <stdexcept>
#include <utility>

namespace standin {
namespace {

constexpr char kHost[] = "127.0.0.1";
constexpr std::size_t kThreads = 64;  // a slow answer holds one

std::unique_ptr<httplib::Server> newServer(const ServerOptions& options) {
  if (options.certificate.empty()) return std::make_unique<httplib::Server>();
  return std::make_unique<httplib::SSLServer>(options.certificate.c_str(), options.privateKey.c_str());
}

std::optional<std::string> bearerToken(const httplib::Request& request) {
  constexpr std::string_view kScheme = "Bearer ";
  const std::string header = request.get_header_value("Authorization");
  if (header.compare(0, kScheme.size(), kScheme) != 0) return std::nullopt;
  return header.substr(kScheme.size());
}

// Ends the connection that the request came on. The library gives a handler no hold of it, so it is looked
// for among the process's own sockets, by the client's port.
void dropConnection(const httplib::Request& request) {
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    const std::string name = entry.path().filename();
    int descriptor = -1;
    std::from_chars(name.data(), name.data() + name.size(), descriptor);
    sockaddr_in local{};
    sockaddr_in peer{};
    socklen_t localSize = sizeof local;
    socklen_t peerSize = sizeof peer;
    if (getsockname(descriptor, reinterpret_cast<sockaddr*>(&local), &localSize) != 0) continue;
    if (getpeername(descriptor, reinterpret_cast<sockaddr*>(&peer), &peerSize) != 0) continue;
    if (local.sin_family != AF_INET || ntohs(local.sin_port) != request.local_port) continue;
    if (ntohs(peer.sin_port) == request.remote_port) shutdown(descriptor, SHUT_RDWR);
  }
}

}  // namespace

StandInServer::StandInServer(const ServerOptions& options,
                             Exchanges& exchanges,
                             Script& script,
                             RequestLog& log)
    : exchanges_(exchanges),
      script_(script),
      log_(log),
      server_(newServer(options)) {
  if (!server_->is_valid()) throw std::runtime_error("the certificate or its key cannot be used");
  server_->new_task_queue = [] { return new httplib::ThreadPool(kThreads); };
  server_->set_keep_alive_max_count(1);
  server_->set_socket_options([](int socket) {
    const int yes = 1;
    setsockopt(socket, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof yes);
  });
  const auto handler = [this](const std::string& exchange) {
    return [this, exchange](const httplib::Request& request, httplib::Response& response) {
      serve(exchange, request, response);
    };
  };
  for (const std::string exchange : {"authorize", "describe", "revoke"})
    server_->Post("/" + exchange, handler(exchange));
  server_->Get("/whoami", handler("whoami"));

  if (options.port == 0)
    port_ = server_->bind_to_any_port(kHost);
  else if (server_->bind_to_port(kHost, options.port))
    port_ = options.port;
  if (port_ <= 0) throw std::runtime_error("cannot listen on port " + std::to_string(options.port));
  url_ = (options.certificate.empty() ? "http://" : "https://") + std::string(kHost) + ":" +
         std::to_string(port_);
  thread_ = std::thread([this] { server_->listen_after_bind(); });
  // stop() before the loop runs would have no effect.
  while (!server_->is_running()) std::this_thread::yield();
}

StandInServer::~StandInServer() {
  {
    const std::lock_guard lock(mutex_);
    isStopping_ = true;
  }
  stopped_.notify_all();
  server_->stop();
  thread_.join();
}

void StandInServer::serve(const std::string& exchange,
                          const httplib::Request& request,
                          httplib::Response& response) {
  Question question{exchange, bearerToken(request), {}, request.get_header_value("Accept-Language")};
  for (const auto& [name, value] : request.params) question.parameters.emplace(name, value);

  const std::optional<ScriptedAnswer> scripted = script_.takeFor(exchange);
  if (scripted && scripted->replacesAnswer) {
    const bool isDropped = scripted->drop == ScriptedAnswer::Drop::kBeforeHeaders;
    log_.write(request.method,
               request.path,
               question,
               {isDropped ? 0 : scripted->status, scripted->body},
               exchanges_);
    waitFor(scripted->delay);
    misbehave(*scripted, request, response);
    return;
  }
  const Answer answer = exchanges_.answer(question);
  log_.write(request.method, request.path, question, answer, exchanges_);
  if (scripted) waitFor(scripted->delay);
  response.status = answer.status;
  response.set_content(answer.body, "application/json");
}

void StandInServer::misbehave(const ScriptedAnswer& answer,
                              const httplib::Request& request,
                              httplib::Response& response) {
  using Drop = ScriptedAnswer::Drop;
  if (answer.drop == Drop::kBeforeHeaders) return dropConnection(request);
  response.status = answer.status;
  for (const auto& [name, value] : answer.headers) response.set_header(name, value);
  if (answer.isEndless) {
    response.set_chunked_content_provider(
        "application/json", [this, answer](std::size_t, httplib::DataSink& sink) {
          return sink.write(answer.body.data(), answer.body.size()) && waitFor(answer.pause);
        });
    return;
  }
  if (answer.drop == Drop::kNever && answer.pause.count() == 0) {
    response.set_content(answer.body, "application/json");
    return;
  }
  // The length promises the whole body (or one, where none is given), whatever then comes of it.
  const std::size_t length = std::max<std::size_t>(answer.body.size(), 2);
  const std::size_t end = answer.drop == Drop::kNever          ? answer.body.size()
                          : answer.drop == Drop::kAfterHeaders ? 0
                                                               : answer.body.size() / 2;
  response.set_content_provider(
      length, "application/json", [this, answer, end](std::size_t at, std::size_t, httplib::DataSink& sink) {
        return at < end && sink.write(answer.body.data() + at, 1) && waitFor(answer.pause);
      });
}

// Returns false where the server is stopping.
bool StandInServer::waitFor(std::chrono::milliseconds duration) {
  std::unique_lock lock(mutex_);
  return !stopped_.wait_for(lock, duration, [this] { return isStopping_; });
}

}  // namespace standin
