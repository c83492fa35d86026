// From messages to handlers.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "daemon/bus/BusLoop.h"
#include "daemon/bus/Call.h"
#include "daemon/clients/Identities.h"
#include "daemon/requests/RequestPool.h"
#include "host/RVLog.h"
#include "interfaces/Method.h"

namespace bus {

// Which programs may call an interface's methods. All are the daemon's own user's.
enum class Callers {
  kAll,
  kUnconfined,  // those that run in no sandbox
};

// Lets through the calls of those who may make them, once it is known who they are, and sees to it that
// nothing that goes wrong in a handler gets past it: what a handler throws becomes the call's answer.
class Dispatcher {
 public:
  // Runs on the bus thread. Answers the call, or hands it on; may throw anything.
  using Handler = std::function<void(const std::shared_ptr<Call>& call)>;

  // The references outlive this object.
  Dispatcher(sdbus::IObject& object,
             BusLoop& loop,
             clients::Identities& identities,
             requests::RequestPool& pool,
             RVLogService& log);

  // Registers every method of the interface. Throws std::logic_error where one has no handler.
  void serve(const std::string& interface,
             Callers callers,
             const std::vector<interfaces::Method>& methods,
             std::map<std::string, Handler> handlers);

  // Runs the work on the pool; what it throws becomes the call's answer.
  void onPool(const std::shared_ptr<Call>& call, std::function<void()> work);

  // Runs the work here; what it throws becomes the call's answer.
  void guarded(Call& call, const std::function<void()>& work) noexcept;

 private:
  void dispatch(sdbus::MethodCall message, Callers callers, const Handler& handler) noexcept;
  void checkCaller(const std::string& uniqueName, Callers callers) const;

  sdbus::IObject& object_;
  BusLoop& loop_;
  clients::Identities& identities_;
  requests::RequestPool& pool_;
  RVLogService& log_;
};

}  // namespace bus
