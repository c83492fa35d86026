// Preferences, named notifications and serial work queues.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "host/Values.h"

// Whose preference, and on which machine.
enum class ZQPreferencesUser { kCurrentUser };
enum class ZQPreferencesHost { kAnyHost };
inline constexpr ZQPreferencesUser kZQPreferencesCurrentUser = ZQPreferencesUser::kCurrentUser;
inline constexpr ZQPreferencesHost kZQPreferencesAnyHost = ZQPreferencesHost::kAnyHost;

// The preferences layer. Values that were read once are kept until the application's preferences are
// synchronised, so a change by somebody else is seen only after that. Called from any thread.
class ZQPreferences {
 public:
  virtual ~ZQPreferences() = default;

  // The value, owned by the caller; absent where none is stored.
  virtual std::optional<RVValue> ZQPreferencesCopyValue(std::string_view key,
                                                        std::string_view applicationID,
                                                        ZQPreferencesUser userName,
                                                        ZQPreferencesHost hostName) = 0;

  // Forgets what was read of the application, so that the next read sees what is stored. Returns
  // whether it could.
  virtual bool ZQPreferencesAppSynchronize(std::string_view applicationID) = 0;

  // The boolean reading of a stored value: a boolean is itself; a number is true unless zero; a string
  // is true for "true", "yes", "on" and "1" in any case; anything else is false.
  virtual bool booleanValue(const RVValue& value) const = 0;
};

// Runs the work handed to it one piece after the other, in order. Called from any thread.
class ZQSerialQueue {
 public:
  virtual ~ZQSerialQueue() = default;
  virtual const std::string& label() const = 0;
  // Runs the work on the queue and returns when it is done. Not called from work on the same queue. An
  // exception of the work is thrown to the caller.
  virtual void dispatchSync(const std::function<void()>& work) = 0;
  // Puts the work at the end of the queue and returns at once.
  virtual void dispatchAsync(std::function<void()> work) = 0;
};

class ZQSerialQueueFactory {
 public:
  virtual ~ZQSerialQueueFactory() = default;
  // A new queue. Never null. Work that is waiting when the last reference goes is still run.
  virtual std::shared_ptr<ZQSerialQueue> createSerialQueue(std::string_view label) = 0;
};

// System-wide notifications by name. Called from any thread.
class ZQNotificationCenter {
 public:
  virtual ~ZQNotificationCenter() = default;
  // Has the handler run on the queue each time the notification is posted. Returns a token; the
  // registration and the queue live as long as the centre.
  virtual int registerForNotification(std::string_view name,
                                      std::shared_ptr<ZQSerialQueue> queue,
                                      std::function<void()> handler) = 0;
};
