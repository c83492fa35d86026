#include "tests/support/Certificates.h"

#include <openssl/bio.h>
#include <openssl/ec.h>
#include <openssl/pem.h>
#include <openssl/rand.h>
#include <openssl/x509v3.h>

#include <stdexcept>

namespace support {
namespace {

void require(bool isDone) {
  if (!isDone) throw std::runtime_error("libcrypto would not make a certificate");
}

void addExtension(X509* certificate, X509* issuer, int extension, const std::string& value) {
  if (value.empty()) return;
  X509V3_CTX context;
  X509V3_set_ctx(&context, issuer, certificate, nullptr, nullptr, 0);
  X509_EXTENSION* made = X509V3_EXT_conf_nid(nullptr, &context, extension, value.c_str());
  require(made != nullptr && X509_add_ext(certificate, made, -1) == 1);
  X509_EXTENSION_free(made);
}

void setName(X509_NAME* name, const std::string& text) {
  require(X509_NAME_add_entry_by_txt(name,
                                     "CN",
                                     MBSTRING_UTF8,
                                     reinterpret_cast<const unsigned char*>(text.data()),
                                     static_cast<int>(text.size()),
                                     -1,
                                     0) == 1);
}

// A null issuer: the certificate is signed with its own key.
ServerIdentity made(const CertificateTraits& traits, const ServerIdentity* issuer) {
  ServerIdentity identity;
  identity.key.reset(EVP_EC_gen("P-256"));
  identity.certificate.reset(X509_new());
  require(identity.key != nullptr && identity.certificate != nullptr);
  X509* const certificate = identity.certificate.get();
  X509* const signer = issuer != nullptr ? issuer->certificate.get() : certificate;

  X509_set_version(certificate, X509_VERSION_3);
  long serial = 0;
  require(RAND_bytes(reinterpret_cast<unsigned char*>(&serial), 4) == 1);
  ASN1_INTEGER_set(X509_get_serialNumber(certificate), serial + 1);
  X509_gmtime_adj(X509_getm_notBefore(certificate), traits.validFrom);
  X509_gmtime_adj(X509_getm_notAfter(certificate), traits.validUntil);
  setName(X509_get_subject_name(certificate), traits.subject);
  require(X509_set_issuer_name(certificate, X509_get_subject_name(signer)) == 1);
  require(X509_set_pubkey(certificate, identity.key.get()) == 1);
  addExtension(
      certificate, signer, NID_basic_constraints, traits.isAuthority ? "critical,CA:TRUE" : "CA:FALSE");
  addExtension(certificate, signer, NID_subject_alt_name, traits.alternativeNames);
  addExtension(certificate, signer, NID_ext_key_usage, traits.keyUsage);
  EVP_PKEY* const signingKey = issuer != nullptr ? issuer->key.get() : identity.key.get();
  require(X509_sign(certificate, signingKey, EVP_sha256()) > 0);
  return identity;
}

std::string contentOf(BIO* memory) {
  char* bytes = nullptr;
  const long size = BIO_get_mem_data(memory, &bytes);
  std::string text(bytes, static_cast<std::size_t>(size));
  BIO_free(memory);
  return text;
}

}  // namespace

Authority::Authority(const std::string& name)
    : own_(made({name, "", "", -86400, 86400, true}, nullptr)) {
}

ServerIdentity Authority::issue(const CertificateTraits& traits) const {
  return made(traits, &own_);
}

ServerIdentity Authority::selfSigned(const CertificateTraits& traits) {
  return made(traits, nullptr);
}

std::string Authority::pem() const {
  return pemOf(*own_.certificate);
}

std::string pemOf(const X509& certificate) {
  BIO* memory = BIO_new(BIO_s_mem());
  require(PEM_write_bio_X509(memory, &certificate) == 1);
  return contentOf(memory);
}

std::string pemOf(const EVP_PKEY& key) {
  BIO* memory = BIO_new(BIO_s_mem());
  require(PEM_write_bio_PrivateKey(memory, &key, nullptr, nullptr, 0, nullptr, nullptr) == 1);
  return contentOf(memory);
}

}  // namespace support
