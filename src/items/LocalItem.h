#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/URL.h"
#include "identity/FileObjectURLs.h"
#include "items/AppLibraryOwners.h"
#include "mirabel/Capability.h"
#include "mirabel/Values.h"
#include "platform/Platform.h"

namespace mirabel {

/// The type of a folder that is no package.
inline constexpr std::string_view folderTypeIdentifier = "inode/directory";

/// What building an item needs; references that outlive every item.
struct ItemContext {
  const Platform& platform;
  const FileObjectURLs& identity;
  const AppLibraryOwners& owners;
};

/// Overrides for an item whose identity does not come from its file.
struct ItemOverrides {
  std::optional<std::string> customItemID;
  std::optional<std::string> customParentItemID;
  std::optional<std::string> customFilename;
  bool hasBeaconDomainIdentifier = true;
  std::optional<std::string> bundleIdentifier;
};

/// The record that the host gets for a file or folder: a snapshot taken when it is built. Not
/// shared between threads while `putBackURL` is first asked for or the child count is set.
class LocalItem {
 public:
  /// Nothing, with an error line, when the identifier, the parent's identifier, the name or the
  /// type cannot be had, and for anything named "Inbox".
  static std::shared_ptr<LocalItem> create(const ItemContext& context, const URL& url,
                                           ItemOverrides overrides = {});
  virtual ~LocalItem() = default;

  const std::string& itemIdentifier() const { return itemIdentifier_; }
  const std::string& parentItemIdentifier() const { return parentItemIdentifier_; }
  const std::string& itemIdentifierAsString() const { return itemIdentifier_; }
  const std::string& parentItemIdentifierAsString() const { return parentItemIdentifier_; }
  const std::string& filename() const { return filename_; }
  const std::string& typeIdentifier() const { return typeIdentifier_; }
  const std::optional<Number>& documentSize() const { return documentSize_; }
  const std::optional<Date>& creationDate() const { return creationDate_; }
  const std::optional<Date>& contentModificationDate() const { return contentModificationDate_; }
  /// Number of entries of a folder; absent for anything else.
  std::optional<std::uint16_t> childItemCount() const { return childItemCount_; }
  void setChildItemCount(std::optional<std::uint16_t> count) { childItemCount_ = count; }
  std::uint64_t capabilities() const { return capabilities_; }
  const std::optional<Data>& versionIdentifier() const { return versionIdentifier_; }
  bool isTrashed() const { return isTrashed_; }
  const std::optional<Date>& lastUsedDate() const { return lastUsedDate_; }
  /// The host's encoding of the tags, see mirabel/TagData.h; empty for an attribute that holds
  /// none.
  const std::optional<Data>& tagData() const { return tagData_; }
  const std::optional<Number>& favoriteRank() const { return favoriteRank_; }
  std::optional<std::uint64_t> fileID() const { return fileID_; }
  std::optional<std::uint64_t> docID() const { return docID_; }
  const URL& fileURL() const { return fileURL_; }
  const URL& url() const { return fileURL_; }
  const std::optional<std::string>& vs_beaconDomainIdentifier() const { return beaconDomain_; }
  const std::optional<std::string>& vs_appContainerBundleIdentifier() const {
    return appContainerBundleIdentifier_;
  }
  bool vs_isUbiquitous() const { return false; }
  virtual bool vs_isContainer() const;

  // Everything is local and nobody shares it.
  bool isUploaded() const { return true; }
  bool isUploading() const { return false; }
  bool isDownloaded() const { return true; }
  bool isDownloading() const { return false; }
  bool isMostRecentVersionDownloaded() const { return true; }
  bool isShared() const { return false; }

  /// Where the item came from before it was trashed; read from its attribute on first access.
  /// Always a place below the document folder of the application that owns the item.
  const std::optional<URL>& putBackURL() const;

  /// One line for logs: class, identifier, parent, name.
  virtual std::string description() const;

 protected:
  LocalItem(const ItemContext& context, URL url);
  /// Fills every property in the order that the messages promise; false when it failed.
  [[nodiscard]] bool build(ItemOverrides overrides);
  [[nodiscard]] std::string describe(std::string_view className) const;

  ItemContext context_;

 private:
  bool buildIdentity(ItemOverrides& overrides);
  bool buildName(ItemOverrides& overrides);
  void buildContent();
  void buildUserMetadata();
  void buildStatus();
  void buildOwner(ItemOverrides& overrides);
  [[nodiscard]] bool isAppLibrary() const { return itemIdentifier_.starts_with('#'); }
  [[nodiscard]] std::uint64_t computedCapabilities() const;
  [[nodiscard]] std::optional<Number> computedSize(bool isPackage) const;
  [[nodiscard]] std::optional<URL> computedPutBackURL() const;

  URL fileURL_;
  std::string itemIdentifier_;
  std::string parentItemIdentifier_;
  std::string filename_;
  std::string typeIdentifier_;
  std::optional<Number> documentSize_;
  std::optional<Date> creationDate_;
  std::optional<Date> contentModificationDate_;
  std::optional<std::uint16_t> childItemCount_;
  std::uint64_t capabilities_ = 0;
  std::optional<Data> versionIdentifier_;
  bool isTrashed_ = false;
  std::optional<Date> lastUsedDate_;
  std::optional<Data> tagData_;
  std::optional<Number> favoriteRank_;
  std::optional<std::uint64_t> fileID_;
  std::optional<std::uint64_t> docID_;
  std::optional<std::string> beaconDomain_;
  std::optional<std::string> appContainerBundleIdentifier_;
  mutable bool putBackComputed_ = false;
  mutable std::optional<URL> putBackURL_;
};

}  // namespace mirabel
