#include "host/bus/BusItems.h"

#include <algorithm>
#include <array>
#include <sdbus-c++/sdbus-c++.h>
#include <string_view>
#include <type_traits>

#include "host/bus/BusText.h"
#include "mirabel/TagData.h"

namespace mirabel::bus {
namespace {

constexpr const char* entry = "sv";
constexpr std::string_view numberTypes = "xtd";

bool isAtEnd(sdbus::Message& message) {
  std::string type;
  std::string contents;
  message.peekType(type, contents);
  return type.empty() || type.front() == 0;
}

void write(sdbus::Message& message, const Date& date) {
  message.openStruct("xu");
  message << date.seconds << date.nanoseconds;
  message.closeStruct();
}

/// Writes one dictionary a{sv}.
class DictionaryWriter {
 public:
  explicit DictionaryWriter(sdbus::Message& message) : message_(message) {
    message_.openContainer("{sv}");
  }
  void end() { message_.closeContainer(); }

  template <class Value>
  void add(const char* key, const char* signature, const Value& value) {
    open(key, signature);
    message_ << value;
    close();
  }
  void addDate(const char* key, const std::optional<Date>& date) {
    if (!date) return;
    open(key, "(xu)");
    write(message_, *date);
    close();
  }
  void addNumber(const char* key, const std::optional<Number>& number) {
    if (!number) return;
    if (const auto* whole = std::get_if<std::int64_t>(&number->value)) return add(key, "x", *whole);
    if (const auto* large = std::get_if<std::uint64_t>(&number->value))
      return add(key, "t", *large);
    add(key, "d", std::get<double>(number->value));
  }
  void addBytes(const char* key, std::string_view bytes) {
    open(key, "ay");
    bus::write(message_, dataFromString(bytes));
    close();
  }
  void addText(const char* key, const std::string& text) {
    if (isBusText(text)) return add(key, "s", text);
    add(key, "s", shown(text));
    addBytes((std::string(key) + "Bytes").c_str(), text);
  }
  void addTags(const std::optional<Data>& tagData) {
    if (!tagData) return;
    std::vector<std::string> labels;
    for (const Tag& tag : decodeTagData(*tagData).value_or(std::vector<Tag>()))
      labels.push_back(tag.label);
    open("tags", "as");
    bus::write(message_, labels);
    close();
    addBytes("tagData", stringView(*tagData));
  }
  void addPairs(const char* key, const std::vector<StatusReport::LeftOutApplication>& pairs) {
    open(key, "a(ss)");
    message_.openContainer("(ss)");
    for (const auto& [identifier, reason] : pairs) {
      message_.openStruct("ss");
      message_ << shown(identifier) << shown(reason);
      message_.closeStruct();
    }
    message_.closeContainer();
    close();
  }

 private:
  void open(const char* key, const char* signature) {
    message_.openDictEntry(entry);
    message_ << key;
    message_.openVariant(signature);
  }
  void close() {
    message_.closeVariant();
    message_.closeDictEntry();
  }

