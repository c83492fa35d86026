#include "daemon/bus/BusLoop.h"

#include <poll.h>
#include <sdbus-c++/sdbus-c++.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <system_error>
#include <utility>

namespace bus {
namespace {

// So that a flood of messages keeps nobody from stopping the loop.
constexpr int kMessagesInARow = 64;

base::FileDescriptor makeEvent() {
  base::FileDescriptor event(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  if (!event.isOpen()) throw std::system_error(errno, std::generic_category(), "eventfd");
  return event;
}

}  // namespace

BusLoop::BusLoop(sdbus::IConnection& connection, int stopDescriptor)
    : connection_(connection),
      stopDescriptor_(stopDescriptor),
      wakeUp_(makeEvent()) {
}

BusLoop::~BusLoop() = default;

BusLoop::End BusLoop::run() {
  std::array<pollfd, 3> polled{};
  while (polled[2].revents == 0) {
    runPosted();
    sdbus::IConnection::PollData bus{};
    try {
      for (int i = 0; i < kMessagesInARow && connection_.processPendingRequest(); ++i) continue;
      bus = connection_.getEventLoopPollData();
    } catch (const sdbus::Error&) {
      return End::kBusLost;
    }
    polled = {{{bus.fd, bus.events, 0}, {wakeUp_.get(), POLLIN, 0}, {stopDescriptor_, POLLIN, 0}}};
    const int ready = ::poll(polled.data(), polled.size(), bus.getPollTimeout());
    if (ready < 0 && errno != EINTR) return End::kBusLost;
    if (polled[1].revents != 0) {
      std::uint64_t count = 0;
      [[maybe_unused]] const auto read = ::read(wakeUp_.get(), &count, sizeof count);
    }
  }
  return End::kStopped;
}

void BusLoop::post(std::function<void()> work) {
  {
    const std::lock_guard lock(mutex_);
    posted_.push_back(std::move(work));
  }
  wake();
}

void BusLoop::sendRest() {
  if ((connection_.getEventLoopPollData().events & POLLOUT) != 0) wake();
}

void BusLoop::wake() noexcept {
  const std::uint64_t one = 1;
  // A full counter wakes as well as any other.
  [[maybe_unused]] const auto written = ::write(wakeUp_.get(), &one, sizeof one);
}

void BusLoop::runPosted() {
  std::vector<std::function<void()>> posted;
  {
    const std::lock_guard lock(mutex_);
    posted.swap(posted_);
  }
  for (auto& work : posted) work();
}

}  // namespace bus
