#include "host/bus/BusItems.h"

#include <sdbus-c++/sdbus-c++.h>

#include "host/bus/BusDictionary.h"
#include "mirabel/TagData.h"

namespace mirabel::bus {
namespace {

template <auto member>
constexpr Property<ItemRecord> ofItem(std::string_view key, std::string_view signatures) {
  return {key, signatures,
          [](sdbus::Message& message, std::string_view signature, ItemRecord& item) {
            readMember<member>(message, signature, item);
          }};
}

// Of a text and its bytes, the bytes are written behind the text, and so count.
constexpr std::array itemProperties{
    ofItem<&ItemRecord::itemIdentifier>("itemIdentifier", "s"),
    ofItem<&ItemRecord::itemIdentifier>("itemIdentifierBytes", "ay"),
    ofItem<&ItemRecord::parentItemIdentifier>("parentItemIdentifier", "s"),
    ofItem<&ItemRecord::parentItemIdentifier>("parentItemIdentifierBytes", "ay"),
    ofItem<&ItemRecord::filename>("filename", "s"),
    ofItem<&ItemRecord::filename>("filenameBytes", "ay"),
    ofItem<&ItemRecord::typeIdentifier>("typeIdentifier", "s"),
    ofItem<&ItemRecord::documentSize>("documentSize", numberTypes),
    ofItem<&ItemRecord::creationDate>("creationDate", "(xu)"),
    ofItem<&ItemRecord::contentModificationDate>("contentModificationDate", "(xu)"),
    ofItem<&ItemRecord::childItemCount>("childItemCount", "q"),
    ofItem<&ItemRecord::capabilities>("capabilities", "t"),
    ofItem<&ItemRecord::isTrashed>("isTrashed", "b"),
    ofItem<&ItemRecord::lastUsedDate>("lastUsedDate", "(xu)"),
    ofItem<&ItemRecord::tagData>("tagData", "ay"),
    ofItem<&ItemRecord::favoriteRank>("favoriteRank", numberTypes),
    ofItem<&ItemRecord::fileID>("fileID", "t"),
    ofItem<&ItemRecord::docID>("docID", "t"),
    ofItem<&ItemRecord::beaconDomainIdentifier>("vs_beaconDomainIdentifier", "s"),
    ofItem<&ItemRecord::beaconDomainIdentifier>("vs_beaconDomainIdentifierBytes", "ay"),
    ofItem<&ItemRecord::appContainerBundleIdentifier>("vs_appContainerBundleIdentifier", "s"),
    ofItem<&ItemRecord::appContainerBundleIdentifier>("vs_appContainerBundleIdentifierBytes", "ay"),
    ofItem<&ItemRecord::putBackPath>("putBackPath", "ay"),
    ofItem<&ItemRecord::path>("path", "ay"),
};

void addTags(DictionaryWriter& writer, const Data& tagData) {
  std::vector<std::string> labels;
  for (const Tag& tag : decodeTagData(tagData).value_or(std::vector<Tag>()))
    labels.push_back(tag.label);
  writer.addWritten("tags", "as", [&](sdbus::Message& message) { write(message, labels); });
  writer.add("tagData", "ay", tagData);
}

}  // namespace

void write(sdbus::Message& message, const ItemRecord& item) {
  DictionaryWriter writer(message);
  writer.addText("itemIdentifier", item.itemIdentifier);
  writer.addText("parentItemIdentifier", item.parentItemIdentifier);
  writer.addText("filename", item.filename);
  writer.add("typeIdentifier", "s", item.typeIdentifier);
  writer.addNumber("documentSize", item.documentSize);
  writer.addDate("creationDate", item.creationDate);
  writer.addDate("contentModificationDate", item.contentModificationDate);
  if (item.childItemCount) writer.add("childItemCount", "q", *item.childItemCount);
  writer.add("capabilities", "t", item.capabilities);
  writer.add("isTrashed", "b", item.isTrashed);
  writer.addDate("lastUsedDate", item.lastUsedDate);
  if (item.tagData) addTags(writer, *item.tagData);
  writer.addNumber("favoriteRank", item.favoriteRank);
  if (item.fileID) writer.add("fileID", "t", *item.fileID);
  if (item.docID) writer.add("docID", "t", *item.docID);
  if (const auto& domain = item.beaconDomainIdentifier) {
    writer.addText("vs_beaconDomainIdentifier", *domain);
  }
  if (const auto& bundle = item.appContainerBundleIdentifier) {
    writer.addText("vs_appContainerBundleIdentifier", *bundle);
  }
  if (item.putBackPath) writer.addBytes("putBackPath", *item.putBackPath);
  if (!item.path.empty()) writer.addBytes("path", item.path);
  writer.end();
}

void write(sdbus::Message& message, const std::vector<ItemRecord>& items) {
  message.openContainer("a{sv}");
  for (const ItemRecord& item : items)
    write(message, item);
  message.closeContainer();
}

ItemRecord readItem(sdbus::Message& message) {
  return readDictionary<ItemRecord>(message, itemProperties);
}

std::vector<ItemRecord> readItems(sdbus::Message& message) {
  std::vector<ItemRecord> items;
  message.enterContainer("a{sv}");
  while (!isAtEnd(message))
    items.push_back(readItem(message));
  message.exitContainer();
  return items;
}

void write(sdbus::Message& message, const Data& bytes) {
  message << bytes;
}

Data readBytes(sdbus::Message& message) {
  return readValue<Data>(message);
}

void write(sdbus::Message& message, const std::vector<std::string>& texts) {
  message.openContainer("s");
  for (const std::string& text : texts)
    if (isBusText(text)) message << text;
  message.closeContainer();
}

}  // namespace mirabel::bus
