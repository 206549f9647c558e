#include "host/RecentItems.h"

#include <utility>

#include "host/ItemRecords.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel {
namespace {

// A few megabytes at most. What is asked for again is asked for soon.
constexpr std::size_t mostItems = 2048;
constexpr std::size_t mostTagData = 1024;

}  // namespace

std::shared_ptr<const ItemRecord> RecentItems::recall(std::string_view identifier) {
  const auto item = known(identifier);
  if (!item || !item->stamp || item->commits != index_.commits()) return nullptr;
  const auto now = stampOf(item->record.path);
  if (!now || !now->isSameAs(*item->stamp)) return nullptr;
  return {item, &item->record};
}

// A record is good for a stamp when that was the same before the look-up and after it. Before it
// the place is known from the look-up before only, so an item is kept from its second time on.
Result<ItemRecord> RecentItems::item(std::string_view identifier) {
  if (const auto record = recall(identifier)) return *record;
  const std::uint64_t commits = index_.commits();
  const auto former = known(identifier);
  const auto before = former ? stampOf(former->record.path) : std::nullopt;
  const auto found = lookup_.byIdentifier(identifier);
  if (!found) return fail(found.error());
  ItemRecord record = recordOf(**found);
  if (record.itemIdentifier != identifier || !isToBeKept(record)) return record;
  std::optional<FileStamp> stamp;
  // Two look-ups agree: what one could not read for a passing reason is not remembered as absent.
  if (before && before->isSettled() && former->record == record && record.fileID) {
    const auto after = stampOf(record.path);
    const bool isPackage = before->file.kind == FileKind::folder && !record.childItemCount;
    if (after && after->isSameAs(*before) && !isPackage) stamp = before;
  }
  keep(identifier, std::make_shared<const Known>(Known{record, stamp, commits}));
  return record;
}

std::shared_ptr<const RecentItems::Known> RecentItems::known(std::string_view identifier) {
  const std::lock_guard lock(mutex_);
  const auto found = items_.find(identifier);
  return found == items_.end() ? nullptr : found->second;
}

// Where a trashed item came from, and which application owns it, is not the file's to say.
bool RecentItems::isToBeKept(const ItemRecord& record) const {
  return !record.isTrashed && !record.beaconDomainIdentifier &&
         !record.appContainerBundleIdentifier && record.path.starts_with(storage_ + "/") &&
         (!record.tagData || record.tagData->size() <= mostTagData);
}

void RecentItems::keep(std::string_view identifier, std::shared_ptr<const Known> item) {
  const std::lock_guard lock(mutex_);
  if (items_.size() >= mostItems) items_.clear();
  items_.insert_or_assign(std::string(identifier), std::move(item));
}

}  // namespace mirabel
