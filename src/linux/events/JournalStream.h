#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <shared_mutex>
#include <string>
#include <vector>

#include "linux/events/LiveStreams.h"
#include "linux/volume/VolumeIndex.h"
#include "platform/EventStreams.h"

namespace mirabel {

/// Which records of the history a stream delivers.
struct JournalSelection {
  bool documents = false;          ///< document records, else path records
  std::vector<std::string> paths;  ///< of path records: at and below these
};

/// Lets streams work as long as the volume is open: work holds it shared, whoever closes the volume
/// takes it alone first.
struct StreamGate {
  std::shared_mutex mutex;
  bool isClosed = false;
};

/// What the streams of a volume share.
struct StreamServices {
  VolumeIndex& index;
  LiveStreams& live;
  std::shared_ptr<StreamGate> gate;
};

/// A cursor into the volume's history. Starting it brings the index in step with the disk, then
/// delivers the history a batch at a time, then what comes; nothing queues in memory. Of several
/// events of one batch that say the same of one object, the first is delivered. Any thread may call
/// it.
class JournalStream final : public EventStream {
 public:
  /// `services` live until their gate is closed.
  JournalStream(const StreamServices& services, JournalSelection selection, std::uint64_t since,
                std::chrono::milliseconds latency, EventStreams::Callback callback);
  ~JournalStream() override;

  void setDispatchQueue(SerialQueue queue) override;
  void start() override;
  void stop() override;
  void invalidate() override;

 private:
  // Shared with the work that is under way on the queue.
  struct Run;
  std::shared_ptr<Run> run_;
};

}  // namespace mirabel
