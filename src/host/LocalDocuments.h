#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "host/ContainerWatches.h"
#include "host/HostedProvider.h"
#include "host/ItemLookup.h"
#include "host/RecentItems.h"
#include "host/Searching.h"
#include "mirabel/Documents.h"

namespace mirabel {

/// The documents through a provider in this process. It holds the volume's state for as long as it
/// lives; containers and watches must have ended when it goes, and operations have reported.
class LocalDocuments final : public Documents {
 public:
  /// Errors: those of `LinuxPlatform::open`.
  [[nodiscard]] static Result<std::unique_ptr<LocalDocuments>> open(LinuxPlatform::Options options);

  [[nodiscard]] HostedProvider& provider() { return *provider_; }
  [[nodiscard]] const ItemLookup& lookup() const { return lookup_; }
  /// Keeps the search index in step from now on, in the background.
  void keepSearching() { searching_.follow(watches()); }
  /// Has searches that are under way, and those to come, end with POSIX ECANCELED: for when nobody
  /// may wait any more for a first look at all files.
  void stopSearching() { searching_.stop(); }
  /// Gives back what is kept in memory to answer sooner, and what was freed: for times when nobody
  /// asks.
  void releaseMemory();

  /// The item, if that can be told without waiting for anything, or else null.
  [[nodiscard]] std::shared_ptr<const ItemRecord> itemAtOnce(std::string_view identifier) {
    return recent_.recall(identifier);
  }

  [[nodiscard]] ItemResult item(std::string_view identifier) override;
  [[nodiscard]] ItemResult itemAtPath(const std::string& path) override;
  [[nodiscard]] Result<std::unique_ptr<DocumentContainer>> container(
      std::string_view identifier) override;
  /// Keeps up with applications that come and go from then on.
  [[nodiscard]] Result<std::unique_ptr<ContainerWatch>> watch(
      std::string_view identifier, std::function<void()> changed) override;

  [[nodiscard]] Result<UniqueFd> openFile(std::string_view identifier, Access access) override;

  void importDocument(const std::string& source, const std::string& parent,
                      ItemHandler handler) override;
  void createDirectory(const std::string& name, const std::string& parent,
                       ItemHandler handler) override;
  void rename(const ItemTarget& item, const std::string& name, ItemHandler handler) override;
  void reparent(const ItemTarget& item, const std::string& parent,
                const std::optional<std::string>& newName, ItemHandler handler) override;
  void remove(const ItemTarget& item, ErrorHandler handler) override;
  void trash(const ItemTarget& item, ItemHandler handler) override;
  void restore(const ItemTarget& item, const std::optional<std::string>& parent,
               ItemHandler handler) override;
  void setLastUsedDate(const std::string& identifier, const std::optional<Date>& date,
                       ItemHandler handler) override;
  void setTagData(const std::string& identifier, const std::optional<Data>& tagData,
                  ItemHandler handler) override;
  void setFavoriteRank(const std::string& identifier, const std::optional<Number>& rank,
                       ItemHandler handler) override;
  [[nodiscard]] Result<TrashFindings> itemsTrashedBefore(const Date& date) override;
  /// As there, the trash is walked on the caller's thread.
  void removeItemsTrashedBefore(const Date& date, ErrorHandler handler) override;
  [[nodiscard]] Progress progress() override;

  [[nodiscard]] Result<std::vector<ItemRecord>> appLibraries() override;
  [[nodiscard]] Result<ApplicationContainer> applicationContainer(
      const std::string& bundle) override;
  [[nodiscard]] Result<std::optional<Data>> icon(const std::string& identifier,
                                                 std::uint32_t side) override;

  [[nodiscard]] Result<std::vector<ItemRecord>> search(const SearchQuery& query) override;
  [[nodiscard]] Result<std::vector<ItemRecord>> recent(std::size_t limit) override;
  [[nodiscard]] Result<std::vector<ItemRecord>> favorites(std::size_t limit) override;

  [[nodiscard]] Result<StatusReport> status() override;
  [[nodiscard]] HomePlaces places() override;

 private:
  explicit LocalDocuments(std::unique_ptr<HostedProvider> provider);
  [[nodiscard]] ContainerWatches& watches();
  [[nodiscard]] std::string whyNoContainer(const std::string& bundle) const;
  [[nodiscard]] std::vector<ItemRecord> found(const std::vector<std::string>& identifiers);

  std::unique_ptr<HostedProvider> provider_;
  ItemLookup lookup_;
  RecentItems recent_;
  std::once_flag watching_;
  std::unique_ptr<ContainerWatches> watches_;
  Searching searching_;
};

}  // namespace mirabel
