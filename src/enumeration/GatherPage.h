#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "fs/FSDirectoryWalk.h"
#include "fs/HiddenTest.h"
#include "fs/ItemLook.h"
#include "fs/LinkNames.h"
#include "mirabel/Error.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// What a listing walks for a container.
struct GatherScope {
  std::string container;
  std::vector<URL> urls;  ///< the monitored folders, not empty; of the root, the first is listed

  [[nodiscard]] bool isWorkingSet() const;
  [[nodiscard]] bool isAllDirectories() const;
  /// An ordinary container is one folder, one level deep.
  [[nodiscard]] bool isRecursive() const { return isWorkingSet() || isAllDirectories(); }
  /// The folders to walk, in order, with resource caches of their own: for the working set the
  /// trash of each folder after all folders.
  [[nodiscard]] std::vector<URL> roots() const;
};

/// Makes the items of one page. Used for one page, by one thread.
class GatherPage {
 public:
  static constexpr std::uint64_t limit = 200;

  /// What is passed by reference outlives the page.
  GatherPage(const ItemContext& context, const GatherScope& scope);

  /// A walk from the start of the listing.
  [[nodiscard]] std::unique_ptr<FSDirectoryWalk> makeWalk() const;
  /// Takes up to `limit` entries from the walk and makes items of those that are shown, looked at
  /// in one go. `syncAnchorExpired` when a folder was moved while it was walked; other errors are
  /// the walk's, or say that something that is there cannot be told.
  [[nodiscard]] Result<void> gather(FSDirectoryWalk& walk);

  [[nodiscard]] std::uint64_t entryCount() const { return entryCount_; }
  [[nodiscard]] const VesselItems& items() const { return items_; }

 private:
  /// Null: none was there to be made.
  [[nodiscard]] Result<void> addItem(const URL& url, std::shared_ptr<LocalItem> item);
  [[nodiscard]] Result<bool> isPassedOver(const URL& url);
  [[nodiscard]] bool hasMoved(const URL& folder);

  const ItemContext& context_;
  const GatherScope& scope_;
  HiddenTest hiddenTest_;
  ItemLook look_;
  LinkNames names_;
  std::uint64_t entryCount_ = 0;
  VesselItems items_;
  std::optional<URL> checkedFolder_;  // the one that `hasMoved` was last asked about
};

}  // namespace mirabel
