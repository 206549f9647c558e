#include "fs/RunningReaders.h"

namespace mirabel {

void RunningReaders::add(const std::shared_ptr<FSEventReader>& reader) {
  const std::lock_guard lock(mutex_);
  std::erase_if(readers_, [](const Running& earlier) { return earlier.reader.expired(); });
  readers_.push_back({reader, reader->streamQueue()});
}

void RunningReaders::stop() {
  std::vector<Running> readers;
  {
    const std::lock_guard lock(mutex_);
    readers.swap(readers_);
  }
  for (Running& running : readers) {
    const auto reader = running.reader.lock();
    if (!reader) continue;
    running.queue.sync([&] {
      if (reader->isRunning()) reader->stop();
    });
  }
}

}  // namespace mirabel
