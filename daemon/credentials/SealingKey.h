// The key under which credentials are sealed.
#pragma once

#include <cstddef>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "base/Result.h"
#include "daemon/state/Directory.h"
#include "host/RVDKeychainManager.h"

namespace credentials {

// 32 bytes in memory that is locked, fenced, left out of core dumps and wiped at the end. Immutable.
class SealingKey {
 public:
  struct Opened;

  // The key of the file `handedIn` where one is named: a regular file of 32 bytes that belongs to root or
  // us and that nobody else can write, nor others read. Otherwise that of `credentials.key` in the
  // directory, made anew where there is no such file. kRefused, with what to do about it: a file that
  // others could have read or changed, or of another size.
  static base::Result<Opened> open(const state::Directory& directory,
                                   const std::optional<std::filesystem::path>& handedIn);

  // Seals the text under a new random nonce, which stands before it in the answer. bound: what the text
  // belongs to; only with the very same can it be opened again.
  std::string seal(const RVSecret& text, std::string_view bound) const;

  // Absent where this is nothing that seal made, with this key and this `bound`.
  std::optional<RVSecret> open(std::string_view sealed, std::string_view bound) const;

 private:
  struct Free {
    void operator()(unsigned char* bytes) const;
  };
  using Bytes = std::unique_ptr<unsigned char[], Free>;

  explicit SealingKey(Bytes bytes);

  Bytes bytes_;
};

struct SealingKey::Opened {
  SealingKey key;
  bool isNew = false;  // there was none
};

}  // namespace credentials
