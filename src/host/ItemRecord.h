#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "foundation/Values.h"

namespace mirabel {

class LocalItem;

/// An item as programs get it, from the provider in their process or from the service: the same
/// properties either way, as they were when it was asked for. The fields are those of `LocalItem`.
struct ItemRecord {
  std::string itemIdentifier;
  std::string parentItemIdentifier;
  std::string filename;
  std::string typeIdentifier;
  std::optional<Number> documentSize{};
  std::optional<Date> creationDate{};
  std::optional<Date> contentModificationDate{};
  std::optional<std::uint16_t> childItemCount{};
  std::uint64_t capabilities = 0;
  bool isTrashed = false;
  std::optional<Date> lastUsedDate{};
  std::optional<Data> tagData{};
  std::optional<Number> favoriteRank{};
  std::optional<std::uint64_t> fileID{};
  std::optional<std::uint64_t> docID{};
  std::optional<std::string> beaconDomainIdentifier{};
  std::optional<std::string> appContainerBundleIdentifier{};
  std::optional<std::string> putBackPath{};  ///< of what is in the trash
  /// Where it lies, absolute; empty for a program that may not know.
  std::string path{};

  friend bool operator==(const ItemRecord&, const ItemRecord&) = default;
};

[[nodiscard]] ItemRecord recordOf(const LocalItem& item);
[[nodiscard]] std::vector<ItemRecord> recordsOf(
    const std::vector<std::shared_ptr<LocalItem>>& items);

}  // namespace mirabel
