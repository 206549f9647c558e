#include "linux/volume/FollowThread.h"

#include <array>
#include <cstdint>
#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>
#include <utility>

namespace mirabel {
namespace {

// A reader that wakes for each record slows down whoever writes, and has more to do itself: records
// of one name are merged while they wait.
constexpr int restBeforeReading = 20;
constexpr int longestWait = 1000;

}  // namespace

FollowThread::FollowThread(Work work)
    : work_(std::move(work)), stop_(::eventfd(0, EFD_CLOEXEC)), thread_([this] { run(); }) {}

FollowThread::~FollowThread() {
  const std::uint64_t one = 1;
  static_cast<void>(!::write(stop_.get(), &one, sizeof(one)));
  thread_.join();
}

bool FollowThread::isStopped(int milliseconds) const {
  pollfd wait{stop_.get(), POLLIN, 0};
  return ::poll(&wait, 1, milliseconds) > 0;
}

void FollowThread::run() {
  while (true) {
    // Held while it is waited for: its descriptor must not become another's.
    const auto watcher = work_.watcher();
    std::array<pollfd, 2> wait{pollfd{stop_.get(), POLLIN, 0},
                               pollfd{watcher ? watcher->descriptor() : -1, POLLIN, 0}};
    const int ready = ::poll(wait.data(), wait.size(), longestWait);
    if (wait[0].revents != 0) return;
    if (ready > 0 && isStopped(restBeforeReading)) return;
    if (ready > 0 || work_.isDue()) work_.catchUp();
  }
}

}  // namespace mirabel
