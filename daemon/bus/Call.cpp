#include "daemon/bus/Call.h"

#include <exception>
#include <utility>

#include "daemon/bus/Names.h"
#include "daemon/bus/Values.h"

namespace bus {

Call::Call(sdbus::MethodCall message, BusLoop& loop)
    : message_(std::move(message)),
      sender_(message_.getSender()),
      loop_(loop) {
}

Call::~Call() {
  fail(kFailed, "The daemon gave the call up");
}

void Call::reply(const std::function<void(sdbus::MethodReply&)>& write) noexcept {
  if (isAnswered_.test_and_set()) return;
  send([&] {
    auto reply = message_.createReply();
    write(reply);
    return reply;
  });
}

void Call::reply() noexcept {
  reply([](sdbus::MethodReply&) {});
}

void Call::fail(const std::string& name, const std::string& message) noexcept {
  if (isAnswered_.test_and_set()) return;
  send([&] { return message_.createErrorReply(sdbus::Error(name, busText(message))); });
}

void Call::send(const std::function<sdbus::MethodReply()>& make) noexcept {
  try {
    try {
      make().send();
    } catch (const std::exception&) {
      message_.createErrorReply(sdbus::Error(kFailed, "The answer could not be put into a message")).send();
    }
    loop_.sendRest();
  } catch (const std::exception&) {  // The bus is gone, and the caller with it.
  }
}

}  // namespace bus
