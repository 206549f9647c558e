#pragma once

#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <utility>

#include "linux/kernel/MonitoredRoots.h"
#include "linux/volume/EventJournal.h"
#include "linux/volume/IdentityStore.h"
#include "linux/volume/IndexedPaths.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Writes what the index learns into the history, as records that say where to look. Does nothing
/// before the history is active. Used under the lock of the index, inside its transactions.
class ChangeRecorder {
 public:
  ChangeRecorder(IdentityStore& store, EventJournal& journal, const IndexedPaths& paths,
                 const MonitoredRoots& roots, std::function<bool(std::string_view)> isPackageName);

  [[nodiscard]] bool isActive() const { return journal_.isActive(); }

  /// Something is to be looked at under that name; the object there is, or was, the row's.
  [[nodiscard]] Result<void> changed(const ObjectRow& row, const Location& location,
                                     bool changedKind = false);
  /// The object got another name. What lies in it is told too where that comes into sight, leaves
  /// it, or crosses into or out of the trash or another root; and otherwise what is hard-linked in
  /// it, for which of its names a file is shown under hangs on the paths of all.
  [[nodiscard]] Result<void> moved(const ObjectRow& row, const std::optional<Location>& from,
                                   const Location& to, bool changedKind = false);
  [[nodiscard]] Result<void> handedOn(std::uint32_t documentID, std::uint64_t source,
                                      std::uint64_t destination);
  /// The object is nowhere: so is its document, if it still has it, and everything in it, which is
  /// detached. The row itself is left to the caller.
  [[nodiscard]] Result<void> gone(const ObjectRow& row, const Location& from);
  /// Notes that the object lost a name, and goes on under another: what was last done to it may
  /// have been heard of under the lost name alone, so that it has to be looked at.
  void noteSurvivor(std::uint64_t fileID) { survivors_.insert(fileID); }
  [[nodiscard]] std::set<std::uint64_t> takeSurvivors() { return std::exchange(survivors_, {}); }
  enum class Which { everything, hardLinked };
  /// Records for what is in a folder, as it lies now.
  [[nodiscard]] Result<void> contents(std::uint64_t folder, Which which = Which::everything);

 private:
  /// What decides whether a path's items are shown, and how.
  struct Sight {
    std::size_t root = 0;
    bool isBelowRoot = false;
    bool isHidden = false;
    bool isTrashed = false;
    bool isInPackage = false;
    friend bool operator==(const Sight&, const Sight&) = default;
  };
  [[nodiscard]] Sight sightOf(const std::string& path) const;
  [[nodiscard]] Result<void> append(const ObjectRow& row, const Location& location,
                                    std::string path, bool changedKind);
  [[nodiscard]] Result<void> goneContents(std::uint64_t folder, std::string path);
  /// Further names in a folder that is gone, of objects that lie elsewhere.
  [[nodiscard]] Result<void> goneLinks(std::uint64_t folder, const std::string& path);
  /// `folders` are those that are gone.
  [[nodiscard]] Result<void> goneThing(ObjectRow thing,
                                       const std::map<std::uint64_t, std::string>& folders);

  IdentityStore& store_;
  EventJournal& journal_;
  const IndexedPaths& paths_;
  const MonitoredRoots& roots_;
  std::function<bool(std::string_view)> isPackageName_;
  std::set<std::uint64_t> survivors_;
};

}  // namespace mirabel
