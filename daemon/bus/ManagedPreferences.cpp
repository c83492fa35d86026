#include <sdbus-c++/sdbus-c++.h>

#include "daemon/bus/ManagementService.h"
#include "daemon/bus/Values.h"

namespace bus {

void ManagementService::getPreference(SharedCall call) {
  std::string applicationID;
  std::string key;
  call->message() >> applicationID >> key;
  dispatcher_.onPool(call, [this, call, applicationID, key] {
    const auto value = parts_.preferences.get(applicationID, key);
    if (!value) throwFailure(value.failure());
    call->reply([&](sdbus::MethodReply& reply) {
      reply.openContainer("v");
      if (*value) writeVariant(reply, **value);
      reply.closeContainer();
    });
  });
}

void ManagementService::setPreference(SharedCall call) {
  SizeLimit limit{parts_.settings.messageBytes};
  const std::string applicationID = readString(call->message(), limit);
  const std::string key = readString(call->message(), limit);
  const RVValue value = readVariant(call->message(), limit);
  dispatcher_.onPool(call, [this, call, applicationID, key, value] {
    if (const auto set = parts_.preferences.set(applicationID, key, value); !set) throwFailure(set.failure());
    call->reply();
  });
}

void ManagementService::resetPreference(SharedCall call) {
  std::string applicationID;
  std::string key;
  call->message() >> applicationID >> key;
  dispatcher_.onPool(call, [this, call, applicationID, key] {
    if (const auto reset = parts_.preferences.reset(applicationID, key); !reset)
      throwFailure(reset.failure());
    call->reply();
  });
}

void ManagementService::postNotification(SharedCall call) {
  std::string name;
  call->message() >> name;
  dispatcher_.onPool(call, [this, call, name] {
    parts_.notifications.post(name);
    call->reply();
  });
}

}  // namespace bus
