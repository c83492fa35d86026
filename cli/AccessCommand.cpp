// rvctl access
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <nlohmann/json.hpp>
#include <string_view>

#include "base/Text.h"
#include "cli/Commands.h"

namespace cli {
namespace {

base::Failure unusable(const char* message) {
  return {base::FailureKind::kInvalid, message};
}

// Checked before anything is connected to, so that the number is the caller's and not a connection's.
base::Result<void> checkCredentialDescriptor(int descriptor) {
  if (descriptor <= STDERR_FILENO)
    return unusable("--credential-fd takes a descriptor of its own, from 3 on: rvctl … 3>FILE");
  const int mode = ::fcntl(descriptor, F_GETFL);
  if (mode < 0 || (mode & O_ACCMODE) == O_RDONLY)
    return unusable("The descriptor of --credential-fd is not open for writing");
  if (::isatty(descriptor) == 1) return unusable("A credential is not written to a terminal");
  return {};
}

base::Result<void> writeAll(int descriptor, std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = ::write(descriptor, text.data(), text.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) return base::Failure{base::FailureKind::kFailed, "The credential cannot be written"};
    text.remove_prefix(static_cast<std::size_t>(written));
  }
  return {};
}

base::Result<void> handOutCredential(Session& session, int descriptor) {
  const auto credential = session.service.credential();
  if (!credential) return credential.failure();
  const std::string text =
      session.output.wantsJSON() ? credential->dump() : credential->value("oauth_token", "");
  return writeAll(descriptor, text + "\n");
}

std::string accessText(const Json& access) {
  std::string text = "state        " + base::visible(access.value("state", "")) + "\n";
  for (const Json& permission : access["permissions"]) text += "permission   " + valueText(permission) + "\n";
  for (const auto& [key, value] : access["options"].items())
    text += base::visible(key) + std::string(key.size() < 12 ? 13 - key.size() : 1, ' ') + valueText(value) +
            "\n";
  return text;
}

}  // namespace

ExitStatus showAccess(Session& session,
                      const std::optional<std::string>& as,
                      std::optional<int> credentialDescriptor) {
  if (credentialDescriptor) {
    const auto usable = checkCredentialDescriptor(*credentialDescriptor);
    if (!usable) return session.output.failed(usable.failure());
  }
  if (as) {
    const auto registered = session.service.registerAs(*as);
    if (!registered) return session.output.failed(registered.failure());
  }
  const auto access = session.service.access();
  if (!access) return session.output.failed(access.failure());
  if (credentialDescriptor) {
    const auto written = handOutCredential(session, *credentialDescriptor);
    if (!written) return session.output.failed(written.failure());
  }
  if (session.output.wantsJSON())
    session.output.print(*access);
  else
    session.output.print(accessText(*access));
  return (*access)["state"] == "granted" ? ExitStatus::kDone : ExitStatus::kRefused;
}

}  // namespace cli
