#include <cerrno>
#include <string>
#include <utility>
#include <vector>

#include "foundation/Log.h"
#include "items/AttributeNames.h"
#include "mirabel/TagData.h"
#include "provider/AttributePayload.h"
#include "provider/LocalVessel.h"

namespace mirabel {
namespace {

std::vector<std::string> labelsIn(const std::optional<Data>& tagData) {
  std::vector<std::string> labels;
  auto tags = tagData ? decodeTagData(*tagData) : std::nullopt;
  if (!tags) return labels;
  for (Tag& tag : *tags)
    labels.push_back(std::move(tag.label));
  return labels;
}

}  // namespace

// The sections of these end before the completion, which is no part of the work.

void LocalVessel::setLastUsedDate(const std::optional<Date>& date,
                                  std::string_view forItemIdentifier,
                                  const ItemHandler& completionHandler) {
  completionHandler(storeLastUsedDate(date, forItemIdentifier));
}

void LocalVessel::setTagData(const std::optional<Data>& tagData, std::string_view forItemIdentifier,
                             const ItemHandler& completionHandler) {
  completionHandler(storeTagData(tagData, forItemIdentifier));
}

void LocalVessel::setFavoriteRank(const std::optional<Number>& rank,
                                  std::string_view forItemIdentifier,
                                  const ItemHandler& completionHandler) {
  completionHandler(storeFavoriteRank(rank, forItemIdentifier));
}

LocalVessel::ItemResult LocalVessel::storeLastUsedDate(const std::optional<Date>& date,
                                                       std::string_view identifier) const {
  const LogSection section(date ? "set last used date " + quoted(date->rfc3339()) + " to item " +
                                      quoted(identifier)
                                : "clearing last used date for item " + quoted(identifier));
  const auto url = urlForIdentifier(identifier);
  if (!url) return fail(url.error());
  const auto payload = attributePayload(date, keyedarchive::archiveDate);
  if (const auto error = writeAttribute(attributename::lastUsedDate, payload, *url)) {
    logError("can't set xattr " + std::string(attributename::lastUsedDate) + " on " +
             url->description() + "; " + error->description());
    return fail(*error);
  }
  return itemForIdentifier(identifier);
}

LocalVessel::ItemResult LocalVessel::storeTagData(const std::optional<Data>& tagData,
                                                  std::string_view identifier) const {
  const LogSection section("set tag data to item " + quoted(identifier));
  const auto url = _urlForItemWithPersistentIdentifier(identifier);
  if (!url) {
    const Error missing = Error::nonExistentItem(identifier);
    logError("can't find URL for item; " + missing.description());
    return fail(missing);
  }
  const auto payload = keyedarchive::archiveStrings(labelsIn(tagData));
  // Refused, for otherwise the tags that the file has would go for ones that were never written.
  if (!payload) {
    const Error tooLong = Error::posix(E2BIG, "the labels have more than 64 KiB");
    logError("can't archive tags; " + payload.error().description());
    return fail(tooLong);
  }
  if (const auto error = writeAttribute(attributename::tags, *payload, *url)) {
    logError("can't set xattr " + std::string(attributename::tags) + "; " + error->description());
    return fail(*error);
  }
  return itemForIdentifier(identifier);
}

LocalVessel::ItemResult LocalVessel::storeFavoriteRank(const std::optional<Number>& rank,
                                                       std::string_view identifier) const {
  const LogSection section("set favorite rank " + quoted(rank ? rank->description() : "(null)") +
                           " to item " + quoted(identifier));
  const auto url = urlForIdentifier(identifier);
  if (!url) return fail(url.error());
  const auto payload = attributePayload(rank, keyedarchive::archiveNumber);
  if (const auto error = writeAttribute(attributename::favoriteRank, payload, *url)) {
    logError("can't set xattr " + std::string(attributename::favoriteRank) + "; " +
             error->description());
    return fail(*error);
  }
  return itemForIdentifier(identifier);
}

/// Writes the attribute, or removes it where there is no value.
std::optional<Error> LocalVessel::writeAttribute(std::string_view name,
                                                 const std::optional<Data>& value,
                                                 const URL& url) const {
  return platform_.operations.vs_withReadWriteAccess(
      url, [&](AttributeTarget& target) { return setExtendedAttribute(target, value, name); });
}

}  // namespace mirabel
