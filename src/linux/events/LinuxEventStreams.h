#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "linux/events/JournalStream.h"
#include "linux/volume/VolumeIndex.h"
#include "platform/EventStreams.h"

namespace mirabel {

/// The event history of the volume of the documents, on the journal that its index keeps. A stream
/// delivers what there is when it starts, then what comes, as long as the index hears of changes.
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
  [[nodiscard]] Result<void> followLibraries(const std::vector<FollowedLibrary>& libraries,
                                             std::uint64_t version) override;
  [[nodiscard]] std::uint64_t lastEventIDUnder(std::uint64_t version) override;
  [[nodiscard]] Result<std::uint64_t> currentEventID() override;

 private:
  [[nodiscard]] StreamServices services() const;
  [[nodiscard]] Result<void> followLeftOut();

  VolumeIndex& index_;
  std::unique_ptr<LiveStreams> live_;
  std::shared_ptr<StreamGate> gate_;
  struct LeftOut {
    std::vector<FollowedFolder> folders;
    std::uint64_t version;
  };
  std::mutex mutex_;
  std::optional<LeftOut> leftOut_;  ///< what could not be followed yet; with mutex_
};

}  // namespace mirabel
