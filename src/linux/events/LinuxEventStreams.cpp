#include "linux/events/LinuxEventStreams.h"

#include <cerrno>
#include <utility>

#include "linux/events/JournalStream.h"

namespace mirabel {

LinuxEventStreams::LinuxEventStreams(VolumeIndex& index)
    : index_(index),
      live_(std::make_unique<LiveStreams>(index.bell())),
      gate_(std::make_shared<StreamGate>()) {}

LinuxEventStreams::~LinuxEventStreams() {
  {
    const std::scoped_lock closing(gate_->mutex);
    gate_->isClosed = true;
  }
  // Only now does nobody add to them any more.
  live_.reset();
}

StreamServices LinuxEventStreams::services() const {
  return {index_, *live_, gate_};
}

Result<std::unique_ptr<EventStream>> LinuxEventStreams::createForPaths(
    std::vector<std::string> paths, std::uint64_t since, std::chrono::milliseconds latency,
    std::uint32_t, Callback callback) {
  return std::make_unique<JournalStream>(services(), JournalSelection{false, std::move(paths)},
                                         since, latency, std::move(callback));
}

Result<std::unique_ptr<EventStream>> LinuxEventStreams::createRelativeToDevice(
    DeviceID, std::vector<std::string> paths, std::uint64_t since,
    std::chrono::milliseconds latency, std::uint32_t, Callback callback) {
  if (paths != std::vector<std::string>{"/.docid"}) return fail(Error::posix(ENOTSUP));
  return std::make_unique<JournalStream>(services(), JournalSelection{true, {}}, since, latency,
                                         std::move(callback));
}

Result<void> LinuxEventStreams::followLibraries(const std::vector<FollowedLibrary>& libraries,
                                                std::uint64_t version) {
  std::vector<FollowedFolder> folders;
  folders.reserve(libraries.size());
  for (const FollowedLibrary& library : libraries)
    folders.push_back({library.folder.path(), library.label});
  const std::scoped_lock lock(mutex_);
  leftOut_ = LeftOut{std::move(folders), version};
  return followLeftOut();
}

Result<void> LinuxEventStreams::followLeftOut() {
  if (!leftOut_) return {};
  auto done = index_.follow(leftOut_->folders, leftOut_->version);
  if (done) leftOut_.reset();
  return done;
}

std::uint64_t LinuxEventStreams::lastEventIDUnder(std::uint64_t version) {
  return index_.lastEventUnder(version);
}

Result<std::uint64_t> LinuxEventStreams::currentEventID() {
  // What happens in a library that is not followed has no event: an ID would tell of nothing new.
  const auto followed = [&] {
    const std::scoped_lock lock(mutex_);
    return followLeftOut();
  }();
  if (!followed) return fail(followed.error());
  return index_.currentEventID();
}

}  // namespace mirabel
