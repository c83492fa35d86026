#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <httplib.h>

#include <atomic>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <string>
#include <thread>

#include "daemon/http/TransferErrors.h"
#include "daemon/http/TransferThread.h"
#include "tests/fakes/FakeTexts.h"
#include "tests/support/Certificates.h"
#include "tests/support/Outcome.h"

namespace {

using http::TransferErrorCode;
using support::Authority;
using support::CertificateTraits;
using support::Outcome;
using support::ServerIdentity;
using testing::HasSubstr;

// Speaks HTTP over TLS as whoever it is made to be.
class TLSServer {
 public:
  explicit TLSServer(ServerIdentity identity, int newestVersion = TLS1_3_VERSION)
      : identity_(std::move(identity)),
        server_([this, newestVersion](SSL_CTX& context) {
          SSL_CTX_set_security_level(&context, 0);
          SSL_CTX_set_min_proto_version(&context, TLS1_VERSION);
          SSL_CTX_set_max_proto_version(&context, newestVersion);
          SSL_CTX_set_cipher_list(&context, "ALL:@SECLEVEL=0");
          return SSL_CTX_use_certificate(&context, identity_.certificate.get()) == 1 &&
                 SSL_CTX_use_PrivateKey(&context, identity_.key.get()) == 1;
        }) {
    server_.Post("/authorize", [this](const httplib::Request&, httplib::Response& response) {
      ++requestCount_;
      response.set_content("\"trusted\"", "application/json");
    });
    port_ = server_.bind_to_any_port("127.0.0.1");
    thread_ = std::thread([this] { server_.listen_after_bind(); });
    while (!server_.is_running()) std::this_thread::yield();
  }
  ~TLSServer() {
    server_.stop();
    thread_.join();
  }
  std::string url(const std::string& host = "127.0.0.1") const {
    return "https://" + host + ":" + std::to_string(port_);
  }
  int requestCount() const { return requestCount_; }

 private:
  ServerIdentity identity_;
  httplib::SSLServer server_;
  std::atomic<int> requestCount_ = 0;
  int port_ = 0;
  std::thread thread_;
};

class ATransferOverTLS : public testing::Test {
 protected:
  ATransferOverTLS() { std::ofstream(caFile) << authority.pem(); }
  ~ATransferOverTLS() override { std::remove(caFile.c_str()); }

  Outcome exchange(const std::string& url, const std::string& trusted) {
    http::Transfer transfer;
    transfer.url = url + "/authorize";
    transfer.bearerToken = RVSecret("canary-token");
    transfer.caFile = trusted;
    support::PendingOutcome pending;
    thread.start(std::move(transfer), pending.handler());
    return pending.wait();
  }

  void expectNotTrusted(const TLSServer& server, const Outcome& outcome, const std::string& reason) {
    ASSERT_TRUE(outcome.error);
    EXPECT_EQ(outcome.error->code, static_cast<std::int64_t>(TransferErrorCode::kServerNotTrusted))
        << outcome.errorText();
    EXPECT_THAT(outcome.errorText(), HasSubstr(reason));
    EXPECT_FALSE(outcome.body);
    EXPECT_EQ(server.requestCount(), 0);
  }

  void expectNotTrusted(const CertificateTraits& traits, const std::string& reason) {
    const TLSServer server(authority.issue(traits));
    expectNotTrusted(server, exchange(server.url(), caFile), reason);
  }

