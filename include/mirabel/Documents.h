#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "mirabel/Containers.h"
#include "mirabel/Error.h"
#include "mirabel/Export.h"
#include "mirabel/ItemRecord.h"
#include "mirabel/SearchQuery.h"
#include "mirabel/StatusReport.h"
#include "mirabel/UniqueFd.h"
#include "mirabel/Values.h"

namespace mirabel {

/// Up to 200 items.
struct ItemPage {
  std::vector<ItemRecord> items;
  /// What to ask for next; nothing when the listing is complete. Outlives the process.
  std::optional<Data> nextPage;
};

/// What has changed: things as they are now, and the identifiers of those that have gone. Either
/// may name what the client had been told already, or never knew. None is in both. Of a folder, or
/// of the root, `updated` also names things that lie elsewhere, such as what has left it: a copy of
/// one holds what has it as `parentItemIdentifier` and nothing else, so that an update with another
/// parent takes a held item away. `path` is of the moment: when a folder is renamed, what lies in
/// it is not told.
struct ItemChanges {
  std::vector<ItemRecord> updated;
  std::vector<std::string> deleted;
  Data anchor;              ///< where to ask on from; outlives the process
  bool moreComing = false;  ///< ask again at once
};

/// A container that is listed and followed by one client. Not shared between threads.
class MIRABEL_EXPORT DocumentContainer {
 public:
  virtual ~DocumentContainer() = default;
  /// The page that a cursor stands for; `VesselInitialPageSortedByName` begins. A cursor is good in
  /// other processes and after a crash, until something that lies there is deleted or the app
  /// libraries change. Errors:
  /// `syncAnchorExpired` for a cursor that can't be used any more: list again from the beginning;
  /// `VesselErrorCode::noSuchItem` for a container that is gone.
  [[nodiscard]] virtual Result<ItemPage> items(const Data& page) = 0;
  /// A batch of what has changed since the anchor, 100 things at most. An anchor is good in other
  /// processes and after a crash. Errors: `syncAnchorExpired` for one that can't be used any more:
  /// take a new anchor and list again; `VesselErrorCode::noSuchItem` for a container that is gone.
  [[nodiscard]] virtual Result<ItemChanges> changes(const Data& anchor) = 0;
  /// The moment of now in its history. Who keeps a copy asks for it before listing, so that what
  /// happens during the listing is told afterwards. The first time in a process it costs a look at
  /// each file. Errors: `LocalVesselError::unableToGetDeviceUUID`; `VesselErrorCode::noSuchItem`
  /// for a container that is gone.
  [[nodiscard]] virtual Result<Data> currentSyncAnchor() = 0;
};

/// Tells that a container has changed for as long as it lives: once it is gone, no call is under
/// way any more, unless it is that call which ended it.
class MIRABEL_EXPORT ContainerWatch {
 public:
  virtual ~ContainerWatch() = default;
};

/// What an operation is to change: an item, at the place where it was looked up. A file with
/// several hard links is one item that has several names, and the place says which of them is
/// meant.
struct ItemTarget {
  /// Whichever name of it is found.
  ItemTarget(std::string identifier) : itemIdentifier(std::move(identifier)) {}
  ItemTarget(const char* identifier) : itemIdentifier(identifier) {}
  /// The name that the item was handed out with.
  ItemTarget(const ItemRecord& item) : itemIdentifier(item.itemIdentifier), path(item.path) {}

  std::string itemIdentifier;
  std::string path{};  ///< absolute; empty for whichever is found
};

/// How far the operations of a process have come, all of them together since it started.
struct Progress {
  std::uint64_t entriesCopied = 0;
  std::uint64_t bytesCopied = 0;
  std::uint64_t entriesRemoved = 0;
};

/// What lies in a trash folder and was trashed before a date.
struct TrashedItem {
  std::optional<std::string> itemIdentifier;  ///< absent for what is no item
  std::string path;                           ///< absolute
  Date trashDate;
};

struct TrashFindings {
  std::vector<TrashedItem> old;
  std::uint64_t undated = 0;  ///< that have no date, and would be given one
};

/// Whose documents they are: where the home lies, and where the volume's state is kept.
struct HomePlaces {
  std::string home;
  std::string stateFolder;

