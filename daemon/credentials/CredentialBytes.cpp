#include "daemon/credentials/CredentialBytes.h"

#include <chrono>
#include <cstdint>

namespace credentials {
namespace {

constexpr char kVersion = 1;
constexpr std::size_t kNumberSize = 8;

void appendNumber(std::string& bytes, std::uint64_t number) {
  for (std::size_t i = 0; i < kNumberSize; ++i) bytes += static_cast<char>(number >> (8 * i) & 0xff);
}

void appendText(std::string& bytes, std::string_view text) {
  appendNumber(bytes, text.size());
  bytes += text;
}

// Takes things from the front of the bytes; absent where there are not enough.
class Reader {
 public:
  explicit Reader(std::string_view bytes)
      : rest_(bytes) {}

  std::optional<std::string_view> take(std::uint64_t size) {
    if (size > rest_.size()) return std::nullopt;
    const std::string_view taken = rest_.substr(0, static_cast<std::size_t>(size));
    rest_.remove_prefix(taken.size());
    return taken;
  }
  std::optional<std::uint64_t> number() {
    const auto bytes = take(kNumberSize);
    if (!bytes) return std::nullopt;
    std::uint64_t number = 0;
    for (std::size_t i = 0; i < kNumberSize; ++i)
      number |= std::uint64_t{static_cast<unsigned char>((*bytes)[i])} << (8 * i);
    return number;
  }
  std::optional<std::string_view> text() {
    const auto size = number();
    return size ? take(*size) : std::nullopt;
  }
  bool isAtEnd() const { return rest_.empty(); }

 private:
  std::string_view rest_;
};

}  // namespace

RVSecret bytesFromCredential(const RVAccountCredential& credential) {
  const std::string_view token = credential.oauthToken().reveal();
  const std::string_view refreshToken = credential.refreshToken().reveal();
  std::string bytes;
  // So that no piece of a token is left behind in memory that growing has given back.
  bytes.reserve(1 + 3 * kNumberSize + token.size() + refreshToken.size());
  bytes += kVersion;
  appendText(bytes, token);
  appendText(bytes, refreshToken);
  appendNumber(bytes, static_cast<std::uint64_t>(credential.expiryDate().time_since_epoch().count()));
  RVSecret secret(bytes);
  RVSecret::wipe(bytes.data(), bytes.size());
  return secret;
}

std::optional<RVAccountCredential> credentialFromBytes(const RVSecret& bytes) {
  Reader reader(bytes.reveal());
  const auto version = reader.take(1);
  if (!version || version->front() != kVersion) return std::nullopt;
  const auto token = reader.text();
  const auto refreshToken = reader.text();
  const auto expiry = reader.number();
  if (!token || !refreshToken || !expiry || !reader.isAtEnd()) return std::nullopt;
  const std::chrono::seconds sinceEpoch(static_cast<std::int64_t>(*expiry));
  return RVAccountCredential(RVSecret(*token), RVSecret(*refreshToken), RVDate(sinceEpoch));
}

std::string bindingOf(std::string_view accountId, const std::optional<std::string>& clientId) {
  std::string bytes(1, kVersion);
  appendText(bytes, accountId);
  bytes += clientId ? '\1' : '\0';
  if (clientId) appendText(bytes, *clientId);
  return bytes;
}

}  // namespace credentials
