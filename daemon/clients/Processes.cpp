#include "daemon/clients/Processes.h"

#include <poll.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <utility>

#include "base/File.h"

namespace clients {
namespace {

class DescriptorOfProcess final : public ProcessHandle {
 public:
  explicit DescriptorOfProcess(base::FileDescriptor descriptor)
      : descriptor_(std::move(descriptor)) {}

  bool isAlive() const override {
    pollfd polled{descriptor_.get(), POLLIN, 0};
    return ::poll(&polled, 1, 0) == 0;  // it becomes readable when the process ends
  }

 private:
  const base::FileDescriptor descriptor_;
};

}  // namespace

std::unique_ptr<ProcessHandle> SystemProcesses::open(pid_t pid) {
  // The C library has no function for it yet. The descriptor is closed on exec.
  base::FileDescriptor descriptor(static_cast<int>(::syscall(SYS_pidfd_open, pid, 0)));
  if (!descriptor.isOpen()) return nullptr;
  return std::make_unique<DescriptorOfProcess>(std::move(descriptor));
}

}  // namespace clients
