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
  std::string parentItemIdentifier;      ///< of the folder that it lies in
  std::string filename;                  ///< of an app library, the application's name
  std::string typeIdentifier;            ///< a MIME type; "inode/directory" for a folder
  std::optional<Number> documentSize{};  ///< bytes
  std::optional<Date> creationDate{};
  std::optional<Date> contentModificationDate{};
  /// Of a folder: its entries, hidden ones among them; 65,533 stands for that many and more.
  std::optional<std::uint16_t> childItemCount{};
  std::uint64_t capabilities = 0;  ///< bits of `Capability`
  bool isTrashed = false;
  std::optional<Date> lastUsedDate{};
  std::optional<Data> tagData{};          ///< see mirabel/TagData.h
  std::optional<Number> favoriteRank{};   ///< the lowest comes first
  std::optional<std::uint64_t> fileID{};  ///< of the object; another one after a save by renaming
  std::optional<std::uint64_t> docID{};   ///< the N of "did=N"
  std::optional<std::string> beaconDomainIdentifier{};        ///< its domain in the search index
  std::optional<std::string> appContainerBundleIdentifier{};  ///< the application that owns it
  /// Of what is in the trash of an app library: the absolute path that it came from. Where a
  /// document was trashed from is kept elsewhere, and found when it is restored.
  std::optional<std::string> putBackPath{};
  /// Where it lies, absolute; empty for a program that may not know.
  std::string path{};

  friend bool operator==(const ItemRecord&, const ItemRecord&) = default;
};

}  // namespace mirabel
