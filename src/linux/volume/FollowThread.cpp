#include "linux/volume/FollowThread.h"

#include <array>
#include <poll.h>
#include <utility>

#include "linux/kernel/MountTable.h"

namespace mirabel {
namespace {

// A reader that wakes for each record slows down whoever writes, and has more to do itself: records
// of one name are merged while they wait.
constexpr int restBeforeReading = 20;
constexpr int longestWait = 1000;

}  // namespace

FollowThread::FollowThread(Work work) : work_(std::move(work)), thread_([this] { run(); }) {}

FollowThread::~FollowThread() {
  stop_.set();
  thread_.join();
}

bool FollowThread::isStopped(int milliseconds) const {
  pollfd wait{stop_.descriptor(), POLLIN, 0};
  ::poll(&wait, 1, stop_.limited(milliseconds));
  return stop_.isSet();
}

void FollowThread::run() {
  const MountTable mounts;
  while (true) {
    // Held while it is waited for: its descriptor must not become another's.
    const auto watcher = work_.watcher();
    std::array<pollfd, 3> wait{pollfd{stop_.descriptor(), POLLIN, 0},
                               pollfd{watcher ? watcher->descriptor() : -1, POLLIN, 0},
                               pollfd{mounts.descriptor(), POLLPRI, 0}};
    const int ready = ::poll(wait.data(), wait.size(), stop_.limited(longestWait));
    if (stop_.isSet()) return;
    if (ready > 0 && isStopped(restBeforeReading)) return;
    if (ready > 0 || work_.isDue()) work_.catchUp();
  }
}

}  // namespace mirabel
