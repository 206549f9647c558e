#pragma once

#include <memory>
#include <mutex>
#include <vector>

#include "fs/FSEventReader.h"

namespace mirabel {

/// The readers of a provider's enumerations, so that whoever takes down what they use can wait for
/// them: a reader goes through the rest of its batch even when its enumeration has finished, and
/// an observer that is being told of the finish may be the last to hold one. Any thread may call
/// it.
class RunningReaders {
 public:
  void add(const std::shared_ptr<FSEventReader>& reader);
  /// Stops those that run; returns when no batch is under way. Not to be called from a reader's
  /// queue.
  void stop();

 private:
  struct Running {
    std::weak_ptr<FSEventReader> reader;
    SerialQueue queue;
  };
  std::mutex mutex_;
  std::vector<Running> readers_;
};

}  // namespace mirabel
