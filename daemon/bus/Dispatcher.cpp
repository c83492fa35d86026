#include "daemon/bus/Dispatcher.h"

#include <exception>
#include <stdexcept>
#include <string_view>
#include <utility>

#include "daemon/bus/Names.h"
#include "daemon/log/Log.h"

namespace bus {
namespace {

// The errors of a message that could not be read come from the library under names of its own.
bool isOurs(std::string_view name) {
  return name.starts_with(kServiceName) || name == kAccessDenied || name == kInvalidArgs;
}

}  // namespace

Dispatcher::Dispatcher(sdbus::IObject& object,
                       BusLoop& loop,
                       clients::Identities& identities,
                       requests::RequestPool& pool,
                       RVLogService& log)
    : object_(object),
      loop_(loop),
      identities_(identities),
      pool_(pool),
      log_(log) {
}

void Dispatcher::serve(const std::string& interface,
                       Callers callers,
                       const std::vector<interfaces::Method>& methods,
                       std::map<std::string, Handler> handlers) {
  for (const auto& method : methods) {
    const auto handler = handlers.find(method.name);
    if (handler == handlers.end()) throw std::logic_error("No handler of " + interface + "." + method.name);
    object_.registerMethod(interface,
                           method.name,
                           method.inputSignature,
                           method.inputNames,
                           method.outputSignature,
                           method.outputNames,
                           [this, callers, handle = std::move(handler->second)](sdbus::MethodCall message) {
                             dispatch(std::move(message), callers, handle);
                           });
  }
}

void Dispatcher::dispatch(sdbus::MethodCall message, Callers callers, const Handler& handler) noexcept {
  try {
    const auto call = std::make_shared<Call>(std::move(message), loop_);
    const bool isTaken = identities_.whenIdentified(call->sender(), [this, call, callers, &handler] {
      guarded(*call, [&] {
        checkCaller(call->sender(), callers);
        handler(call);
      });
    });
    if (!isTaken) call->fail(kLimitsExceeded, "Too many calls wait until it is known who makes them");
  } catch (const std::exception& exception) {  // Not even the call could be kept: there is no memory left.
    logging::error(log_, "A call could not be taken: %@", {exception.what()});
  }
}

void Dispatcher::checkCaller(const std::string& uniqueName, Callers callers) const {
  if (!identities_.isOwnUser(uniqueName))
    throw sdbus::Error(kAccessDenied, "Only the user whose accounts these are may call");
  if (callers == Callers::kUnconfined && !identities_.isUnconfined(uniqueName))
    throw sdbus::Error(kAccessDenied, "Only programs that are known to run in no sandbox may call");
}

void Dispatcher::onPool(const std::shared_ptr<Call>& call, std::function<void()> work) {
  const bool isTaken = pool_.submit([this, call, work = std::move(work)] { guarded(*call, work); });
  if (!isTaken) call->fail(kFailed, "The daemon is stopping");
}

void Dispatcher::guarded(Call& call, const std::function<void()>& work) noexcept {
  try {
    work();
  } catch (const sdbus::Error& error) {
    call.fail(isOurs(error.getName()) ? error.getName() : kInvalidArgs, error.getMessage());
  } catch (const std::exception& exception) {
    logging::error(log_, "A call failed: %@", {exception.what()});
    call.fail(kFailed, "The daemon could not do it");
  } catch (...) {
    logging::error(log_, "A call failed");
    call.fail(kFailed, "The daemon could not do it");
  }
}

}  // namespace bus
