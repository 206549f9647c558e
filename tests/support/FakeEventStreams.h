#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/EventStreams.h"

namespace mirabel::testing {

/// An event history in memory. A stream gets the history when it starts, and what comes later when
/// the test says `deliver`; both in batches on the stream's queue. Thread-safe.
class FakeEventStreams final : public EventStreams {
 public:
  /// How a stream was asked for.
  struct Request {
    DeviceID device = 0;  ///< 0 for a stream of absolute paths
    std::vector<std::string> paths;
    std::uint64_t since = 0;
    std::chrono::milliseconds latency{};
    std::uint32_t flags = 0;
  };

  FakeEventStreams();
  ~FakeEventStreams() override;

  Result<std::unique_ptr<EventStream>> createForPaths(std::vector<std::string> paths,
                                                      std::uint64_t since,
                                                      std::chrono::milliseconds latency,
                                                      std::uint32_t flags,
                                                      Callback callback) override;
  Result<std::unique_ptr<EventStream>> createRelativeToDevice(
      DeviceID device, std::vector<std::string> paths, std::uint64_t since,
      std::chrono::milliseconds latency, std::uint32_t flags, Callback callback) override;
  Result<void> followLibraries(const std::vector<FollowedLibrary>& libraries,
                               std::uint64_t version) override;
  std::uint64_t lastEventIDUnder(std::uint64_t version) override;
  Result<std::uint64_t> currentEventID() override;

  /// The libraries that were last said to be followed.
  [[nodiscard]] std::vector<FollowedLibrary> libraries() const;
  /// `followLibraries` fails from now on, until `nullopt`.
  void failFollowing(std::optional<Error> error);

  /// Appends to the history, under the next ID, which it answers.
  std::uint64_t append(std::string_view path, std::optional<std::uint64_t> fileID = {},
                       std::optional<std::uint32_t> documentID = {});
  std::uint64_t appendDocument(std::uint32_t documentID, std::uint64_t source,
                               std::uint64_t destination);
  /// The event as it stands, but for its ID: loss and wrap among them.
  std::uint64_t append(FileSystemEvent event);

  /// Hands every running stream what it has not had, in one batch where that is anything, and
  /// returns when that was handled.
  void deliver();
  /// Returns when nothing is under way on the queues of the running streams.
  void settle();

  /// Events at and below that ID are no longer known.
  void prune(std::uint64_t lastForgotten);
  /// The creations from now on fail, until `nullopt`.
  void failCreation(std::optional<Error> error);
  /// Most events of one batch of history.
  void setBatchSize(std::size_t size);

  [[nodiscard]] std::vector<Request> requests() const;
  [[nodiscard]] std::size_t runningStreams() const;

 private:
  class Stream;
  struct State;
  Result<std::unique_ptr<EventStream>> create(Request request, Callback callback);

  std::shared_ptr<State> state_;
};

}  // namespace mirabel::testing
