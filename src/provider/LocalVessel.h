#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "applibrary/MRBAppLibraryManager.h"
#include "enumeration/EnumerationServices.h"
#include "foundation/DispatchGroup.h"
#include "foundation/SerialQueue.h"
#include "foundation/VSPacer.h"
#include "fs/RunningReaders.h"
#include "identity/FileObjectURLs.h"
#include "items/LocalItem.h"
#include "platform/EnumerationObservers.h"
#include "platform/NotificationCenter.h"
#include "platform/Platform.h"
#include "provider/AppThumbnails.h"

namespace mirabel {

/// What following the installed applications needs: references that outlive who gets it.
struct ApplicationServices {
  MRBAppLibraryManager& libraries;
  NotificationCenter& notifications;
  IconService& icons;
  PacerClock& clock = PacerClock::steady();
};

/// The principal object that the host calls. Entry points may be called from any thread; lookups
/// and operations hold no lock and keep no cache.
class LocalVessel {
 public:
  /// Everything passed in outlives the provider. Without `changes` it has no enumerators, and
  /// without `applications` none of the root, and the app libraries are what they are. With them
  /// it has the app libraries refreshed at once, and whenever an application is installed or
  /// removed.
  LocalVessel(const Platform& platform, const AppLibraryRoots& roots,
              const AppLibraryOwners& owners, std::optional<ChangeServices> changes = {},
              std::optional<ApplicationServices> applications = {});
  /// Ends the live updates of its enumerators, and waits until the operations that were started
  /// have reported, and for a refresh of the app libraries: so it must not be called from a
  /// completion handler.
  ~LocalVessel();
  LocalVessel(const LocalVessel&) = delete;
  LocalVessel& operator=(const LocalVessel&) = delete;

  using ItemResult = Result<std::shared_ptr<LocalItem>>;
  /// Completion handlers are called exactly once: on a thread of the host's file operations, or
  /// on the caller's before the call returns.
  using ItemHandler = std::function<void(ItemResult)>;
  using ErrorHandler = std::function<void(std::optional<Error>)>;

  /// Returns when the app libraries are those that the registry told of at or after this call
  /// began, if a refresh was due: for who must not answer before the first one.
  void waitForAppLibraries();

  // Lookups.

  /// Nothing where there is nothing, with a log line.
  [[nodiscard]] std::optional<URL> URLForItemWithPersistentIdentifier(
      std::string_view identifier) const;
  [[nodiscard]] std::optional<URL> _urlForItemWithPersistentIdentifier(
      std::string_view identifier, const std::optional<URL>& place = {}) const;
  [[nodiscard]] std::optional<std::string> persistentIdentifierForItemAtURL(const URL& url) const;
  [[nodiscard]] std::optional<std::string> _persistentIdentifierForItemAt(const URL& url) const;
  /// Error: `LocalVesselError::invalidItemIdentifier`.
  [[nodiscard]] ItemResult itemForIdentifier(std::string_view identifier) const;
  [[nodiscard]] ItemResult _propertiesForItemAtURL(const URL& url) const;

  /// The enumerator of a container, with its live updates started where they are wanted. It must
  /// not outlive the provider. Errors: those of `urlForIdentifier`; POSIX ENOTSUP for a provider
  /// without changes, and for the root, the working set and all directories for one without
  /// applications.
  [[nodiscard]] Result<std::shared_ptr<VesselEnumerator>> enumeratorForContainerItemIdentifier(
      std::string_view identifier, LiveUpdates liveUpdates = LiveUpdates::wanted);

  // Operations on items. A document that has several hard links has several names; `place` says
  // which is meant, where that matters. Each answers with the item as it is afterwards, read anew.
  // Errors: the host's no-such-item error for an identifier that leads nowhere, or a document that
  // does not lie at the place; the host's collision error for a name that is taken, and the file
  // error `fileExists` where what is in the way is no item; the file error `writeNotPermitted` for
  // a place in the root container, which holds the app libraries; else those of `FileOperations`.
  // Where the change was made and its item cannot be built, the error is the lookup's, and the
  // change stays.

