#include "host/ItemRecords.h"

#include "items/LocalItem.h"

namespace mirabel {

ItemRecord recordOf(const LocalItem& item) {
  ItemRecord record{item.itemIdentifier(), item.parentItemIdentifier(), item.filename(),
                    item.typeIdentifier()};
  record.documentSize = item.documentSize();
  record.creationDate = item.creationDate();
  record.contentModificationDate = item.contentModificationDate();
  record.childItemCount = item.childItemCount();
  record.capabilities = item.capabilities();
  record.isTrashed = item.isTrashed();
  record.lastUsedDate = item.lastUsedDate();
  record.tagData = item.tagData();
  record.favoriteRank = item.favoriteRank();
  record.fileID = item.fileID();
  record.docID = item.docID();
  record.beaconDomainIdentifier = item.vs_beaconDomainIdentifier();
  record.appContainerBundleIdentifier = item.vs_appContainerBundleIdentifier();
  if (item.isTrashed()) {
    if (const auto& from = item.putBackURL()) record.putBackPath = from->path();
  }
  record.path = item.fileURL().path();
  return record;
}

std::vector<ItemRecord> recordsOf(const std::vector<std::shared_ptr<LocalItem>>& items) {
  std::vector<ItemRecord> records;
  records.reserve(items.size());
  for (const auto& item : items)
    records.push_back(recordOf(*item));
  return records;
}

}  // namespace mirabel