  sdbus::Message& message_;
};

Date readDate(sdbus::Message& message) {
  Date date;
  message.enterStruct("xu");
  message >> date.seconds >> date.nanoseconds;
  message.exitStruct();
  return date;
}

template <class Value>
Value readValue(sdbus::Message& message) {
  Value value{};
  message >> value;
  return value;
}

std::string readByteString(sdbus::Message& message) {
  return std::string(stringView(readBytes(message)));
}

Number readNumber(sdbus::Message& message, std::string_view signature) {
  if (signature == "x") return Number::of(readValue<std::int64_t>(message));
  if (signature == "t") return Number::of(readValue<std::uint64_t>(message));
  return Number::of(readValue<double>(message));
}

/// How the value under a key is read, if it is of one of the types that are expected there.
template <class Record>
struct Property {
  std::string_view key;
  std::string_view signatures;  ///< the type, or those of numbers
  void (*read)(sdbus::Message& message, std::string_view signature, Record& record);
};

template <class Record>
bool isExpected(const Property<Record>& property, std::string_view key,
                std::string_view signature) {
  if (property.key != key) return false;
  if (property.signatures == signature) return true;
  return property.signatures == numberTypes && signature.size() == 1 &&
         numberTypes.find(signature) != std::string_view::npos;
}

/// Reads a dictionary a{sv}; what no property expects is passed over.
template <class Record, std::size_t count>
Record readDictionary(sdbus::Message& message, const std::array<Property<Record>, count>& known) {
  Record record;
  message.enterContainer("{sv}");
  while (message.enterDictEntry(entry)) {
    const auto key = readValue<std::string>(message);
    std::string type;
    std::string signature;
    message.peekType(type, signature);
    const auto property = std::find_if(known.begin(), known.end(), [&](const auto& candidate) {
      return isExpected(candidate, key, signature);
    });
    if (property == known.end()) {
      sdbus::Variant ignored;
      message >> ignored;
    } else {
      message.enterVariant(signature);
      property->read(message, signature, record);
      message.exitVariant();
    }
    message.exitDictEntry();
  }
  message.clearFlags();
  message.exitContainer();
  return record;
}

template <auto member>
void readMember(sdbus::Message& message, std::string_view signature, auto& record) {
  using Value = std::remove_cvref_t<decltype(record.*member)>;
  if constexpr (std::is_same_v<Value, std::optional<Number>>) {
    record.*member = readNumber(message, signature);
  } else if constexpr (std::is_same_v<Value, std::optional<Date>>) {
    record.*member = readDate(message);
  } else if constexpr (std::is_same_v<Value, std::optional<Data>>) {
    record.*member = readBytes(message);
  } else if constexpr (std::is_same_v<Value, std::string> ||
                       std::is_same_v<Value, std::optional<std::string>>) {
    record.*member = signature == "s" ? readValue<std::string>(message) : readByteString(message);
  } else if constexpr (requires { typename Value::value_type; }) {
    record.*member = readValue<typename Value::value_type>(message);
  } else {
    record.*member = readValue<Value>(message);
  }
}

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

template <auto member>
constexpr Property<StatusReport> ofStatus(std::string_view key, std::string_view signatures) {
  return {key, signatures,
          [](sdbus::Message& message, std::string_view signature, StatusReport& status) {
            readMember<member>(message, signature, status);
          }};
}

void readHistory(sdbus::Message& message, std::string_view, StatusReport& status) {
  status.historyUUID = UUID::fromString(readValue<std::string>(message)).value_or(UUID());
}

void readLeftOut(sdbus::Message& message, std::string_view, StatusReport& status) {
  message.enterContainer("(ss)");
  while (message.enterStruct("ss")) {
    StatusReport::LeftOutApplication application;
    message >> application.identifier >> application.reason;
    status.leftOut.push_back(std::move(application));
    message.exitStruct();
  }
  message.clearFlags();
  message.exitContainer();
}

constexpr std::array statusProperties{
    ofStatus<&StatusReport::watcher>("watcher", "s"),
    ofStatus<&StatusReport::watching>("watching", "s"),
    ofStatus<&StatusReport::refusal>("refusal", "s"),
    ofStatus<&StatusReport::needsMarks>("needsMarks", "b"),
    ofStatus<&StatusReport::foldersWatched>("foldersWatched", "t"),
    ofStatus<&StatusReport::marksNeeded>("marksNeeded", "t"),
    ofStatus<&StatusReport::marksAllowed>("marksAllowed", "t"),
    ofStatus<&StatusReport::marksSetting>("marksSetting", "s"),
    ofStatus<&StatusReport::unreadableFolders>("unreadableFolders", "t"),
    Property<StatusReport>{"historyUUID", "s", readHistory},
    ofStatus<&StatusReport::firstEventID>("firstEventID", "t"),
    ofStatus<&StatusReport::lastEventID>("lastEventID", "t"),
    ofStatus<&StatusReport::appLibraries>("appLibraries", "t"),
    ofStatus<&StatusReport::appLibraryVersion>("appLibraryVersion", "t"),
    Property<StatusReport>{"leftOut", "a(ss)", readLeftOut},
    ofStatus<&StatusReport::home>("home", "ay"),
    ofStatus<&StatusReport::stateFolder>("stateFolder", "ay"),
};

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
  writer.addTags(item.tagData);
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

void write(sdbus::Message& message, const StatusReport& status) {
  DictionaryWriter writer(message);
  if (status.watcher) writer.addText("watcher", *status.watcher);
  writer.addText("watching", status.watching);
  if (status.refusal) writer.addText("refusal", *status.refusal);
  writer.add("needsMarks", "b", status.needsMarks);
  writer.add("foldersWatched", "t", status.foldersWatched);
  writer.add("marksNeeded", "t", status.marksNeeded);
  if (status.marksAllowed) writer.add("marksAllowed", "t", *status.marksAllowed);
  writer.addText("marksSetting", status.marksSetting);
  writer.add("unreadableFolders", "t", status.unreadableFolders);
  writer.add("historyUUID", "s", status.historyUUID.description());
  writer.add("firstEventID", "t", status.firstEventID);
  writer.add("lastEventID", "t", status.lastEventID);
  writer.add("appLibraries", "t", status.appLibraries);
  writer.add("appLibraryVersion", "t", status.appLibraryVersion);
  writer.addPairs("leftOut", status.leftOut);
  writer.addBytes("home", status.home);
  writer.addBytes("stateFolder", status.stateFolder);
  writer.end();
}

StatusReport readStatus(sdbus::Message& message) {
  return readDictionary<StatusReport>(message, statusProperties);
}

void write(sdbus::Message& message, const std::vector<TrashedItem>& items) {
  message.openContainer("(say(xu))");
  for (const TrashedItem& item : items) {
    message.openStruct("say(xu)");
    const std::string identifier = item.itemIdentifier.value_or("");
    message << (isBusText(identifier) ? identifier : std::string());
    write(message, dataFromString(item.path));
    write(message, item.trashDate);
    message.closeStruct();
  }
  message.closeContainer();
}

std::vector<TrashedItem> readTrashedItems(sdbus::Message& message) {
  std::vector<TrashedItem> items;
  message.enterContainer("(say(xu))");
  while (!isAtEnd(message)) {
    message.enterStruct("say(xu)");
    TrashedItem item;
    auto identifier = readValue<std::string>(message);
    if (!identifier.empty()) item.itemIdentifier = std::move(identifier);
    item.path = readByteString(message);
    item.trashDate = readDate(message);
    items.push_back(std::move(item));
    message.exitStruct();
  }
  message.exitContainer();
  return items;
}

std::optional<std::string> mistypedOption(const Options& options,
                                          std::initializer_list<KnownOption> known) {
  for (const auto& [key, signature] : known) {
    const auto found = options.find(std::string(key));
    if (found == options.end() || found->second.peekValueType() == signature) continue;
    return "the option \"" + std::string(key) + "\" takes a value of type " +
           std::string(signature);
  }
  return {};
}

std::optional<std::string> textOption(const Options& options, const std::string& key) {
  const auto found = options.find(key);
  if (found == options.end() || !found->second.containsValueOfType<std::string>()) return {};
  return found->second.get<std::string>();
}

std::optional<std::string> nameOption(const Options& options, const std::string& key) {
  const auto bytes = options.find(key + "Bytes");
  if (bytes != options.end() && bytes->second.containsValueOfType<Data>())
    return std::string(stringView(bytes->second.get<Data>()));
  return textOption(options, key);
}

void setNameOption(Options& options, const std::string& key, const std::string& name) {
  if (isBusText(name)) {
    options[key] = sdbus::Variant(name);
  } else {
    options[key + "Bytes"] = sdbus::Variant(dataFromString(name));
  }
}

}  // namespace mirabel::bus