  const Authority authority{"the test's authority"};
  const std::string caFile = testing::TempDir() + "rvd-test-ca-" + std::to_string(getpid()) + ".pem";
  fakes::FakeLog log;
  http::TransferThread thread{log};
};

TEST_F(ATransferOverTLS, TrustsAServerOfItsAuthority) {
  const TLSServer server(authority.issue({}));
  EXPECT_EQ(exchange(server.url(), caFile).body, "\"trusted\"");
  EXPECT_EQ(exchange(server.url("localhost"), caFile).body, "\"trusted\"");
}

TEST_F(ATransferOverTLS, SpeaksTLS12) {
  const TLSServer server(authority.issue({}), TLS1_2_VERSION);
  EXPECT_EQ(exchange(server.url(), caFile).body, "\"trusted\"");
}

TEST_F(ATransferOverTLS, SpeaksNothingOlder) {
  for (const int version : {TLS1_VERSION, TLS1_1_VERSION}) {
    const TLSServer server(authority.issue({}), version);
    expectNotTrusted(server, exchange(server.url(), caFile), "");
  }
}

TEST_F(ATransferOverTLS, DoesNotTrustAnAuthorityThatItWasNotGiven) {
  const TLSServer server(authority.issue({}));
  expectNotTrusted(server, exchange(server.url(), ""), "unable to get local issuer certificate");

  const TLSServer other(Authority("another authority").issue({}));
  expectNotTrusted(other, exchange(other.url(), caFile), "unable to get local issuer certificate");
  const TLSServer namesake(Authority("the test's authority").issue({}));
  expectNotTrusted(namesake, exchange(namesake.url(), caFile), "");
}

TEST_F(ATransferOverTLS, TakesNoAuthorityFromTheEnvironment) {
  const TLSServer server(authority.issue({}));
  for (const char* name : {"SSL_CERT_FILE", "CURL_CA_BUNDLE"}) setenv(name, caFile.c_str(), 1);
  expectNotTrusted(server, exchange(server.url(), ""), "");
  for (const char* name : {"SSL_CERT_FILE", "CURL_CA_BUNDLE"}) unsetenv(name);
}

TEST_F(ATransferOverTLS, DoesNotTrustASelfSignedCertificate) {
  const TLSServer server(Authority::selfSigned({}));
  expectNotTrusted(server, exchange(server.url(), caFile), "self-signed certificate");
}

TEST_F(ATransferOverTLS, DoesNotTrustACertificateOutOfItsTime) {
  CertificateTraits expired;
  expired.validFrom = -7200;
  expired.validUntil = -3600;
  expectNotTrusted(expired, "certificate has expired");
  CertificateTraits early;
  early.validFrom = 3600;
  early.validUntil = 7200;
  expectNotTrusted(early, "certificate is not yet valid");
}

TEST_F(ATransferOverTLS, DoesNotTrustACertificateForAnotherHost) {
  for (const char* names :
       {"DNS:other.example", "IP:127.0.0.2", "DNS:127.0.0.1", "DNS:*", "DNS:127.0.0.1.example"}) {
    CertificateTraits traits;
    traits.alternativeNames = names;
    expectNotTrusted(traits, "its certificate is for another host");
  }
}

TEST_F(ATransferOverTLS, DoesNotTrustANameThatOnlyBeginsWell) {
  CertificateTraits traits;
  traits.alternativeNames = "";
  traits.subject = std::string("localhost\0.evil.example", 23);
  const TLSServer server(authority.issue(traits));
  expectNotTrusted(server, exchange(server.url("localhost"), caFile), "");
}

TEST_F(ATransferOverTLS, DoesNotTrustACertificateForAnotherUse) {
  CertificateTraits traits;
  traits.keyUsage = "clientAuth";
  expectNotTrusted(traits, "certificate purpose");
}

TEST_F(ATransferOverTLS, SaysWhichFileOfAuthoritiesCannotBeRead) {
  const TLSServer server(authority.issue({}));
  expectNotTrusted(server, exchange(server.url(), "/nonexistent/ca.pem"), "/nonexistent/ca.pem");
}

TEST_F(ATransferOverTLS, DoesNotTakePlainHTTPForAnAnswer) {
  httplib::Server plain;
  const int port = plain.bind_to_any_port("127.0.0.1");
  std::thread serving([&] { plain.listen_after_bind(); });
  const Outcome outcome = exchange("https://127.0.0.1:" + std::to_string(port), caFile);
  ASSERT_TRUE(outcome.error);
  EXPECT_EQ(outcome.error->code, static_cast<std::int64_t>(TransferErrorCode::kServerNotTrusted));
  plain.stop();
  serving.join();
}

}  // namespace
