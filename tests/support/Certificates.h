// Certificates for servers in tests, good ones and bad ones, made as they are needed.
#pragma once

#include <openssl/evp.h>
#include <openssl/x509.h>

#include <memory>
#include <string>

namespace support {

using Key = std::unique_ptr<EVP_PKEY, decltype(&EVP_PKEY_free)>;
using Certificate = std::unique_ptr<X509, decltype(&X509_free)>;

// What a certificate says. Times in seconds from now.
struct CertificateTraits {
  std::string subject = "server";
  std::string alternativeNames = "IP:127.0.0.1,DNS:localhost";
  std::string keyUsage = "serverAuth";
  long validFrom = -3600;
  long validUntil = 3600;
  bool isAuthority = false;
};

struct ServerIdentity {
  Certificate certificate{nullptr, &X509_free};
  Key key{nullptr, &EVP_PKEY_free};
};

// A certificate authority of its own.
class Authority {
 public:
  explicit Authority(const std::string& name);

  ServerIdentity issue(const CertificateTraits& traits) const;
  // The authority's certificate, as PEM.
  std::string pem() const;

  static ServerIdentity selfSigned(const CertificateTraits& traits);

 private:
  ServerIdentity own_;
};

std::string pemOf(const X509& certificate);
std::string pemOf(const EVP_PKEY& key);

}  // namespace support
