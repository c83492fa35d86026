// Credentials and the store that keeps them.
#pragma once

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "host/Values.h"

class RVAccount;

// A secret text, an OAuth token for example. Its bytes are overwritten before they are released, it
// has no stream operator and no conversion that a log line could pick up, and equality takes the same
// time wherever two secrets of one length differ.
class RVSecret {
 public:
  RVSecret() = default;
  explicit RVSecret(std::string_view text)
      : size_(text.size()),
        bytes_(new char[text.size()]) {
    std::copy(text.begin(), text.end(), bytes_.get());
  }
  RVSecret(const RVSecret& other)
      : RVSecret(other.reveal()) {}
  RVSecret(RVSecret&& other) noexcept
      : size_(std::exchange(other.size_, 0)),
        bytes_(std::move(other.bytes_)) {}
  RVSecret& operator=(RVSecret other) noexcept {
    std::swap(size_, other.size_);
    std::swap(bytes_, other.bytes_);
    return *this;
  }
  ~RVSecret() { wipe(bytes_.get(), size_); }

  // The text itself, valid as long as this object is neither assigned to nor destroyed. Callers hand
  // it on to where the secret is used and copy it nowhere else.
  std::string_view reveal() const { return {bytes_.get(), size_}; }
  bool empty() const { return size_ == 0; }

  friend bool operator==(const RVSecret& a, const RVSecret& b) {
    if (a.size_ != b.size_) return false;
    unsigned char difference = 0;
    for (std::size_t i = 0; i < a.size_; ++i)
      difference |= static_cast<unsigned char>(a.bytes_[i] ^ b.bytes_[i]);
    return difference == 0;
  }

  // Overwrites memory in a way that the compiler does not leave out. For buffers that held a secret on
  // its way in or out.
  static void wipe(char* bytes, std::size_t size) {
    volatile char* cell = bytes;
    for (std::size_t i = 0; i < size; ++i) cell[i] = 0;
  }

 private:
  std::size_t size_ = 0;
  std::unique_ptr<char[]> bytes_;
};

using RVDate = std::chrono::sys_seconds;

// The expiry date of a credential that never expires: later than any real date.
inline constexpr RVDate kRVDistantFuture{std::chrono::sys_days{std::chrono::year{4001} / 1 / 1}};

// An OAuth2 credential. Immutable, shared between threads.
class RVAccountCredential {
 public:
  // The tokens are kept unchanged, empty ones included.
  RVAccountCredential(RVSecret OAuth2Token, RVSecret refreshToken, RVDate expiryDate)
      : oauthToken_(std::move(OAuth2Token)),
        refreshToken_(std::move(refreshToken)),
        expiryDate_(expiryDate) {}

  const RVSecret& oauthToken() const { return oauthToken_; }
  const RVSecret& refreshToken() const { return refreshToken_; }
  RVDate expiryDate() const { return expiryDate_; }

  friend bool operator==(const RVAccountCredential&, const RVAccountCredential&) = default;

 private:
  RVSecret oauthToken_;
  RVSecret refreshToken_;
  RVDate expiryDate_;
};

// The daemon's credential store: one credential for each account and client ID, and the account's own
// (master) credential under no client ID. An empty client ID is not "no client ID".
//
// Called from any thread; calls do not wait for the user or the network. Once a writing call has
// returned, its effect survives the end of the process.
class RVDKeychainManager {
 public:
  virtual ~RVDKeychainManager() = default;

  // The stored credential, or null where there is none or where it cannot be read (the host logs why).
  virtual std::shared_ptr<const RVAccountCredential> credentialForAccount(
      const RVAccount& account,
      const std::optional<std::string>& clientID) = 0;

  // Stores the credential that the account object carries, replacing what was stored under the same
  // account and client ID. Returns why it could not. Without a client ID, or for an account object that
  // carries no credential, nothing is stored and an error comes back: an account's own credential is
  // written only by whoever sets the account up.
  virtual std::optional<RVError> setCredentialForAccount(const RVAccount& account,
                                                         const std::optional<std::string>& clientID) = 0;

  // Deletes what is stored under the account and client ID; nothing there is a success. Without a
  // client ID nothing is deleted and an error comes back.
  virtual std::optional<RVError> removeCredentialForAccount(const RVAccount& account,
                                                            const std::optional<std::string>& clientID) = 0;
};
