// A credential as the bytes that are sealed. docs/storage.md draws them.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "host/RVDKeychainManager.h"

namespace credentials {

RVSecret bytesFromCredential(const RVAccountCredential& credential);

// Absent where these are no such bytes.
std::optional<RVAccountCredential> credentialFromBytes(const RVSecret& bytes);

// What a sealed credential is bound to: the format's version, the account, and the client or that there is
// none. No two pairs give the same bytes.
std::string bindingOf(std::string_view accountId, const std::optional<std::string>& clientId);

}  // namespace credentials