  /// Copies what lies at `source`, anywhere, into the parent.
  void importDocumentAtURL(const URL& source, std::string_view toParentItemIdentifier,
                           ItemHandler completionHandler);
  void createDirectoryWithName(std::string_view name, std::string_view inParentItemIdentifier,
                               ItemHandler completionHandler);
  void renameItemWithIdentifier(std::string_view identifier, std::string_view toName,
                                ItemHandler completionHandler,
                                const std::optional<URL>& place = {});
  /// Where parent and item are both unknown, the error names the parent.
  void reparentItemWithIdentifier(std::string_view identifier,
                                  std::string_view toParentItemWithIdentifier,
                                  std::optional<std::string> newName, ItemHandler completionHandler,
                                  const std::optional<URL>& place = {});
  /// A folder with everything in it.
  void deleteItemWithIdentifier(std::string_view identifier, ErrorHandler completionHandler,
                                const std::optional<URL>& place = {});
  /// The document folder of an application. Error: invalid parameter `bundleIdentifier`.
  void _defaultApplicationContainerForBundleIdentifier(std::string_view bundleIdentifier,
                                                       const ItemHandler& completionHandler) const;

  // Trash.

  /// Moves the item into the trash folder of its documents, and notes on it when that was and,
  /// where it lies in the document folder of an application, where it came from. These notes may
  /// fail unheard. Error: invalid parameter `sourceURL` where no folder "Documents" holds it.
  void trashItemWithIdentifier(std::string_view identifier, ItemHandler completionHandler,
                               const std::optional<URL>& place = {});
  /// Moves the item out of the trash: into the parent, if one is given and is not in the trash
  /// itself; else to where it came from; else to the top of its application's document folder. It
  /// gets `formerName`, or else the name that it had there, or else keeps its own; where that is
  /// taken, one made from it. Documents of no application have no note of where they came from:
  /// a host that wants them to go back remembers parent and name. Error: invalid parameter
  /// `itemIdentifier` for an item that is not in the trash, or that has no place to go.
  void untrashItemWithIdentifier(std::string_view identifier,
                                 const std::optional<std::string>& toParentItemIdentifier,
                                 ItemHandler completionHandler,
                                 std::optional<std::string> formerName = {},
                                 const std::optional<URL>& place = {});
  /// The folder of a parent that may be given to that; nothing where it is unknown or in the trash.
  [[nodiscard]] std::optional<URL> untrashParent(std::string_view identifier) const;
  /// Deletes for good what was trashed before the date. What has no date of its own, because
  /// another program put it there, gets the current one, and so goes one period later. The trash
  /// is walked before the call returns, on the caller's thread, which waits while many deletions
  /// are under way: so it must not be made from a completion handler. The handler is called on a
  /// queue of its own once all deletions have ended, and never with an error: what could not be
  /// deleted is logged, and qualifies the next time again.
  void _removeTrashedItemsOlderThanDate(const Date& date, ErrorHandler completionHandler);

  /// What lies directly in a trash folder, hidden names among it.
  struct TrashedEntry {
    URL url;
    /// Nothing where it has none; an error for one that is no date.
    Result<std::optional<Date>> trashDate;
  };
  /// Calls the visitor for everything in the trash folders of the app libraries and, last, of the
  /// document storage, before it returns. A folder that can't be read is passed over. Memory does
  /// not grow with the number of entries.
  void forEachTrashedEntry(const std::function<void(const TrashedEntry&)>& visitor) const;

  // The user's metadata, each kept in an attribute of the file; nothing given clears it. A write
  // that fails leaves the attribute as it was, with a POSIX error.

  void setLastUsedDate(const std::optional<Date>& date, std::string_view forItemIdentifier,
                       const ItemHandler& completionHandler);
  /// Tags in the host's encoding, see mirabel/TagData.h. Anything else is an empty list of tags.
  void setTagData(const std::optional<Data>& tagData, std::string_view forItemIdentifier,
                  const ItemHandler& completionHandler);
  void setFavoriteRank(const std::optional<Number>& rank, std::string_view forItemIdentifier,
                       const ItemHandler& completionHandler);

  // Pictures of the app libraries, see `AppThumbnails`. Without applications nothing has one.

  void fetchThumbnailsForItemIdentifiers(
      const std::vector<std::string>& identifiers, const ThumbnailSize& requestedSize,
      const AppThumbnails::PerThumbnailHandler& perThumbnailCompletionHandler,
      const AppThumbnails::CompletionHandler& completionHandler) const;
  void fetchThumbnailsForItemIdentifiers(
      const std::vector<std::string>& identifiers, const ThumbnailSize& requestedSize,
      const AppThumbnails::PerTypedThumbnailHandler& perThumbnailCompletionHandlerWithType,
      const AppThumbnails::CompletionHandler& completionHandler) const;

