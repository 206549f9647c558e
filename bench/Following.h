#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "BenchHome.h"
#include "host/HostedProvider.h"
#include "linux/volume/VolumeIndex.h"
#include "mirabel/Values.h"

namespace mirabel::bench {

enum class Marks { wanted, unwanted };

/// The index of a home's documents, and nothing else of a provider.
class OpenIndex {
 public:
  OpenIndex(const std::string& home, Marks marks);
  /// Brings it in step; answers the last event.
  std::uint64_t sync() const;
  /// How many events there are after `since`, all of them read; `since` moves to the last.
  std::size_t read(std::uint64_t& since) const;
  /// Whether it hears of changes.
  [[nodiscard]] bool isFollowing() const;

 private:
  MonitoredRoots roots_;
  std::unique_ptr<VolumeIndex> index_;
};

/// A provider of a home, and a client that lists everything in it and asks for what has changed.
class OpenProvider {
 public:
  explicit OpenProvider(const std::string& home);
  /// The anchor of now.
  [[nodiscard]] Data anchor() const;
  /// How many updates and deletions there were since the anchor, which moves on.
  std::size_t changes(Data& since) const;
  /// Lists page by page; `visit` hears how many items there were so far.
  void list(const std::function<void(std::size_t)>& visit) const;

 private:
  std::unique_ptr<HostedProvider> provider_;
  std::shared_ptr<VesselEnumerator> enumerator_;
};

}  // namespace mirabel::bench
