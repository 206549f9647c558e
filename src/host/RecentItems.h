#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "host/ItemLookup.h"
#include "linux/files/FileStamp.h"
#include "mirabel/Error.h"
#include "mirabel/ItemRecord.h"

namespace mirabel {

class VolumeIndex;

/// Items as they were when they were looked up last, for whoever asks for them again and again: a
/// record is handed out as long as the kernel has the very same file at its place and the index has
/// written nothing since. So it is never older than a look at the disk would be. Documents and
/// plain folders of the document storage only, for what is told of other items may hang on more
/// than their own file. Any thread may call it.
class RecentItems {
 public:
  RecentItems(const ItemLookup& lookup, VolumeIndex& index, std::string storage)
      : lookup_(lookup), index_(index), storage_(std::move(storage)) {}

  /// The item, if that can be told without a look-up, or else null; waits for no disk and no lock
  /// of the index.
  [[nodiscard]] std::shared_ptr<const ItemRecord> recall(std::string_view identifier);
  /// The item, looked up where it has to be. Errors: those of `ItemLookup::byIdentifier`.
  [[nodiscard]] Result<ItemRecord> item(std::string_view identifier);

 private:
  struct Known {
    ItemRecord record;
    std::optional<FileStamp> stamp{};  ///< absent: only the place is known
    std::uint64_t commits = 0;         ///< of the index, when it was looked up
  };
  [[nodiscard]] std::shared_ptr<const Known> known(std::string_view identifier);
  [[nodiscard]] bool isToBeKept(const ItemRecord& record) const;
  void keep(std::string_view identifier, std::shared_ptr<const Known> item);

  const ItemLookup& lookup_;
  VolumeIndex& index_;
  const std::string storage_;
  std::mutex mutex_;
  std::map<std::string, std::shared_ptr<const Known>, std::less<>> items_;
};

}  // namespace mirabel
