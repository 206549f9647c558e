#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "foundation/Error.h"
#include "linux/kernel/MonitoredRoots.h"
#include "linux/volume/ChangeRecorder.h"
#include "linux/volume/IdentityStore.h"
#include "linux/volume/Learner.h"

namespace mirabel {

/// Compares the index with everything below the roots, by a look at every entry, and takes the
/// differences in: what happened while nobody watched becomes ordinary events. Folders that can't
/// be read hold nothing. Used under the lock of the index.
class Reconciler {
 public:
  /// Runs a piece of the work in a transaction of its own.
  using Transaction = std::function<Result<void>(const std::function<Result<void>()>&)>;

  Reconciler(Learner& learner, IdentityStore& store, ChangeRecorder& recorder,
             const MonitoredRoots& roots, std::uint64_t device,
             std::function<bool(std::string_view)> isPackageName);

  /// When it returns without an error, the index shows what the disk showed at some moment since
  /// the call, for each entry that did not change meanwhile. An error leaves what was taken in.
  [[nodiscard]] Result<void> run(const Transaction& transaction);

 private:
  struct Folder {
    std::string path;
    std::uint64_t id;
  };
  /// A name of the index that the disk does not have any more.
  struct Missing {
    std::uint64_t slot;
    Location location;
    bool isLink;
  };
  [[nodiscard]] Result<void> reconcileFolder(const Folder& folder);
  [[nodiscard]] Result<std::uint64_t> takeIn(const Folder& folder, int descriptor,
                                             std::vector<Sighting>& batch);
  [[nodiscard]] Result<void> findMissing(const Folder& folder);
  [[nodiscard]] Result<void> settle(const Missing& missing);

  Learner& learner_;
  IdentityStore& store_;
  ChangeRecorder& recorder_;
  const MonitoredRoots& roots_;
  std::uint64_t device_;
  std::function<bool(std::string_view)> isPackageName_;
  std::vector<Folder> pending_;
  std::vector<Missing> missing_;
};

}  // namespace mirabel
