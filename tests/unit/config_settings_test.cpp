#include <gtest/gtest.h>

#include "daemon/config/Settings.h"
#include "tests/support/TemporaryDirectory.h"

namespace {

using config::CredentialStore;
using config::readSettings;
using config::Settings;

std::optional<std::string> httpsAlone(const std::string& url) {
  if (url.starts_with("https://")) return std::nullopt;
  return "must begin with https://";
}

class TheSettings : public testing::Test {
 protected:
  base::Result<Settings> read(std::string_view text) {
    return readSettings({directory_.write("rvd.conf", text)}, true, httpsAlone);
  }
  std::string faultOf(std::string_view text) {
    const auto settings = read(text);
    if (settings) return "none";
    const std::string& message = settings.failure().message;
    const std::string path = directory_.path("rvd.conf");
    return message.starts_with(path) ? message.substr(path.size()) : "another file: " + message;
  }
  support::TemporaryDirectory directory_;
};

TEST_F(TheSettings, OfAnEmptyFileAreTheDefaults) {
  const auto settings = read("");
  ASSERT_TRUE(settings);
  EXPECT_EQ(settings->serverURL, std::nullopt);
  EXPECT_EQ(settings->transferTimeout, std::chrono::seconds(60));
  EXPECT_EQ(settings->caFile, std::nullopt);
  EXPECT_EQ(settings->credentialStore, CredentialStore::kSealed);
  EXPECT_EQ(settings->waitingRequestsPerClient, 8u);
  EXPECT_EQ(settings->waitingRequests, 1024u);
  EXPECT_EQ(settings->callsPerSecond, 200u);
  EXPECT_EQ(settings->messageBytes, 1048576u);
  EXPECT_EQ(settings->permissionsPerRequest, 256u);
  EXPECT_EQ(settings->nameBytes, 256u);
  EXPECT_EQ(settings->accessLogDays, 365u);
}

TEST_F(TheSettings, AreWhatTheFileSays) {
  const auto settings = read(
      "[Server]\nURL=https://facebook.example\nTimeoutSeconds=5\nCAFile=/etc/ca.crt\n"
      "[Credentials]\nStore=secret-service\n"
      "[Limits]\nWaitingRequestsPerClient=1\nWaitingRequests=2\nCallsPerSecond=3\nMessageBytes=4096\n"
      "PermissionsPerRequest=4\nNameBytes=5\n"
      "[AccessLog]\nKeepDays=6\n");
  ASSERT_TRUE(settings) << settings.failure().message;
  EXPECT_EQ(settings->serverURL, "https://facebook.example");
  EXPECT_EQ(settings->transferTimeout, std::chrono::seconds(5));
  EXPECT_EQ(settings->caFile, "/etc/ca.crt");
  EXPECT_EQ(settings->credentialStore, CredentialStore::kSecretService);
  EXPECT_EQ(settings->waitingRequestsPerClient, 1u);
  EXPECT_EQ(settings->waitingRequests, 2u);
  EXPECT_EQ(settings->callsPerSecond, 3u);
  EXPECT_EQ(settings->messageBytes, 4096u);
  EXPECT_EQ(settings->permissionsPerRequest, 4u);
  EXPECT_EQ(settings->nameBytes, 5u);
  EXPECT_EQ(settings->accessLogDays, 6u);
}

TEST_F(TheSettings, OfALaterFileGoBeforeThoseOfAnEarlierOne) {
  const std::string first = directory_.write("a.conf", "[Server]\nURL=https://a.example\nTimeoutSeconds=5\n");
  const std::string second = directory_.write("b.conf", "[Server]\nURL=https://b.example\n");
  const auto settings = readSettings({first, directory_.path("none"), second}, false, httpsAlone);
  ASSERT_TRUE(settings);
  EXPECT_EQ(settings->serverURL, "https://b.example");
  EXPECT_EQ(settings->transferTimeout, std::chrono::seconds(5));
}

TEST_F(TheSettings, OfAFileThatMustBeThereAreRefusedWithoutIt) {
  const auto settings = readSettings({directory_.path("none")}, true, httpsAlone);
  ASSERT_FALSE(settings);
  EXPECT_TRUE(settings.failure().message.starts_with(directory_.path("none")));
}

TEST_F(TheSettings, OfWhatIsNoFileAreRefused) {
  EXPECT_FALSE(readSettings({directory_.path()}, false, httpsAlone));
}

TEST_F(TheSettings, WithAnUnknownSectionOrKeyAreRefusedByFileLineAndKey) {
  EXPECT_EQ(faultOf("[Sever]\n"), ":1: section [Sever] is not known");
  EXPECT_EQ(faultOf("[Server]\nUrl=https://a\n"), ":2: key \"Url\" of section [Server] is not known");
  EXPECT_EQ(faultOf("[Limits]\nURL=https://a\n"), ":2: key \"URL\" of section [Limits] is not known");
  EXPECT_EQ(faultOf("[Limits]\nNameBytes\n"), ":2: a line is written key=value");
}

TEST_F(TheSettings, WithAValueThatCannotBeUsedAreRefusedByFileLineAndKey) {
  const std::string number = "must be a whole number from ";
  EXPECT_EQ(faultOf("\n[Server]\nURL=http://a\n"),
            ":3: key \"URL\" of section [Server] cannot be used: the server URL must begin with https://");
  EXPECT_EQ(faultOf("[Server]\nCAFile=ca.crt\n"),
            ":2: key \"CAFile\" of section [Server] cannot be used: must be an absolute path");
  EXPECT_EQ(faultOf("[Credentials]\nStore=plain\n"),
            ":2: key \"Store\" of section [Credentials] cannot be used: must be \"sealed\" or "
            "\"secret-service\"");
  for (const char* value : {"", "0", "-1", "3601", "1.5", "60s", " 0x10", "99999999999999999999999"})
    EXPECT_EQ(faultOf(std::string("[Server]\nTimeoutSeconds=") + value + "\n"),
              ":2: key \"TimeoutSeconds\" of section [Server] cannot be used: " + number + "1 to 3600")
        << value;
}

TEST_F(TheSettings, AcceptTheEndsOfEachRangeAndNothingBeyond) {
  struct Range {
    std::string section;
    std::string key;
    std::size_t least;
    std::size_t most;
  };
  for (const Range& range : {Range{"Limits", "WaitingRequestsPerClient", 1, 4096},
                             Range{"Limits", "WaitingRequests", 1, 4096},
                             Range{"Limits", "MessageBytes", 1024, std::size_t{128} << 20},
                             Range{"Limits", "PermissionsPerRequest", 1, 65536},
                             Range{"Limits", "NameBytes", 1, 65536},
                             Range{"AccessLog", "KeepDays", 1, 36500}}) {
    const std::string start = "[" + range.section + "]\n" + range.key + "=";
    EXPECT_TRUE(read(start + std::to_string(range.least)));
    EXPECT_TRUE(read(start + std::to_string(range.most)));
    EXPECT_FALSE(read(start + std::to_string(range.least - 1)));
    EXPECT_FALSE(read(start + std::to_string(range.most + 1)));
  }
}

}  // namespace
