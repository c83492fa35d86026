// rvd-standin: a Facebook server for one's own machine.
#include <CLI/CLI.hpp>
#include <csignal>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

#include "standin-server/Exchanges.h"
#include "standin-server/RequestLog.h"
#include "standin-server/Script.h"
#include "standin-server/StandInServer.h"

#if defined(__SANITIZE_THREAD__)
// The HTTP library is not built with the sanitizer, which sees its threads' memory but not what orders them.
extern "C" const char* __tsan_default_options() {
  return "ignore_noninstrumented_modules=1";
}
#endif

namespace {

constexpr char kDescription[] =
    "Stands in for the Facebook server on a loopback port. Prints its URL as the first line of standard "
    "output\n"
    "and serves until it gets SIGTERM or SIGINT.\n\n"
    "  POST /authorize   issues a random token for app_id, bundle_id and permissions\n"
    "  POST /describe    describes permissions that it was told about; \"API_EC_PARAM\" for others\n"
    "  POST /revoke      forgets the tokens that it issued for app_id\n"
    "  GET  /whoami      tells what the bearer token was issued for; 401 where it is not valid (any more)\n";

constexpr char kFooter[] =
    "A script is a JSON list of answers, given in order. Each may have: exchange (which one it is for), "
    "delay_ms,\n"
    "status, headers, body, drop (before-headers, after-headers, mid-body), endless (true), slow_ms (after "
    "each\n"
    "byte). With nothing but exchange and delay_ms the usual answer is given, later.\n\n"
    "Exit status: 0 ended by a signal, 2 wrong use, 3 could not serve.";

struct Arguments {
  standin::ServerOptions server;
  std::string portFile;
  std::string tokenFile;
  std::string scriptFile;
  std::string logFile;
  std::vector<std::string> appIDs;
  std::vector<std::string> descriptions;
};

std::string contentOf(const std::string& path) {
  std::ifstream file(path);
  if (!file) throw std::runtime_error("cannot read " + path);
  return {std::istreambuf_iterator<char>(file), {}};
}

standin::Knowledge knowledgeFrom(const Arguments& arguments) {
  standin::Knowledge knowledge;
  knowledge.appIDs.insert(arguments.appIDs.begin(), arguments.appIDs.end());
  for (const std::string& description : arguments.descriptions) {
    const std::size_t equals = description.find('=');
    if (equals == std::string::npos || equals == 0)
      throw std::runtime_error("--describe takes NAME=TEXT or NAME@LANGUAGE=TEXT");
    knowledge.descriptions[description.substr(0, equals)] = description.substr(equals + 1);
  }
  if (arguments.tokenFile.empty()) return knowledge;
  std::istringstream lines(contentOf(arguments.tokenFile));
  for (std::string line; std::getline(lines, line);)
    if (!line.empty()) knowledge.accountTokens.insert(line);
  if (knowledge.accountTokens.empty()) throw std::runtime_error("no token in " + arguments.tokenFile);
  return knowledge;
}

// Whoever waits for the file never sees half of it.
void writePortFile(const std::string& path, int port) {
  const std::string unfinished = path + ".new";
  std::ofstream file(unfinished);
  file << port << std::endl;
  if (!file) throw std::runtime_error("cannot write " + unfinished);
  std::filesystem::rename(unfinished, path);
}

void serve(const Arguments& arguments) {
  // Blocked before there are threads, so that every thread has them blocked and sigwait gets them.
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGTERM);
  sigaddset(&signals, SIGINT);
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  std::signal(SIGPIPE, SIG_IGN);

  standin::Exchanges exchanges(knowledgeFrom(arguments));
  standin::Script script(arguments.scriptFile.empty() ? "[]" : contentOf(arguments.scriptFile));
  standin::RequestLog log(arguments.logFile);
  const standin::StandInServer server(arguments.server, exchanges, script, log);
  if (!arguments.portFile.empty()) writePortFile(arguments.portFile, server.port());
  std::cout << server.url() << std::endl;
  int signal = 0;
  sigwait(&signals, &signal);
}

}  // namespace

int main(int argc, char** argv) {
  Arguments arguments;
  CLI::App app(kDescription, "rvd-standin");
  app.footer(kFooter);
  app.add_option("--port", arguments.server.port, "port to listen on; 0 for any free one")
      ->check(CLI::Range(0, 65535))
      ->capture_default_str();
  app.add_option("--port-file", arguments.portFile, "write the port into this file once it listens");
  app.add_option(
      "--token-file", arguments.tokenFile, "accounts' tokens, one a line; without it any token will do");
  app.add_option(
      "--app-id", arguments.appIDs, "an application that may ask; without it any may (repeatable)");
  app.add_option("--describe", arguments.descriptions, "NAME=TEXT or NAME@LANGUAGE=TEXT (repeatable)");
  app.add_option("--script", arguments.scriptFile, "answers to give instead of the usual ones");
  app.add_option("--log", arguments.logFile, "append what was asked, as JSON lines without tokens");
  auto* certificate =
      app.add_option("--cert", arguments.server.certificate, "serve https with this PEM file");
  auto* key = app.add_option("--key", arguments.server.privateKey, "the certificate's private key");
  certificate->needs(key);
  key->needs(certificate);
  for (const char* repeatable : {"--app-id", "--describe"})
    app.get_option(repeatable)->expected(1)->take_all();
  try {
    app.parse(argc, argv);
  } catch (const CLI::Success& success) {
    return app.exit(success);
  } catch (const CLI::Error& error) {
    app.exit(error);
    return 2;
  }
  try {
    serve(arguments);
  } catch (const std::exception& exception) {
    std::cerr << "rvd-standin: " << exception.what() << '\n';
    return 3;
  }
  return 0;
}
