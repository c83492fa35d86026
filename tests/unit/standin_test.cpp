#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <httplib.h>

#include <fstream>
#include <memory>
#include <sstream>
#include <string>

#include "daemon/http/JSONReader.h"
#include "daemon/http/TransferErrors.h"
#include "standin-server/StandInServer.h"
#include "tests/support/Certificates.h"
#include "tests/support/FacebookParts.h"
#include "tests/support/Outcome.h"

namespace {

using support::Outcome;
using support::PendingOutcome;
using testing::HasSubstr;
using testing::Not;

// The daemon's own requests against the stand-in server.
class TheStandInServer : public testing::Test {
 protected:
  TheStandInServer() {
    knowledge.accountTokens = {"master-canary"};
    knowledge.appIDs = {"4711", "4712"};
    knowledge.descriptions = {{"odd", "do odd things"}, {"odd@de", "Seltsames tun"}, {"other", "do others"}};
  }
  ~TheStandInServer() override { std::remove(logFile.c_str()); }

  void start(const std::string& scriptText = "[]") {
    server.reset();
    exchanges = std::make_unique<standin::Exchanges>(knowledge);
    script = std::make_unique<standin::Script>(scriptText);
    log = std::make_unique<standin::RequestLog>(logFile);
    server = std::make_unique<standin::StandInServer>(standin::ServerOptions{}, *exchanges, *script, *log);
    http::FacebookServerSettings settings;
    settings.url = server->url();
    settings.timeout = timeout;
    requests = &parts.requestsTo(settings, language);
  }

  template <typename Request>
  Outcome perform(const std::shared_ptr<Request>& request, const std::string& token = "master-canary") {
    request->setAccessToken(RVSecret(token));
    PendingOutcome pending;
    request->performRequestWithHandler(pending.handler());
    return pending.wait();
  }

  Outcome authorize(const std::string& token = "master-canary", const std::string& appID = "4711") {
    return perform(
        requests->initWithAppId(appID, "org.example.App", RVPermissionSet{"email", "odd"}, std::nullopt),
        token);
  }

  Outcome describe(const RVPermissionSet& permissions) {
    return perform(requests->initWithPermissions(permissions, std::nullopt));
  }

  static std::string member(const Outcome& outcome, const std::string& name) {
    const RVJSONResult document = http::JSONReader().objectWithData(outcome.body.value_or(""));
    if (!document.value || document.value->dictionary() == nullptr) return "no object";
    const RVValue* value = RVValueForKey(*document.value->dictionary(), name);
    return value != nullptr && value->string() != nullptr ? *value->string() : "no text";
  }

  // The status of GET /whoami with the token.
  int whoAmI(const std::string& token, std::string* body = nullptr) {
    httplib::Client client("127.0.0.1", server->port());
    const auto answer = client.Get("/whoami", {{"Authorization", "Bearer " + token}});
    if (!answer) return 0;
    if (body != nullptr) *body = answer->body;
    return answer->status;
  }

  std::string logged() const {
    std::ifstream file(logFile);
    std::stringstream text;
    text << file.rdbuf();
    return text.str();
  }

