#include "support/FakeEventStreams.h"

#include <algorithm>
#include <limits>
#include <map>
#include <utility>

namespace mirabel::testing {
namespace {

bool isAtOrBelow(std::string_view path, std::string_view folder) {
  if (!path.starts_with(folder)) return false;
  return path.size() == folder.size() || path[folder.size()] == '/' || folder.ends_with('/');
}

bool isFor(const FakeEventStreams::Request& request, const FileSystemEvent& event) {
  if (!event.path) return true;
  const bool isDocument = event.path->starts_with(".docid/");
  if (request.device != 0 || isDocument) return request.device != 0 && isDocument;
  return std::ranges::any_of(
      request.paths, [&](const std::string& folder) { return isAtOrBelow(*event.path, folder); });
}

}  // namespace

struct FakeEventStreams::State {
  mutable std::mutex mutex;
  std::vector<FileSystemEvent> history;  // event N at index N - 1
  std::uint64_t lastForgotten = 0;
  std::size_t batchSize = std::numeric_limits<std::size_t>::max();
  std::optional<Error> creationFailure;
  std::optional<Error> followingFailure;
  std::vector<FollowedLibrary> libraries;
  std::map<std::uint64_t, std::uint64_t> versions;  // last events before them
  std::vector<Request> requests;
  std::vector<Stream*> running;
};

class FakeEventStreams::Stream final : public EventStream {
 public:
  Stream(std::shared_ptr<State> state, Request request, Callback callback)
      : state_(std::move(state)), request_(std::move(request)), callback_(std::move(callback)) {}
  ~Stream() override { invalidate(); }

  void setDispatchQueue(SerialQueue queue) override { queue_ = std::move(queue); }

  void start() override {
    const std::lock_guard lock(state_->mutex);
    const std::uint64_t last = state_->history.size();
    if (request_.since < state_->lastForgotten || request_.since > last) {
      submit({{last, eventflag::kernelDropped, {}, {}, {}}});
    }
    std::vector<FileSystemEvent> batch = unseen();
    batch.push_back({last, eventflag::historyDone, {}, {}, {}});
    while (batch.size() > state_->batchSize) {
      const auto end = batch.begin() + static_cast<std::ptrdiff_t>(state_->batchSize);
      submit({batch.begin(), end});
      batch.erase(batch.begin(), end);
    }
    submit(std::move(batch));
    state_->running.push_back(this);
  }

  void stop() override {
    const std::lock_guard lock(state_->mutex);
    std::erase(state_->running, this);
  }

  void invalidate() override { stop(); }

  /// With the lock held.
  void deliver() {
    if (auto batch = unseen(); !batch.empty()) submit(std::move(batch));
  }
  [[nodiscard]] SerialQueue queue() const { return *queue_; }

 private:
  std::vector<FileSystemEvent> unseen() {
    std::vector<FileSystemEvent> events;
    for (; request_.since < state_->history.size(); ++request_.since) {
      const FileSystemEvent& event = state_->history[request_.since];
      if (isFor(request_, event)) events.push_back(event);
    }
    return events;
  }

  void submit(std::vector<FileSystemEvent> batch) {
    queue_->async([callback = callback_, events = std::move(batch)] { callback(events); });
  }

