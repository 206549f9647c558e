#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "mirabel/Documents.h"

namespace mirabel::bus {

/// What a sandboxed application sees of the documents: those of its own app library, without where
/// they lie on the disk. What is not its own is not there for it; the containers that are made of
/// several folders are refused (POSIX EACCES). Any thread may call it.
class RestrictedDocuments final : public Documents {
 public:
  /// `all` outlives it. An empty bundle identifier sees nothing.
  RestrictedDocuments(Documents& all, std::string bundle) : all_(all), bundle_(std::move(bundle)) {}

  [[nodiscard]] ItemResult item(std::string_view identifier) override;
  [[nodiscard]] ItemResult itemAtPath(const std::string& path) override;
  [[nodiscard]] Result<std::unique_ptr<DocumentContainer>> container(
      std::string_view identifier) override;
  [[nodiscard]] Result<std::unique_ptr<ContainerWatch>> watch(
      std::string_view identifier, std::function<void()> changed) override;
  [[nodiscard]] Result<UniqueFd> openFile(std::string_view identifier, Access access) override;

  /// For files that were vetted: any path is taken.
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
  void removeItemsTrashedBefore(const Date& date, ErrorHandler handler) override;
  [[nodiscard]] Progress progress() override { return {}; }

  [[nodiscard]] Result<std::vector<ItemRecord>> appLibraries() override;
  [[nodiscard]] Result<ApplicationContainer> applicationContainer(
      const std::string& bundle) override;
  [[nodiscard]] Result<std::optional<Data>> icon(const std::string& identifier,
                                                 std::uint32_t side) override;

  [[nodiscard]] Result<std::vector<ItemRecord>> search(const SearchQuery& query) override;
  [[nodiscard]] Result<std::vector<ItemRecord>> recent(std::size_t limit) override;
  [[nodiscard]] Result<std::vector<ItemRecord>> favorites(std::size_t limit) override;

  [[nodiscard]] Result<StatusReport> status() override;
  [[nodiscard]] HomePlaces places() override { return {}; }

 private:
  friend class RestrictedContainer;
  [[nodiscard]] bool isOwn(const ItemRecord& item) const;
  /// Whether the caller may do something to it; the answer does not tell what is somebody else's
  /// from what is not there.
  [[nodiscard]] Result<void> requireOwn(std::string_view identifier) const;
  [[nodiscard]] ItemResult shown(ItemResult item) const;
  [[nodiscard]] std::vector<ItemRecord> own(std::vector<ItemRecord> items) const;
  [[nodiscard]] ItemHandler shown(ItemHandler handler) const;

  Documents& all_;
  std::string bundle_;
};

}  // namespace mirabel::bus
