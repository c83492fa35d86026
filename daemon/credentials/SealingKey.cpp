#include "daemon/credentials/SealingKey.h"

#include <fcntl.h>
#include <sodium.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "base/File.h"

namespace credentials {
namespace {

constexpr const char* kFileName = "credentials.key";
constexpr std::size_t kKeySize = crypto_aead_xchacha20poly1305_ietf_KEYBYTES;
constexpr std::size_t kNonceSize = crypto_aead_xchacha20poly1305_ietf_NPUBBYTES;
constexpr std::size_t kTagSize = crypto_aead_xchacha20poly1305_ietf_ABYTES;
static_assert(kKeySize == 32 && kNonceSize == 24 && kTagSize == 16, "docs/storage.md gives these sizes");

const unsigned char* bytesOf(std::string_view text) {
  return reinterpret_cast<const unsigned char*>(text.data());
}

base::Failure failed(const std::string& path, const char* action) {
  return {base::FailureKind::kFailed, path + ": " + action + ": " + std::strerror(errno)};
}

// Reads the whole key straight into the memory made for it.
base::Result<void> readKey(const base::FileDescriptor& file, const std::string& path, unsigned char* key) {
  struct stat status {};
  if (::fstat(file.get(), &status) != 0) return failed(path, "cannot look at the file");
  std::size_t size = 0;
  while (status.st_size == static_cast<off_t>(kKeySize) && size < kKeySize) {
    const ssize_t part = ::read(file.get(), key + size, kKeySize - size);
    if (part < 0 && errno == EINTR) continue;
    if (part < 0) return failed(path, "cannot read the file");
    if (part == 0) break;
    size += static_cast<std::size_t>(part);
  }
  if (size == kKeySize) return {};
  return base::Failure{base::FailureKind::kRefused,
                       path + " is no key of " + std::to_string(kKeySize) +
                           " bytes; put the right one there, or move the file away to begin anew"};
}

base::Result<base::FileDescriptor> openHandedIn(const std::string& path) {
  base::FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW));
  struct stat status {};
  if (!file.isOpen() || ::fstat(file.get(), &status) != 0) return failed(path, "cannot open the key");
  const bool isOurs = status.st_uid == 0 || status.st_uid == ::geteuid();
  // A service manager may let its service read the file by way of the group.
  if (!S_ISREG(status.st_mode) || !isOurs || (status.st_mode & (S_IWGRP | S_IXGRP | S_IRWXO)) != 0)
    return base::Failure{base::FailureKind::kRefused,
                         path +
                             " is not for us alone to read; hand the key in as a regular file of root's or "
                             "your own with mode 0400"};
  return file;
}

}  // namespace

void SealingKey::Free::operator()(unsigned char* bytes) const {
  sodium_free(bytes);
}

SealingKey::SealingKey(Bytes bytes)
    : bytes_(std::move(bytes)) {
}

base::Result<SealingKey::Opened> SealingKey::open(const state::Directory& directory,
                                                  const std::optional<std::filesystem::path>& handedIn) {
  if (sodium_init() < 0) return base::Failure{base::FailureKind::kFailed, "libsodium cannot be set up"};
  // Where the limit on locked memory is too low the key is not locked, but all else that protects it holds.
  Bytes bytes(static_cast<unsigned char*>(sodium_malloc(kKeySize)));
  if (bytes == nullptr) return base::Failure{base::FailureKind::kFailed, "there is no memory for the key"};

  const std::string path = handedIn ? *handedIn : directory.path() / kFileName;
  bool isNew = false;
  std::optional<base::FileDescriptor> file;
  if (handedIn) {
    auto opened = openHandedIn(path);
    if (!opened) return opened.failure();
    file = *std::move(opened);
  } else {
    auto opened = directory.openFile(kFileName);
    if (!opened) return opened.failure();
    file = *std::move(opened);
  }
  if (file) {
    if (auto read = readKey(*file, path, bytes.get()); !read) return read.failure();
  } else {
    isNew = true;
    randombytes_buf(bytes.get(), kKeySize);
    const std::string_view content(reinterpret_cast<const char*>(bytes.get()), kKeySize);
    if (auto written = directory.replaceFile(kFileName, content); !written) return written.failure();
  }
  sodium_mprotect_readonly(bytes.get());
  return Opened{SealingKey(std::move(bytes)), isNew};
}

std::string SealingKey::seal(const RVSecret& text, std::string_view bound) const {
  const std::string_view plain = text.reveal();
  std::string sealed(kNonceSize + plain.size() + kTagSize, '\0');
  auto* nonce = reinterpret_cast<unsigned char*>(sealed.data());
  randombytes_buf(nonce, kNonceSize);
  crypto_aead_xchacha20poly1305_ietf_encrypt(nonce + kNonceSize,
                                             nullptr,
                                             bytesOf(plain),
                                             plain.size(),
                                             bytesOf(bound),
                                             bound.size(),
                                             nullptr,
                                             nonce,
                                             bytes_.get());
  return sealed;
}

std::optional<RVSecret> SealingKey::open(std::string_view sealed, std::string_view bound) const {
  if (sealed.size() < kNonceSize + kTagSize) return std::nullopt;
  const unsigned char* nonce = bytesOf(sealed);
  std::string plain(sealed.size() - kNonceSize - kTagSize, '\0');
  const int result =
      crypto_aead_xchacha20poly1305_ietf_decrypt(reinterpret_cast<unsigned char*>(plain.data()),
                                                 nullptr,
                                                 nullptr,
                                                 nonce + kNonceSize,
                                                 sealed.size() - kNonceSize,
                                                 bytesOf(bound),
                                                 bound.size(),
                                                 nonce,
                                                 bytes_.get());
  if (result != 0) return std::nullopt;
  RVSecret text(plain);
  RVSecret::wipe(plain.data(), plain.size());
  return text;
}

}  // namespace credentials