  std::shared_ptr<State> state_;
  Request request_;
  Callback callback_;
  std::optional<SerialQueue> queue_;
};

FakeEventStreams::FakeEventStreams() : state_(std::make_shared<State>()) {}

FakeEventStreams::~FakeEventStreams() = default;

Result<std::unique_ptr<EventStream>> FakeEventStreams::createForPaths(
    std::vector<std::string> paths, std::uint64_t since, std::chrono::milliseconds latency,
    std::uint32_t flags, Callback callback) {
  return create({0, std::move(paths), since, latency, flags}, std::move(callback));
}

Result<std::unique_ptr<EventStream>> FakeEventStreams::createRelativeToDevice(
    DeviceID device, std::vector<std::string> paths, std::uint64_t since,
    std::chrono::milliseconds latency, std::uint32_t flags, Callback callback) {
  return create({device, std::move(paths), since, latency, flags}, std::move(callback));
}

Result<std::unique_ptr<EventStream>> FakeEventStreams::create(Request request, Callback callback) {
  const std::lock_guard lock(state_->mutex);
  state_->requests.push_back(request);
  if (state_->creationFailure) return fail(*state_->creationFailure);
  return std::make_unique<Stream>(state_, std::move(request), std::move(callback));
}

Result<void> FakeEventStreams::followLibraries(const std::vector<FollowedLibrary>& libraries,
                                               std::uint64_t version) {
  const std::lock_guard lock(state_->mutex);
  if (state_->followingFailure) return fail(*state_->followingFailure);
  state_->libraries = libraries;
  state_->versions.emplace(version, state_->history.size());
  return {};
}

std::uint64_t FakeEventStreams::lastEventIDUnder(std::uint64_t version) {
  const std::lock_guard lock(state_->mutex);
  const auto later = state_->versions.upper_bound(version);
  return later == state_->versions.end() ? std::numeric_limits<std::uint64_t>::max()
                                         : later->second;
}

std::vector<FollowedLibrary> FakeEventStreams::libraries() const {
  const std::lock_guard lock(state_->mutex);
  return state_->libraries;
}

void FakeEventStreams::failFollowing(std::optional<Error> error) {
  const std::lock_guard lock(state_->mutex);
  state_->followingFailure = std::move(error);
}

Result<std::uint64_t> FakeEventStreams::currentEventID() {
  const std::lock_guard lock(state_->mutex);
  return static_cast<std::uint64_t>(state_->history.size());
}

std::uint64_t FakeEventStreams::append(std::string_view path, std::optional<std::uint64_t> fileID,
                                       std::optional<std::uint32_t> documentID) {
  return append({0, 0, std::string(path), fileID, documentID});
}

std::uint64_t FakeEventStreams::appendDocument(std::uint32_t documentID, std::uint64_t source,
                                               std::uint64_t destination) {
  return append(".docid/changed/" + std::to_string(documentID) + "/src=" + std::to_string(source) +
                ",dst=" + std::to_string(destination));
}

std::uint64_t FakeEventStreams::append(FileSystemEvent event) {
  const std::lock_guard lock(state_->mutex);
  event.id = state_->history.size() + 1;
  return state_->history.emplace_back(std::move(event)).id;
}

void FakeEventStreams::deliver() {
  {
    const std::lock_guard lock(state_->mutex);
    for (Stream* stream : state_->running)
      stream->deliver();
  }
  settle();
}

void FakeEventStreams::settle() {
  std::vector<SerialQueue> queues;
  {
    const std::lock_guard lock(state_->mutex);
    for (const Stream* stream : state_->running)
      queues.push_back(stream->queue());
  }
  for (SerialQueue& queue : queues)
    queue.sync([] {});
}

void FakeEventStreams::prune(std::uint64_t lastForgotten) {
  const std::lock_guard lock(state_->mutex);
  state_->lastForgotten = lastForgotten;
}

void FakeEventStreams::failCreation(std::optional<Error> error) {
  const std::lock_guard lock(state_->mutex);
  state_->creationFailure = std::move(error);
}

void FakeEventStreams::setBatchSize(std::size_t size) {
  const std::lock_guard lock(state_->mutex);
  state_->batchSize = size;
}

std::vector<FakeEventStreams::Request> FakeEventStreams::requests() const {
  const std::lock_guard lock(state_->mutex);
  return state_->requests;
}

std::size_t FakeEventStreams::runningStreams() const {
  const std::lock_guard lock(state_->mutex);
  return state_->running.size();
}

}  // namespace mirabel::testing
