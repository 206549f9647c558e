#include "items/LocalItem.h"

#include <cerrno>
#include <charconv>
#include <utility>

#include "foundation/FatalError.h"
#include "foundation/KeyedArchive.h"
#include "foundation/Log.h"
#include "items/AttributeNames.h"
#include "mirabel/TagData.h"

namespace mirabel {
namespace {

/// Documents of these two suites are folders whose size is worth the walk.
constexpr std::string_view sizedPackageTypes[] = {"com.norvane.quillsuite",
                                                  "com.norvane.lumenbeat"};

/// The value in an archive of one; nothing when there is no attribute or it holds something else.
template <class T, class Unarchive>
std::optional<T> decoded(const std::optional<Data>& attribute, Unarchive unarchive) {
  if (!attribute) return {};
  Result<T> value = unarchive(*attribute);
  if (!value) return {};
  return *std::move(value);
}

std::optional<Data> tagDataFrom(const std::optional<Data>& attribute) {
  if (!attribute) return {};
  auto labels = keyedarchive::unarchiveStrings(*attribute);
  if (!labels) return Data{};
  std::vector<Tag> tags;
  for (std::string& label : *labels)
    tags.push_back({std::move(label)});
  return encodeTagData(tags).value_or(Data{});
}

/// The place that a stored path names below `folder`. Nothing for a path that is not what this
/// system stores: anybody who may write the file may write its attributes, and a put-back must
/// not be led out of the library.
std::optional<URL> placeBelow(URL folder, std::string_view relative) {
  if (relative.find('\0') != std::string_view::npos) return {};
  for (;;) {
    const std::size_t slash = relative.find('/');
    const std::string_view component = relative.substr(0, slash);
    if (component.empty() || component == "." || component == "..") return {};
    folder = folder.appendingPathComponent(component);
    if (slash == std::string_view::npos) return folder;
    relative.remove_prefix(slash + 1);
  }
}

}  // namespace

std::shared_ptr<LocalItem> LocalItem::create(const ItemContext& context, const URL& url,
                                             ItemOverrides overrides) {
  struct Item final : LocalItem {
    Item(const ItemContext& itemContext, const URL& itemURL) : LocalItem(itemContext, itemURL) {}
  };
  auto item = std::make_shared<Item>(context, url);
  if (!item->build(std::move(overrides))) return nullptr;
  return item;
}

LocalItem::LocalItem(const ItemContext& context, URL url)
    : context_(context), fileURL_(std::move(url)) {}

bool LocalItem::build(ItemOverrides overrides) {
  if (!buildIdentity(overrides) || !buildName(overrides)) return false;
  buildContent();
  buildUserMetadata();
  buildStatus();
  isTrashed_ = isInTrash(fileURL_);
  buildOwner(overrides);
  return true;
}

bool LocalItem::buildIdentity(ItemOverrides& overrides) {
  auto identifier = std::move(overrides.customItemID);
  if (!identifier) identifier = context_.identity.itemIdentifier(fileURL_);
  if (!identifier) {
    logError("can't create an item without an ID");
    return false;
  }
  itemIdentifier_ = *std::move(identifier);

  auto parent = std::move(overrides.customParentItemID);
  if (!parent && itemIdentifier_ == VesselRootContainerItemIdentifier) parent = itemIdentifier_;
  if (!parent) parent = context_.identity.itemIdentifier(fileURL_.deletingLastPathComponent());
  if (!parent) {
    logError("can't create an item without a parent ID (itemIdentifier: " + itemIdentifier_ + ")");
    return false;
  }
  parentItemIdentifier_ = *std::move(parent);
  return true;
}

bool LocalItem::buildName(ItemOverrides& overrides) {
  const ResourceReader reader(context_.platform.resources);
  const auto identifiers = [&] {
    return " (itemIdentifier: " + itemIdentifier_ +
           ", parentItemIdentifier: " + parentItemIdentifier_;
  };
  auto name = std::move(overrides.customFilename);
  if (!name) name = reader.string(ResourceKey::name, fileURL_);
  if (!name) {
    logError("can't create an item without a filename" + identifiers() + ")");
    return false;
  }
  filename_ = *std::move(name);

  auto type = reader.string(ResourceKey::typeIdentifier, fileURL_);
  if (!type) {
    logError("can't create an item without a type identifier" + identifiers() +
             ", filename: " + filename_ + ")");
    return false;
  }
  typeIdentifier_ = *std::move(type);

  // The folder's own name counts: an application may well be called "Inbox".
  if (fileURL_.lastPathComponent() == "Inbox") {
    logError("can't create an item for the \"Inbox\" directory");
    return false;
  }
  return true;
}

void LocalItem::buildContent() {
  const ResourceReader reader(context_.platform.resources);
  documentSize_ = computedSize(reader.boolean(ResourceKey::isPackage, fileURL_).value_or(false));
  creationDate_ = reader.date(ResourceKey::creationDate, fileURL_);
  contentModificationDate_ = reader.date(ResourceKey::contentModificationDate, fileURL_);
  capabilities_ = computedCapabilities();
  // The date is no byte string, so items have no version identifier: hosts rely on its absence.
  versionIdentifier_ = reader.data(ResourceKey::contentModificationDate, fileURL_);
}

std::optional<Number> LocalItem::computedSize(bool isPackage) const {
  if (!isPackage) {
    if (typeIdentifier_ == folderTypeIdentifier) return {};
    return ResourceReader(context_.platform.resources).number(ResourceKey::fileSize, fileURL_);
  }
  for (const std::string_view type : sizedPackageTypes) {
    if (!typeIdentifier_.starts_with(type)) continue;
    const auto size = context_.platform.sizes.directorySize(fileURL_);
    return size ? std::optional(Number::of(*size)) : std::nullopt;
  }
  return {};
}

std::uint64_t LocalItem::computedCapabilities() const {
  if (itemIdentifier_ == VesselRootContainerItemIdentifier) return capabilityReading;
  const ResourceReader reader(context_.platform.resources);
  if (!reader.boolean(ResourceKey::isWritable, fileURL_).value_or(false)) return capabilityReading;
  if (isAppLibrary()) return capabilityReading | capabilityWriting;
  return capabilityReading | capabilityWriting | capabilityReparenting | capabilityRenaming |
         capabilityTrashing | capabilityDeleting;
}

void LocalItem::buildUserMetadata() {
  const auto attribute = [&](std::string_view name) {
    return extendedAttribute(context_.platform.attributes, name, fileURL_);
  };
  if (!isAppLibrary()) {
    lastUsedDate_ =
        decoded<Date>(attribute(attributename::lastUsedDate), keyedarchive::unarchiveDate);
  }
  tagData_ = tagDataFrom(attribute(attributename::tags));
  favoriteRank_ =
      decoded<Number>(attribute(attributename::favoriteRank), keyedarchive::unarchiveNumber);
}

void LocalItem::buildStatus() {
  const auto status = context_.platform.objects.status(fileURL_);
  if (status) {
    fileID_ = status->fileID;
    if (typeIdentifier_ == folderTypeIdentifier) {
      if (status->linkCount < 2) fatalError("the link count of a folder is below 2");
      childItemCount_ = static_cast<std::uint16_t>(status->linkCount - 2);
    }
  } else {
    logMessage(
        status.error().isPosix(ENOENT) ? LogLevel::debug : LogLevel::error,
        "can't find fileID for item \"" + fileURL_.path() + "\"; " + status.error().description());
  }
  if (!itemIdentifier_.starts_with("did=")) return;
  std::uint64_t documentID = 0;
  const char* const end = itemIdentifier_.data() + itemIdentifier_.size();
  const auto parsed = std::from_chars(itemIdentifier_.data() + 4, end, documentID);
  if (parsed.ec == std::errc{}) docID_ = documentID;
}

void LocalItem::buildOwner(ItemOverrides& overrides) {
  const auto owner = overrides.hasBeaconDomainIdentifier
                         ? context_.owners.applicationOwning(fileURL_)
                         : std::nullopt;
  if (!owner) {
    appContainerBundleIdentifier_ = std::move(overrides.bundleIdentifier);
    return;
  }
  beaconDomain_ = owner->bundleIdentifier;
  appContainerBundleIdentifier_ = owner->bundleIdentifier;
}

bool LocalItem::vs_isContainer() const {
  return typeIdentifier_ == folderTypeIdentifier;
}

const std::optional<URL>& LocalItem::putBackURL() const {
  if (!putBackComputed_) putBackURL_ = computedPutBackURL();
  putBackComputed_ = true;
  return putBackURL_;
}

std::optional<URL> LocalItem::computedPutBackURL() const {
  const auto attribute =
      extendedAttribute(context_.platform.attributes, attributename::putBack, fileURL_);
  if (!attribute) {
    logDebug("couldn't find putback xattr for " + fileURL_.path());
    return {};
  }
  const auto relative = keyedarchive::unarchiveString(*attribute);
  const auto owner = context_.owners.applicationOwning(fileURL_);
  std::optional<URL> place;
  if (relative && owner && owner->dataContainerURL) {
    place = placeBelow(owner->dataContainerURL->appendingPathComponent("Documents"), *relative);
  }
  if (!place) logError("couldn't compute putback url");
  return place;
}

std::string LocalItem::description() const {
  return describe("LocalItem");
}

std::string LocalItem::describe(std::string_view className) const {
  return "<" + std::string(className) + " itemIdentifier: " + itemIdentifier_ +
         ", parentItemIdentifier: " + parentItemIdentifier_ + ", filename: " + filename_ + ">";
}

}  // namespace mirabel
