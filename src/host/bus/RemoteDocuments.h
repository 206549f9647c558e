#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "mirabel/Documents.h"

namespace mirabel::bus {

class BusConnection;
class RemoteWatches;

/// The documents through the service on the session bus. Watches go on when the service was
/// started anew; containers are asked for anew with each question, so that they do too.
class RemoteDocuments final : public Documents {
 public:
  /// How long the first answer is waited for: it comes from memory, so that whoever has the name
  /// and lets that pass answers nothing else either.
  static constexpr std::chrono::milliseconds firstPatience{10'000};
  /// Null where the service does not run or does not answer, or runs for another home or with
  /// another state.
  [[nodiscard]] static std::unique_ptr<RemoteDocuments> connect(
      const HomePlaces& places, std::chrono::milliseconds patience = firstPatience);
  /// Whether there is a session bus that a service could be on.
  [[nodiscard]] static bool hasBus();
  ~RemoteDocuments() override;

  [[nodiscard]] ItemResult item(std::string_view identifier) override;
  [[nodiscard]] ItemResult itemAtPath(const std::string& path) override;
  [[nodiscard]] Result<std::unique_ptr<DocumentContainer>> container(
      std::string_view identifier) override;
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
  [[nodiscard]] HomePlaces places() override { return places_; }

 private:
  RemoteDocuments(std::shared_ptr<BusConnection> connection, HomePlaces places);

  std::shared_ptr<BusConnection> connection_;
  std::shared_ptr<RemoteWatches> watches_;
  HomePlaces places_;
};

}  // namespace mirabel::bus
