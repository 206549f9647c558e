#pragma once

#include <cstdint>
#include <set>
#include <string>
#include <vector>

#include "linux/volume/IndexContext.h"
#include "linux/volume/MissingNames.h"
#include "linux/volume/TreeScan.h"
#include "linux/watch/FolderWatcher.h"

namespace mirabel {

/// Looks at the places that the kernel's records name, and brings the index in step with what is
/// there. Looking twice, or late, changes nothing. Used under the lock of the index.
class PlaceLooks {
 public:
  PlaceLooks(const IndexContext& context, MissingNames& missing, TreeScan& scan)
      : context_(context), missing_(missing), scan_(scan) {}

  /// Folders that nobody watches yet are added to the scan, names that are not there to those that
  /// are missing. Answers the places whose folder does not lie where the index has it, to be looked
  /// at again after further records.
  /// `pause` is called every so many names.
  [[nodiscard]] Result<LookList::Folders> look(const Transaction& transaction, const Pause& pause,
                                               FolderWatcher& watcher, LookList::Folders folders);
  /// Looks at what was linked, unlinked or written to somewhere under its other names; to be called
  /// when the places were looked at. What does not lie where the index has it is kept for the next
  /// time.
  [[nodiscard]] Result<void> lookAtOthers();
  /// Further objects to be looked at then.
  void addOthers(std::set<std::uint64_t> fileIDs) { others_.merge(fileIDs); }
  [[nodiscard]] bool hasOthers() const { return !others_.empty(); }
  void clear() { others_.clear(); }

 private:
  using Names = LookList::Names;
  struct Folder {
    ObjectRow row;
    std::string path;
    UniqueFd descriptor;
  };
  enum class Presence { here, moved, gone };
  [[nodiscard]] Result<Presence> open(std::uint64_t id, Folder& folder) const;
  [[nodiscard]] Result<Presence> lookInFolder(FolderWatcher& watcher, std::uint64_t id,
                                              const Names& names);
  [[nodiscard]] Result<Presence> lookAtNames(FolderWatcher& watcher, const Folder& folder,
                                             const Names& names);
  /// Looks at names in a folder; those that are there are answered, the others noted as missing.
  [[nodiscard]] Result<std::vector<Sighting>> sightings(const Folder& folder, const Names& names);
  [[nodiscard]] Result<void> endUnlinked(const Folder& folder, const std::string& name,
                                         const Look& look, const ObjectStatus* status);
  [[nodiscard]] Result<void> noteOthers(const Look& look, const ObjectStatus* status);
  /// False when it does not lie where the index has it.
  [[nodiscard]] Result<bool> lookAtObject(const ObjectRow& row);
  [[nodiscard]] Result<bool> lookAtRoot(const std::string& path);
  [[nodiscard]] Result<void> lookAtItself(const Folder& folder, bool attributesChanged);
  void followFolder(const FolderWatcher& watcher, const Folder& folder, const Sighting& sighting);

  const IndexContext& context_;
  MissingNames& missing_;
  TreeScan& scan_;
  std::set<std::uint64_t> others_;  // file IDs
};

}  // namespace mirabel
