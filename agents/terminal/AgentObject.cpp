#include "agents/terminal/AgentObject.h"

#include <sdbus-c++/sdbus-c++.h>

#include <cstdint>
#include <map>
#include <utility>

#include "base/BusNames.h"
#include "interfaces/Agent1Adaptor.h"

namespace terminal {
namespace {

using Description = std::map<std::string, sdbus::Variant>;

std::optional<std::string> textIn(const Description& description, const char* key) {
  const auto entry = description.find(key);
  if (entry == description.end() || !entry->second.containsValueOfType<std::string>()) return std::nullopt;
  return entry->second.get<std::string>();
}

agents::Alert alertFrom(const Description& description) {
  agents::Alert alert;
  alert.header = textIn(description, "header").value_or("");
  alert.message = textIn(description, "message").value_or("");
  alert.defaultButtonTitle = textIn(description, "default_button_title").value_or("");
  alert.alternateButtonTitle = textIn(description, "alternate_button_title").value_or("");
  alert.clientID = textIn(description, "client_id");
  alert.evidence = textIn(description, "evidence");
  return alert;
}

}  // namespace

class AgentObject::Adaptor final : public sdbus::AdaptorInterfaces<com::zentor::rvd::Agent1_adaptor> {
 public:
  Adaptor(sdbus::IConnection& connection,
          const std::string& path,
          std::function<bool(const std::string& sender)> isDaemon,
          Conversation& conversation)
      : AdaptorInterfaces(connection, path),
        isDaemon_(std::move(isDaemon)),
        conversation_(conversation) {
    registerAdaptor();
  }
  ~Adaptor() { unregisterAdaptor(); }
  Adaptor(const Adaptor&) = delete;
  Adaptor& operator=(const Adaptor&) = delete;

 private:
  void ShowAlert(sdbus::Result<std::uint64_t>&& result, std::string id, Description description) override {
    refuseOthers();
    // Shared, because what it is kept in has to be copyable.
    auto answer = std::make_shared<sdbus::Result<std::uint64_t>>(std::move(result));
    const auto answered = [answer](agents::Answer given) {
      try {
        answer->returnResults(static_cast<std::uint64_t>(given));
      } catch (const sdbus::Error&) {  // The bus has gone, and with it whoever asked.
      }
    };
    try {
      if (conversation_.show(id, alertFrom(description), answered)) return;
    } catch (const std::exception&) {
      throw sdbus::Error(base::kFailed, "The alert cannot be shown");
    }
    throw sdbus::Error(base::kFailed, "The alert is blank, or another one is open");
  }

  void DismissAlert(sdbus::Result<>&& result, std::string id) override {
    refuseOthers();
    conversation_.dismiss(id);
    result.returnResults();
  }

  void refuseOthers() const {
    if (!isDaemon_(getObject().getCurrentlyProcessedMessage()->getSender()))
      throw sdbus::Error(base::kAccessDenied, "Only rvd shows alerts here");
  }

  const std::function<bool(const std::string& sender)> isDaemon_;
  Conversation& conversation_;
};

AgentObject::AgentObject(sdbus::IConnection& connection,
                         const std::string& path,
                         std::function<bool(const std::string& sender)> isDaemon,
                         Conversation& conversation)
    : adaptor_(std::make_unique<Adaptor>(connection, path, std::move(isDaemon), conversation)) {
}

AgentObject::~AgentObject() = default;

}  // namespace terminal
