#include "fs/WalkPosition.h"

#include <string_view>
#include <utility>

#include "foundation/FatalError.h"
#include "foundation/PropertyList.h"

namespace mirabel {
namespace {

constexpr std::uint64_t currentVersion = 1;
// Far above what is ever kept, so that bytes which share objects do not unfold without end.
constexpr PropertyList::Limits positionLimits{.depth = 4, .objects = 64u << 10, .bytes = 1u << 20};

constexpr std::string_view positionVersionKey = "version";
constexpr std::string_view planKey = "plan";
constexpr std::string_view nextRootKey = "nextRoot";
constexpr std::string_view foldersKey = "folders";
constexpr std::string_view descentKey = "descent";
constexpr std::string_view nameKey = "name";
constexpr std::string_view fileIDKey = "fileID";
constexpr std::string_view positionKey = "position";

std::optional<std::string> bytesFor(std::string_view key, const PropertyList& list) {
  const PropertyList* entry = list.find(key);
  return entry == nullptr ? std::nullopt : entry->bytes();
}

std::optional<WalkPosition::Folder> folderFrom(const PropertyList& list) {
  auto name = bytesFor(nameKey, list);
  const auto fileID = list.unsignedFor(fileIDKey);
  const auto position = list.unsignedFor(positionKey);
  if (!name || !fileID || !position) return {};
  return WalkPosition::Folder{*std::move(name), *fileID, *position};
}

PropertyList listOf(const WalkPosition::Folder& folder) {
  PropertyList::Dictionary entry;
  entry.emplace_back(nameKey, PropertyList::ofBytes(folder.name));
  entry.emplace_back(fileIDKey, Number::of(folder.fileID));
  entry.emplace_back(positionKey, Number::of(folder.position));
  return PropertyList(std::move(entry));
}

}  // namespace

Data WalkPosition::encode() const {
  PropertyList::Dictionary dictionary;
  dictionary.emplace_back(positionVersionKey, Number::of(currentVersion));
  dictionary.emplace_back(planKey, Number::of(plan));
  dictionary.emplace_back(nextRootKey, Number::of(nextRoot));
  PropertyList::Array list;
  for (const Folder& folder : folders)
    list.push_back(listOf(folder));
  dictionary.emplace_back(foldersKey, PropertyList(std::move(list)));
  if (descent) dictionary.emplace_back(descentKey, PropertyList::ofBytes(*descent));
  auto bytes = PropertyList(std::move(dictionary)).encode();
  if (bytes) return *std::move(bytes);
  fatalError("a walk's position can't be written");
}

std::optional<WalkPosition> WalkPosition::decode(std::span<const std::uint8_t> bytes) {
  const auto list = PropertyList::decode(bytes, positionLimits);
  if (!list || list->unsignedFor(positionVersionKey) != currentVersion) return {};
  const auto plan = list->unsignedFor(planKey);
  const auto nextRoot = list->unsignedFor(nextRootKey);
  const PropertyList* folders = list->find(foldersKey);
  const auto* array = folders == nullptr ? nullptr : folders->as<PropertyList::Array>();
  if (!plan || !nextRoot || array == nullptr) return {};
  WalkPosition position{*plan, *nextRoot, {}, {}};
  for (const PropertyList& entry : *array) {
    auto folder = folderFrom(entry);
    if (!folder) return {};
    position.folders.push_back(*std::move(folder));
  }
  if (list->find(descentKey) == nullptr) return position;
  position.descent = bytesFor(descentKey, *list);
  if (!position.descent) return {};
  return position;
}

}  // namespace mirabel