  /// All content is local: these complete at once, without an error.
  void providePlaceholderAtURL(const URL& url, const ErrorHandler& completionHandler) const;
  void startProvidingItemAtURL(const URL& url, const ErrorHandler& completionHandler) const;
  void stopProvidingItemAtURL(const URL& url) const;
  void itemChangedAtURL(const URL& url) const;

  /// Lookups that others share; a place is as for the operations. `urlForIdentifier` fails with the
  /// host's no-such-item error; `lookUpItem` logs nothing of its own. Items refer to this provider
  /// and to what was passed to it until their `putBackURL` was asked for.
  [[nodiscard]] Result<URL> urlForIdentifier(std::string_view identifier,
                                             const std::optional<URL>& place = {}) const;
  [[nodiscard]] std::shared_ptr<LocalItem> lookUpItem(std::string_view identifier,
                                                      const std::optional<URL>& place = {}) const;
  [[nodiscard]] const ItemContext& itemContext() const { return context_; }
  [[nodiscard]] const Platform& platform() const { return platform_; }
  [[nodiscard]] const FileObjectURLs& identity() const { return identity_; }

 private:
  [[nodiscard]] std::shared_ptr<LocalItem> temporaryLocalFolder() const;
  [[nodiscard]] std::optional<std::string> identifierForURL(const URL& url) const;
  void startUp();
  void shutDown();
  void refreshAppLibraries();

  using AfterSuccess = std::function<void(const URL&)>;
  [[nodiscard]] FileOperations::URLHandler completion(ItemHandler completionHandler,
                                                      AfterSuccess afterSuccess = {});
  [[nodiscard]] ItemResult itemOfOutcome(const Result<URL>& outcome,
                                         const AfterSuccess& afterSuccess) const;
  [[nodiscard]] Error mappedError(const Error& error) const;
  [[nodiscard]] std::optional<Error> writeAttribute(std::string_view name,
                                                    const std::optional<Data>& value,
                                                    const URL& url) const;

  void setTrashDate(const URL& url, const std::optional<Date>& date) const;
  void setPutBackString(const URL& preTrashURL, const URL& trashedURL) const;
  [[nodiscard]] std::optional<URL> untrashDestination(
      const LocalItem& item, const std::optional<std::string>& parentIdentifier) const;
  [[nodiscard]] std::optional<URL> putBackFolder(const LocalItem& item) const;
  [[nodiscard]] std::optional<URL> appLibraryRoot(const LocalItem& item) const;

  struct Removals;
  [[nodiscard]] Result<std::optional<Date>> trashDateOf(const URL& url) const;
  void removeIfTrashedBefore(const Date& date, const TrashedEntry& entry,
                             const std::shared_ptr<Removals>& removals);
  void deleteTrashedItem(std::string_view identifier, const URL& entry,
                         ErrorHandler completionHandler);
  void deleteItem(const URL& item, ErrorHandler completionHandler);

  [[nodiscard]] ItemResult storeLastUsedDate(const std::optional<Date>& date,
                                             std::string_view identifier) const;
  [[nodiscard]] ItemResult storeTagData(const std::optional<Data>& tagData,
                                        std::string_view identifier) const;
  [[nodiscard]] ItemResult storeFavoriteRank(const std::optional<Number>& rank,
                                             std::string_view identifier) const;

  Platform platform_;
  const AppLibraryRoots& roots_;
  FileObjectURLs identity_;
  ItemContext context_;
  std::optional<ChangeServices> changes_;
  OpenWalks walks_;
  RunningReaders liveUpdates_;
  DispatchGroup underway_;  ///< operations that have not reported yet

  /// The observer of the registry's notifications, so that those who post them never hold the
  /// provider itself.
  struct InstalledAppsProxy;
  std::optional<ApplicationServices> applications_;
  std::optional<AppThumbnails> thumbnails_;
  SerialQueue appRefreshQueue_{"mirabel.app-refresh.queue"};
  std::shared_ptr<InstalledAppsProxy> installedAppsProxy_;
  std::unique_ptr<VSPacer> appRefreshPacer_;
};

}  // namespace mirabel
