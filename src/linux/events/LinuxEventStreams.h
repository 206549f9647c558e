#pragma once

#include <memory>
#include <string>
#include <vector>

#include "linux/events/JournalStream.h"
#include "linux/volume/VolumeIndex.h"
#include "platform/EventStreams.h"

namespace mirabel {

/// The event history of the volume of the documents, on the journal that its index keeps. What
/// happened is found out by comparing the index with the disk whenever the history is asked: a
/// stream delivers what there is when it starts, and ends with that.
class LinuxEventStreams final : public EventStreams {
 public:
  /// `index` outlives it.
  explicit LinuxEventStreams(VolumeIndex& index);
  /// Waits for batches that are being delivered; later ones are not. Not to be called from a
  /// stream's callback.
  ~LinuxEventStreams() override;

  [[nodiscard]] Result<std::unique_ptr<EventStream>> createForPaths(
      std::vector<std::string> paths, std::uint64_t since, std::chrono::milliseconds latency,
      std::uint32_t flags, Callback callback) override;
  [[nodiscard]] Result<std::unique_ptr<EventStream>> createRelativeToDevice(
      DeviceID device, std::vector<std::string> paths, std::uint64_t since,
      std::chrono::milliseconds latency, std::uint32_t flags, Callback callback) override;
  [[nodiscard]] std::uint64_t currentEventID() override;

 private:
  VolumeIndex& index_;
  std::shared_ptr<StreamGate> gate_;
};

}  // namespace mirabel