  friend bool operator==(const HomePlaces&, const HomePlaces&) = default;
};

/// The document folder of an application.
struct ApplicationContainer {
  ItemRecord item;
  bool isAppLibrary = false;  ///< whether its documents are shown
};

/// The documents of a home as a program sees them: through a provider in its own process, or
/// through the service that runs; `openDocuments` chooses. Both answer the same. Any thread may
/// call it. Its containers and watches have to go before it does.
///
/// Containers are named by an item's identifier or by one of the constants in mirabel/Containers.h.
/// Paths are absolute, and bytes. Where the service does not answer (any more), the error is POSIX
/// ENOTCONN; an operation that ends with it may have been done. No call through the service is
/// given up for time.
///
/// Handlers and watches are called on threads of the library, where the answers of the service
/// arrive too. They must not call anything here but the end of a watch. Through the service, what
/// has an answer to wait for then fails at once with POSIX EDEADLK; inside the process it may wait
/// for ever.
class MIRABEL_EXPORT Documents {
 public:
  using ItemResult = Result<ItemRecord>;
  using ItemHandler = std::function<void(ItemResult)>;
  using ErrorHandler = std::function<void(std::optional<Error>)>;

  virtual ~Documents() = default;

  // Lookups. What is met for the first time is given an identifier, which is on disk when it is
  // answered. Errors: `VesselErrorCode::noSuchItem`; `LocalVesselError::itemNotFound` for what is
  // there and not shown, with the reason; `FileErrorCode::noSuchFile` and POSIX errors for a path
  // that leads nowhere.

  [[nodiscard]] virtual ItemResult item(std::string_view identifier) = 0;
  /// What lies at an absolute path, its links but for the last component resolved.
  [[nodiscard]] virtual ItemResult itemAtPath(const std::string& path) = 0;
  /// Errors: those of a lookup; POSIX ENOTDIR for what is no folder.
  [[nodiscard]] virtual Result<std::unique_ptr<DocumentContainer>> container(
      std::string_view identifier) = 0;
  /// Calls `changed`, on a thread of the library, whenever something has happened in the container
  /// since the watch began, once for several changes that come together, and now and then for none.
  /// When the service leaves and when it is back it is called too. Errors: those of `container`;
  /// POSIX ENOBUFS for more than 256 through the service.
  [[nodiscard]] virtual Result<std::unique_ptr<ContainerWatch>> watch(
      std::string_view identifier, std::function<void()> changed) = 0;

  enum class Access { reading, readingAndWriting };
  /// The file itself, open; it stays open when the item is moved or deleted. Errors: those of a
  /// lookup; POSIX EISDIR for a folder, ENOTSUP for anything else that is no regular file, EACCES,
  /// EBUSY for one that is being replaced all the time.
  [[nodiscard]] virtual Result<UniqueFd> openFile(std::string_view identifier, Access access) = 0;

  // Operations. Handlers are called exactly once, on any thread, perhaps before the call returns,
  // with the item as it is then, and before the documents are gone: what the service has not
  // answered until then ends with ENOTCONN. On success the change is on disk; after a crash it is
  // done or undone, never half. Of a file with several hard links the name at the target's path is
  // changed, one of them where it has none, and the others stay.
  // Errors: `VesselErrorCode::noSuchItem` for an identifier that leads nowhere, and for a document
  // that is not at the target's path any more; `VesselErrorCode::collision`, or where what is in
  // the way is no item `FileErrorCode::fileExists`, for a name that is taken, for nothing is ever
  // replaced; `FileErrorCode::writeNotPermitted` for a place in the root container itself; POSIX
  // EINVAL for a name that none can have, and other POSIX errors. Where the change was made and its
  // item can't be built, the error is the lookup's, and the change stays.

