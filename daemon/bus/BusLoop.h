// The bus thread.
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <vector>

#include "base/File.h"

namespace sdbus {
class IConnection;
}

namespace bus {

// Serves a connection on the thread that calls run().
//
// The connection's library holds a lock of its own while a handler of a message runs, and takes it for
// everything that is sent. So nobody sends while holding a lock that a handler takes too.
class BusLoop {
 public:
  // stopDescriptor: ends run() when it becomes readable; it is not read. It and the connection outlive the
  // loop. Throws std::system_error where the system has no descriptors left.
  BusLoop(sdbus::IConnection& connection, int stopDescriptor);
  ~BusLoop();

  enum class End { kStopped, kBusLost };

  // Handles messages and posted work until it is stopped or the bus is gone.
  End run();

  // Has the work run on the bus thread, outside any handler. From any thread. Work that is left when run()
  // has ended is destroyed unused with the loop. The work does not throw.
  void post(std::function<void()> work);

  // To be called after something was sent from another thread: has the bus thread send what the
  // connection could not take at once.
  void sendRest();

 private:
  void wake() noexcept;
  void runPosted();

  sdbus::IConnection& connection_;
  const int stopDescriptor_;
  const base::FileDescriptor wakeUp_;
  std::mutex mutex_;
  std::vector<std::function<void()>> posted_;  // guarded by mutex_
};

}  // namespace bus
