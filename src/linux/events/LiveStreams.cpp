#include "linux/events/LiveStreams.h"

#include <algorithm>
#include <utility>

namespace mirabel {

LiveStreams::~LiveStreams() {
  bell_.remove(listener_);
  {
    const std::lock_guard lock(mutex_);
    isClosed_ = true;
  }
  changed_.notify_all();
  if (thread_.joinable()) thread_.join();
}

void LiveStreams::add(std::weak_ptr<LiveStream> stream) {
  std::call_once(listens_, [this] { listener_ = bell_.add([this] { grown(); }); });
  const std::lock_guard lock(mutex_);
  // Something may have come since it read what there was.
  streams_.push_back({std::move(stream), Clock::now()});
  if (!thread_.joinable()) thread_ = std::thread([this] { run(); });
  changed_.notify_all();
}

void LiveStreams::grown() {
  const std::lock_guard lock(mutex_);
  const auto now = Clock::now();
  for (Waiting& waiting : streams_) {
    if (waiting.due != Clock::time_point::max()) continue;
    const auto stream = waiting.stream.lock();
    if (stream) waiting.due = now + stream->latency();
  }
  changed_.notify_all();
}

void LiveStreams::run() {
  std::unique_lock lock(mutex_);
  while (!isClosed_) {
    const auto due = nextDue();
    if (due == Clock::time_point::max()) {
      changed_.wait(lock);
    } else {
      changed_.wait_until(lock, due);
    }
    auto streams = takeDue(Clock::now());
    lock.unlock();
    for (const auto& stream : streams)
      stream->submit();
    streams.clear();
    lock.lock();
  }
}

LiveStreams::Clock::time_point LiveStreams::nextDue() const {
  auto due = Clock::time_point::max();
  for (const Waiting& waiting : streams_)
    due = std::min(due, waiting.due);
  return due;
}

std::vector<std::shared_ptr<LiveStream>> LiveStreams::takeDue(Clock::time_point now) {
  std::vector<std::shared_ptr<LiveStream>> due;
  for (Waiting& waiting : streams_) {
    if (waiting.due > now) continue;
    waiting.due = Clock::time_point::max();
    if (auto stream = waiting.stream.lock()) due.push_back(std::move(stream));
  }
  std::erase_if(streams_, [](const Waiting& waiting) { return waiting.stream.expired(); });
  return due;
}

}  // namespace mirabel
