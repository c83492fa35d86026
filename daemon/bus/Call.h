// One method call from the bus, and the answer that is owed to it.
#pragma once

#include <sdbus-c++/sdbus-c++.h>

#include <atomic>
#include <functional>
#include <string>

#include "daemon/bus/BusLoop.h"

namespace bus {

// Answered exactly once: by the first of reply and fail, or, where the last reference goes without either,
// with the error Failed. Answers may come from any thread; none of the functions throws.
class Call {
 public:
  // Made on the bus thread. The loop outlives the call.
  Call(sdbus::MethodCall message, BusLoop& loop);
  Call(const Call&) = delete;
  Call& operator=(const Call&) = delete;
  ~Call();

  // The caller's unique name.
  const std::string& sender() const { return sender_; }

  // For reading the arguments, on the bus thread.
  sdbus::MethodCall& message() { return message_; }

  // write: puts the results into the reply; where it throws, the answer is the error Failed.
  void reply(const std::function<void(sdbus::MethodReply&)>& write) noexcept;
  void reply() noexcept;
  void fail(const std::string& name, const std::string& message) noexcept;

 private:
  void send(const std::function<sdbus::MethodReply()>& make) noexcept;

  sdbus::MethodCall message_;
  const std::string sender_;
  BusLoop& loop_;
  std::atomic_flag isAnswered_;
};

}  // namespace bus
