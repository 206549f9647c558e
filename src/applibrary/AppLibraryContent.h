#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/URL.h"
#include "identity/AppLibraryRoots.h"
#include "items/LocalAppLibraryItem.h"
#include "platform/ApplicationRegistry.h"

namespace mirabel {

/// The app libraries of one version of a cache. Built by one thread, and not changed once it is
/// shared.
///
/// A library is left out where its folder would be claimed twice: it is the document storage, lies
/// in it or holds it, or the same is true of a library that came before; or another came before
/// under its identifier. So each folder has one identity, and a record can't take over what belongs
/// to another. Its container must be named without "." and "..".
class AppLibraryContent {
 public:
  struct Library {
    BundleProxy record;
    std::shared_ptr<LocalAppLibraryItem> item;
  };

  AppLibraryContent(std::uint64_t token, const URL& documentStorage);

  /// Whether a library of this record may be added.
  [[nodiscard]] bool hasRoomFor(const BundleProxy& record) const;
  /// There must be room for it.
  void add(Library library);
  /// A library there is room for could not be made an item: its folder may be about to come or go.
  void addUnmade() { isComplete_ = false; }
  /// To be called after the last of these.
  void finish(std::vector<BundleProxy> allRecords);

  [[nodiscard]] std::uint64_t versionToken() const { return versionToken_; }
  /// Whether another try with the same records would come to the same.
  [[nodiscard]] bool isComplete() const { return isComplete_; }
  /// As the cache held them, those that were left out among them.
  [[nodiscard]] const std::vector<BundleProxy>& records() const { return records_; }
  /// In the order of the records.
  [[nodiscard]] const std::vector<Library>& libraries() const { return libraries_; }
  /// Null when there is none. As long as this lives.
  [[nodiscard]] const Library* withItemIdentifier(std::string_view identifier) const;
  /// Null when no library has its folder there.
  [[nodiscard]] const Library* atRootURL(const URL& url) const;
  /// The library whose folder holds the URL, at any depth; null for the folder itself.
  [[nodiscard]] const Library* owning(const URL& url) const;
  /// In canonical form, in the order of the records. Never null.
  [[nodiscard]] const AppLibraryRoots::List& rootURLs() const { return rootURLs_; }

 private:
  using Places = std::map<std::string, std::size_t, std::less<>>;
  [[nodiscard]] const Library* at(const Places& places, std::string_view key) const;
  [[nodiscard]] bool isClaimed(const std::string& path) const;

  std::uint64_t versionToken_;
  bool isComplete_ = true;
  std::string documentStorage_;  ///< canonical path
  std::vector<BundleProxy> records_;
  std::vector<Library> libraries_;
  Places appLibrariesByItemIDs_;
  Places bundleProxiesByRootURLs_;  ///< by canonical path
  AppLibraryRoots::List rootURLs_ = std::make_shared<const std::vector<URL>>();
};

/// The folder of an application's documents, as its library's item has it.
[[nodiscard]] URL documentFolderOf(const URL& dataContainer);

/// Whether both records make the same item.
[[nodiscard]] bool makeTheSame(const BundleProxy& a, const BundleProxy& b);

}  // namespace mirabel