  const std::string logFile = testing::TempDir() + "rvd-test-standin-" + std::to_string(getpid()) + ".log";
  standin::Knowledge knowledge;
  std::string language;
  std::chrono::seconds timeout{60};
  std::unique_ptr<standin::Exchanges> exchanges;
  std::unique_ptr<standin::Script> script;
  std::unique_ptr<standin::RequestLog> log;
  std::unique_ptr<standin::StandInServer> server;
  support::FacebookParts parts;
  http::FacebookRequests* requests = nullptr;  // of parts
};

TEST_F(TheStandInServer, IssuesAnotherTokenEachTimeForWhatItWasAskedFor) {
  start();
  const Outcome first = authorize();
  const std::string token = member(first, "access_token");
  EXPECT_THAT(token, testing::StartsWith("standin."));
  EXPECT_THAT(*first.body, HasSubstr(R"("permissions":["email","odd"])"));
  EXPECT_NE(member(authorize(), "access_token"), token);
}

TEST_F(TheStandInServer, SaysWhatATokenWasIssuedForUntilItIsRevoked) {
  start();
  const std::string token = member(authorize(), "access_token");
  const std::string other = member(authorize("master-canary", "4712"), "access_token");
  std::string body;
  EXPECT_EQ(whoAmI(token, &body), 200);
  EXPECT_THAT(body, HasSubstr("org.example.App"));
  requests->initSession()->revokeAccessTokenForAppWithID("4711");
  parts.transfers.stop(std::chrono::hours(1));
  EXPECT_EQ(whoAmI(token), 401);
  EXPECT_EQ(whoAmI(other), 200) << "another application's token is left alone";
  EXPECT_TRUE(parts.state.log.texts().empty());
}

TEST_F(TheStandInServer, ChecksTheToken) {
  start();
  const Outcome foreign = authorize("stolen");
  EXPECT_EQ(foreign.response->statusCode, 401);
  EXPECT_EQ(member(foreign, "error_msg"), "The access token is not valid.");
  const Outcome issued = authorize(member(authorize(), "access_token"));
  EXPECT_EQ(issued.response->statusCode, 401) << "an application's token is no account's";
  EXPECT_EQ(authorize("").response->statusCode, 401);
  EXPECT_EQ(whoAmI("master-canary"), 401);
}

TEST_F(TheStandInServer, WithoutTokensTakesAnyButItsOwn) {
  knowledge.accountTokens.clear();
  start();
  const std::string token = member(authorize("any"), "access_token");
  EXPECT_EQ(authorize(token).response->statusCode, 401);
  EXPECT_EQ(authorize("").response->statusCode, 401);
}

TEST_F(TheStandInServer, ChecksTheApplication) {
  start();
  const Outcome outcome = authorize("master-canary", "666");
  EXPECT_EQ(outcome.response->statusCode, 400);
  EXPECT_EQ(member(outcome, "error_msg"), "The application is not known.");
}

TEST_F(TheStandInServer, DescribesWhatItWasToldAbout) {
  start();
  EXPECT_EQ(describe({"odd"}).body, "\"do odd things\"");
  EXPECT_EQ(describe({"odd", "other"}).body, "\"do odd things, do others\"");
  EXPECT_EQ(describe({"odd", "unheard-of"}).body, "\"API_EC_PARAM\"");
}

TEST_F(TheStandInServer, DescribesInTheLanguageThatItIsAskedFor) {
  language = "de-AT, en;q=0.5";
  start();
  EXPECT_EQ(describe({"odd"}).body, "\"Seltsames tun\"");
  EXPECT_EQ(describe({"other"}).body, "\"do others\"");
}

TEST_F(TheStandInServer, GivesTheAnswersOfItsScriptInOrder) {
  start(R"([{"exchange":"describe","status":503,"body":"\"later\""},
            {"status":302,"headers":{"Location":"http://127.0.0.1:1/"},"body":{"error_msg":"moved"}},
            {"exchange":"authorize","delay_ms":1}])");
  const Outcome moved = authorize();
  EXPECT_EQ(moved.response->statusCode, 302);
  EXPECT_EQ(member(moved, "error_msg"), "moved");
  EXPECT_THAT(member(authorize(), "access_token"), testing::StartsWith("standin."));
  const Outcome later = describe({"odd"});
  EXPECT_EQ(later.response->statusCode, 503);
  EXPECT_EQ(later.body, "\"later\"");
  EXPECT_EQ(describe({"odd"}).body, "\"do odd things\"");
}

TEST_F(TheStandInServer, MisbehavesAsItsScriptSays) {
  start(
      R"([{"drop":"before-headers"}, {"drop":"after-headers"}, {"drop":"mid-body","body":"\"half\""}, {"body":""},
            {"endless":true}])");
  using Code = http::TransferErrorCode;
  for (const Code code : {Code::kConnectionBroken,
                          Code::kConnectionBroken,
                          Code::kConnectionBroken,
                          Code::kNoBody,
                          Code::kAnswerTooLarge}) {
    const Outcome outcome = authorize();
    ASSERT_TRUE(outcome.error);
    EXPECT_EQ(outcome.error->code, static_cast<std::int64_t>(code)) << outcome.errorText();
  }
}

TEST_F(TheStandInServer, IsAsSlowAsItsScriptSays) {
  timeout = std::chrono::seconds(1);
  start(R"([{"slow_ms":300,"body":"\"slow\""}, {"delay_ms":3600000}])");
  for (int i = 0; i < 2; ++i) {
    const Outcome outcome = authorize();
    ASSERT_TRUE(outcome.error);
    EXPECT_EQ(outcome.error->code, static_cast<std::int64_t>(http::TransferErrorCode::kTimedOut));
  }
}

TEST_F(TheStandInServer, DoesNotTakeAScriptThatMakesNoSense) {
  for (const char* text : {"",
                           "{}",
                           "[1]",
                           "[{\"stauts\":200}]",
                           "[{\"status\":99}]",
                           "[{\"drop\":\"often\"}]",
                           "[{\"delay_ms\":-1}]",
                           "[{\"headers\":{\"a\":1}}]",
                           "[{}"})
    EXPECT_THROW(standin::Script{text}, std::runtime_error) << text;
}

TEST_F(TheStandInServer, LogsWhatItWasAskedAndNoToken) {
  start();
  const std::string token = member(authorize(), "access_token");
  perform(requests->initWithAppId("4711", "master-canary and " + token, std::nullopt, std::nullopt));
  requests->initSession()->revokeAccessTokenForAppWithID("4711");
  parts.transfers.stop(std::chrono::hours(1));
  const std::string lines = logged();
  EXPECT_EQ(std::count(lines.begin(), lines.end(), '\n'), 3);
  EXPECT_THAT(lines, HasSubstr(R"("permissions":"email,odd")"));
  EXPECT_THAT(lines, HasSubstr("\"token\":\"" + standin::hashOfToken("master-canary")));
  EXPECT_THAT(lines, HasSubstr("\"issued\":\"" + standin::hashOfToken(token)));
  EXPECT_THAT(lines,
              HasSubstr(standin::hashOfToken("master-canary") + " and " + standin::hashOfToken(token)));
  EXPECT_THAT(lines, Not(HasSubstr("canary")));
  EXPECT_THAT(lines, Not(HasSubstr(token)));
}

