#include "linux/events/LinuxEventStreams.h"

#include <cerrno>
#include <limits>
#include <utility>

#include "foundation/Log.h"
#include "linux/events/JournalStream.h"

namespace mirabel {

LinuxEventStreams::LinuxEventStreams(VolumeIndex& index)
    : index_(index), gate_(std::make_shared<StreamGate>()) {}

LinuxEventStreams::~LinuxEventStreams() {
  const std::scoped_lock closing(gate_->mutex);
  gate_->isClosed = true;
}

Result<std::unique_ptr<EventStream>> LinuxEventStreams::createForPaths(
    std::vector<std::string> paths, std::uint64_t since, std::chrono::milliseconds, std::uint32_t,
    Callback callback) {
  return std::make_unique<JournalStream>(index_, gate_, JournalSelection{false, std::move(paths)},
                                         since, std::move(callback));
}

Result<std::unique_ptr<EventStream>> LinuxEventStreams::createRelativeToDevice(
    DeviceID, std::vector<std::string> paths, std::uint64_t since, std::chrono::milliseconds,
    std::uint32_t, Callback callback) {
  if (paths != std::vector<std::string>{"/.docid"}) return fail(Error::posix(ENOTSUP));
  return std::make_unique<JournalStream>(index_, gate_, JournalSelection{true, {}}, since,
                                         std::move(callback));
}

std::uint64_t LinuxEventStreams::currentEventID() {
  auto id = index_.currentEventID();
  if (id) return *id;
  // No history was ever there to give this out: whoever asks for what came after starts over.
  logError("can't read the event history; " + id.error().description());
  return std::numeric_limits<std::uint64_t>::max();
}

}  // namespace mirabel
