// The stand-in server on its port.
#pragma once

#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "standin-server/Exchanges.h"
#include "standin-server/RequestLog.h"
#include "standin-server/Script.h"

namespace httplib {
class Server;
struct Request;
struct Response;
}  // namespace httplib

namespace standin {

struct ServerOptions {
  int port = 0;             // 0: any free one
  std::string certificate;  // PEM files; both empty: plain http
  std::string privateKey;
};

// Serves on 127.0.0.1 from its construction to its destruction, on threads of its own.
class StandInServer {
 public:
  // exchanges, script, log: outlive this object. Throws std::runtime_error where it cannot listen.
  StandInServer(const ServerOptions& options, Exchanges& exchanges, Script& script, RequestLog& log);
  StandInServer(const StandInServer&) = delete;
  StandInServer& operator=(const StandInServer&) = delete;
  ~StandInServer();

  int port() const { return port_; }
  const std::string& url() const { return url_; }

 private:
  void serve(const std::string& exchange, const httplib::Request& request, httplib::Response& response);
  void misbehave(const ScriptedAnswer& answer, const httplib::Request& request, httplib::Response& response);
  bool waitFor(std::chrono::milliseconds duration);

  Exchanges& exchanges_;
  Script& script_;
  RequestLog& log_;
  std::mutex mutex_;
  std::condition_variable stopped_;
  bool isStopping_ = false;
  std::unique_ptr<httplib::Server> server_;
  int port_ = 0;
  std::string url_;
  std::thread thread_;
};

}  // namespace standin
