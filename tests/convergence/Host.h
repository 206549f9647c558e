#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "host/HostedProvider.h"
#include "linux/FaultyWatcher.h"
#include "mirabel/ItemRecord.h"

namespace mirabel::testing {

/// What a client keeps of one item: every property that it is told.
struct HeldItem {
  std::string parent;
  std::string filename;
  std::string text;  ///< the other properties, in one line
  friend bool operator==(const HeldItem&, const HeldItem&) = default;
};

/// A client's copy of one container, with the anchor that it is good for.
struct Replica {
  std::string container;
  std::map<std::string, HeldItem> items;
  Data anchor;
  int restarts = 0;
};

/// The provider of a home on real disk, with a host that lists and asks for changes as the
/// protocol has it. Destroying it closes everything, as a process that ends does.
class Host {
 public:
  explicit Host(const std::string& home);

  /// The kernel's queue loses what it holds and what comes before it is read next.
  void dropRecords() { faults_->loses = true; }

  /// Looks which applications are installed, as it does when it starts.
  void refreshAppLibraries();

  /// Takes an anchor, then lists.
  [[nodiscard]] Replica list(const std::string& container);
  /// Asks for changes until there are no more, and applies them; lists again when told to start
  /// over.
  void catchUp(Replica& replica);
  [[nodiscard]] std::string identifierOf(const std::string& path) const;

 private:
  std::shared_ptr<WatcherFaults> faults_ = std::make_shared<WatcherFaults>();
  std::shared_ptr<VesselEnumerator> enumerator(const std::string& container);
  static void apply(Replica& replica, const ItemRecord& item);

  std::unique_ptr<HostedProvider> provider_;
  /// Those of the root, the working set and all directories, which know what was told last.
  std::map<std::string, std::shared_ptr<VesselEnumerator>> enumerators_;
};

}  // namespace mirabel::testing
