#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <shared_mutex>
#include <string>
#include <vector>

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

/// A cursor into the volume's history. Starting it brings the index in step with the disk, then
/// delivers the history a batch at a time; nothing queues in memory. Any thread may call it.
class JournalStream final : public EventStream {
 public:
  /// `index` lives until the gate is closed.
  JournalStream(VolumeIndex& index, std::shared_ptr<StreamGate> gate, JournalSelection selection,
                std::uint64_t since, EventStreams::Callback callback);
  ~JournalStream() override;

  void setDispatchQueue(SerialQueue queue) override;
  void start() override;
  void stop() override;
  void invalidate() override;

 private:
  // Shared with the work that is under way on the queue.
  struct Run;
  std::shared_ptr<Run> run_;
  std::optional<SerialQueue> queue_;
};

}  // namespace mirabel
