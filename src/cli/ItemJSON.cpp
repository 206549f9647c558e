#include "cli/ItemJSON.h"

#include <nlohmann/json.hpp>

#include "cli/Printing.h"
#include "foundation/Unicode.h"
#include "mirabel/ItemRecord.h"
#include "mirabel/TagData.h"

namespace mirabel {
namespace {

nlohmann::json numberJSON(const Number& number) {
  if (const auto* value = std::get_if<double>(&number.value)) return *value;
  return number.description();
}

void setDate(nlohmann::json& object, const char* key, const std::optional<Date>& date) {
  if (date) object[key] = date->rfc3339();
}

void setTags(nlohmann::json& object, const std::optional<Data>& tagData) {
  if (!tagData) return;
  nlohmann::json labels = nlohmann::json::array();
  for (const Tag& tag : decodeTagData(*tagData).value_or(std::vector<Tag>())) {
    labels.push_back(utf8Lossy(tag.label));
  }
  object["tags"] = std::move(labels);
}

}  // namespace

void setText(nlohmann::json& object, const std::string& key, std::string_view bytes) {
  if (isUTF8(bytes)) {
    object[key] = bytes;
    return;
  }
  object[key] = utf8Lossy(bytes);
  object[key + "Bytes"] = base64(bytes);
}

nlohmann::json itemJSON(const ItemRecord& item) {
  nlohmann::json object;
  setText(object, "itemIdentifier", item.itemIdentifier);
  setText(object, "parentItemIdentifier", item.parentItemIdentifier);
  setText(object, "filename", item.filename);
  object["typeIdentifier"] = item.typeIdentifier;
  if (item.documentSize) object["documentSize"] = numberJSON(*item.documentSize);
  setDate(object, "creationDate", item.creationDate);
  setDate(object, "contentModificationDate", item.contentModificationDate);
  if (item.childItemCount) object["childItemCount"] = *item.childItemCount;
  object["capabilities"] = std::to_string(item.capabilities);
  object["isTrashed"] = item.isTrashed;
  setDate(object, "lastUsedDate", item.lastUsedDate);
  setTags(object, item.tagData);
  if (item.favoriteRank) object["favoriteRank"] = numberJSON(*item.favoriteRank);
  if (item.fileID) object["fileID"] = std::to_string(*item.fileID);
  if (item.docID) object["docID"] = std::to_string(*item.docID);
  if (const auto& domain = item.beaconDomainIdentifier) {
    setText(object, "vs_beaconDomainIdentifier", *domain);
  }
  if (const auto& bundle = item.appContainerBundleIdentifier) {
    setText(object, "vs_appContainerBundleIdentifier", *bundle);
  }
  if (item.putBackPath) setText(object, "putBackPath", *item.putBackPath);
  setText(object, "path", item.path);
  return object;
}

}  // namespace mirabel
