#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "applibrary/AppLibraryContent.h"
#include "applibrary/LocalAppLibraryCache.h"
#include "foundation/SerialQueue.h"
#include "identity/AppLibraryRoots.h"
#include "identity/FileObjectURLs.h"
#include "items/AppLibraryOwners.h"
#include "platform/EnumerationObservers.h"
#include "platform/Platform.h"

namespace mirabel {

/// Holds the app libraries of one cache in memory, and follows the main cache when it is told to.
/// Questions may be asked from any thread, and get their answer from one version; upgrades come
/// one at a time. It outlives the items that it makes.
class LocalAppLibraryManager final : public AppLibraryRoots, public AppLibraryOwners {
 public:
  /// Starts with what the cache of `source` holds. What `platform` refers to, and `caches`, outlive
  /// the manager.
  LocalAppLibraryManager(const Platform& platform, AppLibraryCaches& caches,
                         LocalAppLibraryCacheSource source);

  /// Takes over what the main cache holds, if that has another version than this or a library could
  /// not be made the last time, and answers whether this changed. With an observer all app
  /// libraries are built anew and reported to it, and what is gone as deleted; without one, those
  /// whose record is the same stay as they are. What was indexed of those that are gone is deleted,
  /// for which the host is waited for without a limit. The questions below get the new answers once
  /// all that is done.
  bool upgradeFromMainCache(VesselChangeObserver* observer = nullptr);

  /// Where it started from.
  [[nodiscard]] LocalAppLibraryCacheSource cacheSource() const { return cacheSource_; }
  /// The version of the main cache whose content this holds.
  [[nodiscard]] std::uint64_t versionToken() const;
  /// Records and token as they belong together, for the working-set cache.
  [[nodiscard]] LocalAppLibraryCache::Content content() const;

  /// Built anew, with the dates, count and display name of now, in the order of the records; one
  /// whose folder is gone is left out, one whose folder can't be read now is as it was.
  [[nodiscard]] std::vector<std::shared_ptr<LocalItem>> appLibraries() const;
  /// The same for one; null for an identifier that no app library has, or where it is gone.
  [[nodiscard]] std::shared_ptr<LocalAppLibraryItem> appLibraryWithItemIdentifier(
      std::string_view identifier) const;
  /// Folders as they can be opened, with the records that they belong to, in their order.
  [[nodiscard]] std::vector<std::pair<URL, BundleProxy>> foldersAndRecords() const;
  /// The record of the library whose folder this is.
  [[nodiscard]] std::optional<BundleProxy> bundleProxyWithRootURL(const URL& url) const;

  [[nodiscard]] List rootURLsForAppLibraries() const override;
  [[nodiscard]] std::vector<URL> folders() const override;
  [[nodiscard]] std::optional<BundleProxy> applicationOwning(const URL& url) const override;

  /// One line for logs.
  [[nodiscard]] std::string description() const;

 private:
  using Version = std::shared_ptr<const AppLibraryContent>;
  enum class Reuse { none, sameRecords };

  [[nodiscard]] Version current() const;
  void install(Version version);
  [[nodiscard]] Version built(LocalAppLibraryCache::Content content,
                              const AppLibraryContent& former, Reuse reuse) const;
  void learnFolders(const std::vector<BundleProxy>& records, const AppLibraryContent& former) const;
  [[nodiscard]] std::shared_ptr<LocalAppLibraryItem> itemOf(const BundleProxy& record,
                                                            const AppLibraryContent& former,
                                                            Reuse reuse) const;
  /// `former` where the item can't be built although its folder is there.
  [[nodiscard]] std::shared_ptr<LocalAppLibraryItem> itemOfNow(
      const BundleProxy& record, const std::shared_ptr<LocalAppLibraryItem>& former) const;
  [[nodiscard]] std::shared_ptr<LocalAppLibraryItem> made(const BundleProxy& record) const;
  [[nodiscard]] bool isGone(const URL& folder) const;
  [[nodiscard]] bool isUnmade(const BundleProxy& record, const AppLibraryContent& next) const;
  void report(const AppLibraryContent& former, const AppLibraryContent& next,
              VesselChangeObserver* observer) const;

  Platform platform_;
  AppLibraryCaches& caches_;
  LocalAppLibraryCacheSource cacheSource_;
  FileObjectURLs identity_;
  SerialQueue queue_{"mirabel.app-library-manager"};
  /// Replaced on the queue. Who asks takes the pointer under a lock of its own: the roots are asked
  /// for with every identifier, and must not queue up behind each other.
  mutable std::mutex mutex_;
  Version current_;
};

}  // namespace mirabel