  /// Copies the file or the whole folder at an absolute path, anywhere, into the parent, with
  /// times, permissions and user attributes.
  virtual void importDocument(const std::string& source, const std::string& parent,
                              ItemHandler handler) = 0;
  virtual void createDirectory(const std::string& name, const std::string& parent,
                               ItemHandler handler) = 0;
  virtual void rename(const ItemTarget& item, const std::string& name, ItemHandler handler) = 0;
  /// Moves it into another folder, under another name if one is given. Where parent and item are
  /// both unknown, the error names the parent.
  virtual void reparent(const ItemTarget& item, const std::string& parent,
                        const std::optional<std::string>& newName, ItemHandler handler) = 0;
  /// Deletes it for good, a folder with everything in it.
  virtual void remove(const ItemTarget& item, ErrorHandler handler) = 0;
  /// Moves it to the trash of its documents, under a name made from its own where that is taken.
  /// Where it came from is on disk first. Errors of `ErrorDomain::store` too.
  virtual void trash(const ItemTarget& item, ItemHandler handler) = 0;
  /// Moves it out of the trash, under the name that it had or one made from it where that is taken:
  /// into the parent, if one is given that is there and not in the trash itself; or else back to
  /// where it came from; or else, where that is gone and it lies in an app library, into that.
  /// Error: invalid parameter `itemIdentifier` for what is not in the trash, or has no place to go.
  virtual void restore(const ItemTarget& item, const std::optional<std::string>& parent,
                       ItemHandler handler) = 0;

  // What the user says of a file; nothing given takes it away. It lies in an extended attribute of
  // the file, which stays as it was after an error: POSIX ENOTSUP where the file system has none,
  // ENOSPC where there is no room for it, EACCES and EPERM. That of what can't hold any, such as a
  // link, lies in the volume's state; errors of `ErrorDomain::store` too.

  virtual void setLastUsedDate(const std::string& identifier, const std::optional<Date>& date,
                               ItemHandler handler) = 0;
  /// In the encoding of mirabel/TagData.h; anything else counts as no tags. The labels are kept,
  /// colours are not. Error: POSIX E2BIG where the labels have more than 64 KiB.
  virtual void setTagData(const std::string& identifier, const std::optional<Data>& tagData,
                          ItemHandler handler) = 0;
  virtual void setFavoriteRank(const std::string& identifier, const std::optional<Number>& rank,
                               ItemHandler handler) = 0;

  // The trash: that of the documents and those of the app libraries.

  /// What `removeItemsTrashedBefore` would delete.
  [[nodiscard]] virtual Result<TrashFindings> itemsTrashedBefore(const Date& date) = 0;
  /// Deletes for good what was trashed before the date. What has no date, because another program
  /// put it there, gets the one of now, and so goes one period later. The trash is walked before
  /// the call returns. What can't be deleted stays for the next time, and is no error.
  virtual void removeItemsTrashedBefore(const Date& date, ErrorHandler handler) = 0;

  /// How far the operations of the process have come that holds the documents; zeros where the
  /// service does not answer.
  [[nodiscard]] virtual Progress progress() = 0;

  // Applications.

  /// Those that show their documents.
  [[nodiscard]] virtual Result<std::vector<ItemRecord>> appLibraries() = 0;
  /// The document folder of an application, whether or not its documents are shown. Error:
  /// `LocalVesselError::itemNotFound`, with the reason.
  [[nodiscard]] virtual Result<ApplicationContainer> applicationContainer(
      const std::string& bundle) = 0;
  /// A PNG file of at most `side` pixels each way, 1 to 4096; nothing for what is no app library.
  /// Errors: `VesselErrorCode::noSuchItem` for one of no application, POSIX errors for an icon that
  /// is not there or can't be drawn.
  [[nodiscard]] virtual Result<std::optional<Data>> icon(const std::string& identifier,
                                                         std::uint32_t side) = 0;

  // The search index, in step with the disk as of the call, in which it may have to be fed first.
  // Errors: `ErrorDomain::store`, POSIX.

  /// The best matches come first, and of those as good the newest.
  [[nodiscard]] virtual Result<std::vector<ItemRecord>> search(const SearchQuery& query) = 0;
  /// The documents that were used or changed last, the last first.
  [[nodiscard]] virtual Result<std::vector<ItemRecord>> recent(std::size_t limit) = 0;
  /// What has a rank, the lowest first, `limit` at most.
  [[nodiscard]] virtual Result<std::vector<ItemRecord>> favorites(std::size_t limit) = 0;

  /// How changes are followed. Brings the index in step first. Error: that it can't be.
  [[nodiscard]] virtual Result<StatusReport> status() = 0;
  /// Whose documents these are.
  [[nodiscard]] virtual HomePlaces places() = 0;
};

}  // namespace mirabel
