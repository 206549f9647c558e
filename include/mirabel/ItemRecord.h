#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "mirabel/Values.h"

namespace mirabel {

/// An item as programs get it, from the provider in their process or from the service: the same
/// properties either way, as they were when it was asked for. What is absent, the item does not
/// have. Names and paths are bytes: mostly UTF-8, and not always.
struct ItemRecord {
  /// Of the thing, wherever it is moved: "did=N" a document, "fid=N" a folder, "#BUNDLE" the
  /// documents of an application, or one of mirabel/Containers.h.
  std::string itemIdentifier;
  std::string parentItemIdentifier;
  std::string filename;
  std::string typeIdentifier;            ///< a MIME type; "inode/directory" for a folder
  std::optional<Number> documentSize{};  ///< bytes
  std::optional<Date> creationDate{};
  std::optional<Date> contentModificationDate{};
  std::optional<std::uint16_t> childItemCount{};  ///< of a folder: its entries, at most 65,535
  std::uint64_t capabilities = 0;                 ///< bits of `Capability`
  bool isTrashed = false;
  std::optional<Date> lastUsedDate{};
  std::optional<Data> tagData{};  ///< see mirabel/TagData.h
  std::optional<Number> favoriteRank{};
  std::optional<std::uint64_t> fileID{};
  std::optional<std::uint64_t> docID{};
  std::optional<std::string> beaconDomainIdentifier{};        ///< its domain in the search index
  std::optional<std::string> appContainerBundleIdentifier{};  ///< the application that owns it
  std::optional<std::string> putBackPath{};                   ///< of what is in the trash
  /// Where it lies, absolute; empty for a program that may not know.
  std::string path{};

  friend bool operator==(const ItemRecord&, const ItemRecord&) = default;
};

}  // namespace mirabel