TEST_F(TheStandInServer, EndsWhileAnAnswerIsHeldBack) {
  timeout = std::chrono::seconds(1);
  start(R"([{"delay_ms":3600000}])");
  PendingOutcome pending;
  requests->initWithPermissions({"odd"}, std::nullopt)->performRequestWithHandler(pending.handler());
  EXPECT_TRUE(pending.wait().error);
  server.reset();
}

// The program itself.
class TheStandInProgram : public testing::Test {
 protected:
  ~TheStandInProgram() override {
    for (const std::string& file : files) std::remove(file.c_str());
  }

  std::string write(const std::string& name, const std::string& content) {
    const std::string path = testing::TempDir() + "rvd-test-" + std::to_string(getpid()) + name;
    std::ofstream(path) << content;
    files.push_back(path);
    return path;
  }

  // Its standard output and the status that the shell made of it.
  static std::pair<std::string, int> run(const std::string& arguments) {
    FILE* pipe = popen((std::string(RVD_STANDIN) + " " + arguments).c_str(), "r");
    std::string text;
    char buffer[512];
    while (fgets(buffer, sizeof buffer, pipe) != nullptr) text += buffer;
    return {text, WEXITSTATUS(pclose(pipe))};
  }

  std::vector<std::string> files;
};

TEST_F(TheStandInProgram, TellsWrongUseFromWhatItCannotDo) {
  EXPECT_EQ(run("--port 70000 2>/dev/null").second, 2);
  EXPECT_EQ(run("--no-such-option 2>/dev/null").second, 2);
  EXPECT_EQ(run("--cert x.pem 2>/dev/null").second, 2);
  EXPECT_EQ(run("--script /nonexistent 2>/dev/null").second, 3);
  EXPECT_EQ(run("--describe nonsense 2>/dev/null").second, 3);
  EXPECT_EQ(run("--cert /nonexistent --key /nonexistent 2>/dev/null").second, 3);
  const auto [help, status] = run("--help");
  EXPECT_EQ(status, 0);
  EXPECT_THAT(help, HasSubstr("--token-file"));
}

TEST_F(TheStandInProgram, ServesUntilItIsTerminated) {
  const std::string tokens = write("-tokens", "one\ntwo\n");
  const std::string portFile = write("-port", "");
  std::remove(portFile.c_str());
  // The program's own end of the pipe closes when it has ended.
  const std::string command = std::string(RVD_STANDIN) + " --token-file " + tokens + " --port-file " +
                              portFile + " & echo $!; wait $!; echo status $?";
  FILE* pipe = popen(command.c_str(), "r");
  char line[256];
  ASSERT_NE(fgets(line, sizeof line, pipe), nullptr);
  const pid_t process = static_cast<pid_t>(std::stol(line));
  ASSERT_NE(fgets(line, sizeof line, pipe), nullptr);
  const std::string url(line, std::string_view(line).find('\n'));
  int port = 0;
  std::ifstream(portFile) >> port;
  EXPECT_EQ(url, "http://127.0.0.1:" + std::to_string(port));
  httplib::Client client("127.0.0.1", port);
  for (const char* token : {"one", "two"}) {
    const auto answer = client.Post("/authorize",
                                    {{"Authorization", std::string("Bearer ") + token}},
                                    "app_id=1",
                                    "application/x-www-form-urlencoded");
    ASSERT_TRUE(answer);
    EXPECT_EQ(answer->status, 200);
  }
  kill(process, SIGTERM);
  ASSERT_NE(fgets(line, sizeof line, pipe), nullptr);
  EXPECT_STREQ(line, "status 0\n");
  pclose(pipe);
}

TEST_F(TheStandInProgram, ServesHTTPSWithACertificate) {
  const support::Authority authority("the test's authority");
  const support::ServerIdentity identity = authority.issue({});
  const std::string certificate = write("-cert.pem", support::pemOf(*identity.certificate));
  const std::string key = write("-key.pem", support::pemOf(*identity.key));
  standin::Exchanges exchanges({});
  standin::Script script;
  standin::RequestLog log("");
  const standin::StandInServer server({0, certificate, key}, exchanges, script, log);
  http::FacebookServerSettings settings;
  settings.url = server.url();
  settings.caFile = write("-ca.pem", authority.pem());
  support::FacebookParts parts;
  const auto request = parts.requestsTo(settings).initWithAppId("1", "b", std::nullopt, std::nullopt);
  request->setAccessToken(RVSecret("any"));
  PendingOutcome pending;
  request->performRequestWithHandler(pending.handler());
  EXPECT_THAT(pending.wait().body.value_or(""), HasSubstr("access_token"));
}

}  // namespace
