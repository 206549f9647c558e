#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/Error.h"
#include "foundation/Values.h"
#include "host/ItemRecord.h"
#include "host/StatusReport.h"
#include "host/search/SearchQuery.h"
#include "linux/kernel/UniqueFd.h"

namespace mirabel {

struct ItemPage {
  std::vector<ItemRecord> items;
  std::optional<Data> nextPage;  ///< nothing when the listing is complete
};

struct ItemChanges {
  std::vector<ItemRecord> updated;
  std::vector<std::string> deleted;
  Data anchor;              ///< where to ask on from
  bool moreComing = false;  ///< ask again at once
};

/// A container that is listed and followed by one client. Not shared between threads.
class DocumentContainer {
 public:
  virtual ~DocumentContainer() = default;
  /// The page that a cursor stands for; `VesselInitialPageSortedByName` begins. Errors:
  /// `syncAnchorExpired` for a cursor that can't be used any more; the listing starts over.
  [[nodiscard]] virtual Result<ItemPage> items(const Data& page) = 0;
  /// A batch of what has changed since the anchor. Errors: `syncAnchorExpired` for one that can't
  /// be used any more; the container has to be listed again.
  [[nodiscard]] virtual Result<ItemChanges> changes(const Data& anchor) = 0;
  /// Error: `LocalVesselError::unableToGetDeviceUUID`.
  [[nodiscard]] virtual Result<Data> currentSyncAnchor() = 0;
};

/// Tells that a container has changed for as long as it lives.
class ContainerWatch {
 public:
  virtual ~ContainerWatch() = default;
};

/// How far the operations of a process have come, all of them together since it started.
struct Progress {
  std::uint64_t entriesCopied = 0;
  std::uint64_t bytesCopied = 0;
  std::uint64_t entriesRemoved = 0;
};

/// What lies in a trash folder and was trashed before a date.
struct TrashedItem {
  std::optional<std::string> itemIdentifier;
  std::string path;
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

/// The documents of a home as a program sees them: through the provider in its own process, or
/// through the service that runs. Both answer the same. Any thread may call it; handlers are called
/// exactly once, on any thread, perhaps before the call returns.
///
/// Containers are named by an item's identifier or by one of the host's constants. Where the
/// service does not answer (any more), the error is POSIX ENOTCONN.
class Documents {
 public:
  using ItemResult = Result<ItemRecord>;
  using ItemHandler = std::function<void(ItemResult)>;
  using ErrorHandler = std::function<void(std::optional<Error>)>;

  virtual ~Documents() = default;

  // Lookups. Errors: the host's no-such-item error; `LocalVesselError::itemNotFound` for what is
  // there and not shown, with the reason; POSIX and file errors for a path that leads nowhere.

  [[nodiscard]] virtual ItemResult item(std::string_view identifier) = 0;
  /// What lies at an absolute path, its links but for the last component resolved.
  [[nodiscard]] virtual ItemResult itemAtPath(const std::string& path) = 0;
  /// Errors: those of a lookup; POSIX ENOTDIR for what is no folder.
  [[nodiscard]] virtual Result<std::unique_ptr<DocumentContainer>> container(
      std::string_view identifier) = 0;
  /// Calls `changed`, on a thread of its own, whenever something has happened in the container
  /// since the watch began, once for several changes that come together. It must not wait for the
  /// watch to end. After a time without the service it is called too. Errors: those of `container`.
  [[nodiscard]] virtual Result<std::unique_ptr<ContainerWatch>> watch(
      std::string_view identifier, std::function<void()> changed) = 0;

  enum class Access { reading, readingAndWriting };
  /// The file itself, open. Errors: those of a lookup; POSIX EISDIR for a folder, ENOTSUP for
  /// anything else that is no regular file, EACCES.
  [[nodiscard]] virtual Result<UniqueFd> openFile(std::string_view identifier, Access access) = 0;

  // Operations, as `LocalVessel` and `HostTrash` have them, with their errors.

  /// Copies what lies at the path, anywhere, into the parent.
  virtual void importDocument(const std::string& source, const std::string& parent,
                              ItemHandler handler) = 0;
  virtual void createDirectory(const std::string& name, const std::string& parent,
                               ItemHandler handler) = 0;
  virtual void rename(const std::string& identifier, const std::string& name,
                      ItemHandler handler) = 0;
  virtual void reparent(const std::string& identifier, const std::string& parent,
                        const std::optional<std::string>& newName, ItemHandler handler) = 0;
  virtual void remove(const std::string& identifier, ErrorHandler handler) = 0;
  virtual void trash(const std::string& identifier, ItemHandler handler) = 0;
  virtual void restore(const std::string& identifier, const std::optional<std::string>& parent,
                       ItemHandler handler) = 0;
  virtual void setLastUsedDate(const std::string& identifier, const std::optional<Date>& date,
                               ItemHandler handler) = 0;
  virtual void setTagData(const std::string& identifier, const std::optional<Data>& tagData,
                          ItemHandler handler) = 0;
  virtual void setFavoriteRank(const std::string& identifier, const std::optional<Number>& rank,
                               ItemHandler handler) = 0;
  [[nodiscard]] virtual Result<TrashFindings> itemsTrashedBefore(const Date& date) = 0;
  /// See `LocalVessel::_removeTrashedItemsOlderThanDate`.
  virtual void removeItemsTrashedBefore(const Date& date, ErrorHandler handler) = 0;
  [[nodiscard]] virtual Progress progress() = 0;

  // Applications.

  [[nodiscard]] virtual Result<std::vector<ItemRecord>> appLibraries() = 0;
  /// Error: `LocalVesselError::itemNotFound`, with the reason.
  [[nodiscard]] virtual Result<ApplicationContainer> applicationContainer(
      const std::string& bundle) = 0;
  /// A PNG file of at most `side` pixels each way; nothing for what has no picture.
  [[nodiscard]] virtual Result<std::optional<Data>> icon(const std::string& identifier,
                                                         std::uint32_t side) = 0;

  // The search index, in step with the disk as of the call. Errors: those of feeding it.

  [[nodiscard]] virtual Result<std::vector<ItemRecord>> search(const SearchQuery& query) = 0;
  /// The documents that were used or changed last, the last first.
  [[nodiscard]] virtual Result<std::vector<ItemRecord>> recent(std::size_t limit) = 0;
  /// In the order of their ranks, `limit` at most.
  [[nodiscard]] virtual Result<std::vector<ItemRecord>> favorites(std::size_t limit) = 0;

  [[nodiscard]] virtual Result<StatusReport> status() = 0;
  [[nodiscard]] virtual HomePlaces places() = 0;
};

}  // namespace mirabel
