// A service's answer that is made of the bytes, of the types that are called for or of others: what
// the client reads of it can be printed, and is the same when it is sent on and read again.

#include <nlohmann/json.hpp>

#include "BusMessages.h"
#include "Require.h"
#include "cli/ItemJSON.h"
#include "foundation/Unicode.h"
#include "host/bus/BusItems.h"
#include "host/bus/BusStatus.h"

using namespace mirabel;

namespace {

using Bytes = ByteSource;

constexpr std::array itemKeys{"itemIdentifier",
                              "itemIdentifierBytes",
                              "parentItemIdentifier",
                              "parentItemIdentifierBytes",
                              "filename",
                              "filenameBytes",
                              "typeIdentifier",
                              "documentSize",
                              "creationDate",
                              "contentModificationDate",
                              "childItemCount",
                              "capabilities",
                              "isTrashed",
                              "lastUsedDate",
                              "tagData",
                              "tags",
                              "favoriteRank",
                              "fileID",
                              "docID",
                              "vs_beaconDomainIdentifier",
                              "vs_beaconDomainIdentifierBytes",
                              "vs_appContainerBundleIdentifier",
                              "vs_appContainerBundleIdentifierBytes",
                              "putBackPath",
                              "path"};
constexpr std::array statusKeys{"watcher",           "watching",
                                "refusal",           "needsMarks",
                                "foldersWatched",    "marksNeeded",
                                "marksAllowed",      "marksSetting",
                                "historyUUID",       "unreadableFolders",
                                "firstEventID",      "lastEventID",
                                "appLibraries",      "leftOut",
                                "appLibraryVersion", "home",
                                "stateFolder",       "appLibrariesFailure"};

void requireSound(const std::optional<Date>& date) {
  require(!date || date->nanoseconds < 1'000'000'000);
}

void requireSound(const ItemRecord& item) {
  requireSound(item.creationDate);
  requireSound(item.contentModificationDate);
  requireSound(item.lastUsedDate);
  require(isUTF8(itemJSON(item).dump()));
}

template <class Value>
auto sentOn(const Value& value) {
  return BusMessages::sent([&](sdbus::Message& message) { bus::write(message, value); });
}

void checkItems(sdbus::Message& message) {
  const auto items = bus::readItems(message);
  for (const ItemRecord& item : items)
    requireSound(item);
  auto again = sentOn(items);
  require(bus::readItems(again) == items);
}

bool areEqual(const StatusReport& a, const StatusReport& b) {
  const auto isSame = [](const auto& x, const auto& y) {
    return x.identifier == y.identifier && x.reason == y.reason;
  };
  return a.watcher == b.watcher && a.watching == b.watching && a.refusal == b.refusal &&
         a.needsMarks == b.needsMarks && a.foldersWatched == b.foldersWatched &&
         a.marksNeeded == b.marksNeeded && a.marksAllowed == b.marksAllowed &&
         a.marksSetting == b.marksSetting && a.unreadableFolders == b.unreadableFolders &&
         a.historyUUID == b.historyUUID && a.firstEventID == b.firstEventID &&
         a.lastEventID == b.lastEventID && a.appLibraries == b.appLibraries &&
         a.appLibraryVersion == b.appLibraryVersion &&
         a.appLibrariesFailure == b.appLibrariesFailure &&
         std::ranges::equal(a.leftOut, b.leftOut, isSame) && a.home == b.home &&
         a.stateFolder == b.stateFolder;
}

void checkStatus(sdbus::Message& message) {
  const StatusReport status = bus::readStatus(message);
  auto again = sentOn(status);
  require(areEqual(bus::readStatus(again), status));
}

void checkTrashedItems(sdbus::Message& message) {
  const auto items = bus::readTrashedItems(message);
  for (const TrashedItem& item : items)
    requireSound(item.trashDate);
  auto message2 = sentOn(items);
  const auto again = bus::readTrashedItems(message2);
  require(std::ranges::equal(items, again, [](const TrashedItem& a, const TrashedItem& b) {
    return a.itemIdentifier == b.itemIdentifier && a.path == b.path && a.trashDate == b.trashDate;
  }));
}

/// aa{sv}, as listings are.
void writeItems(sdbus::Message& message, Bytes& source) {
  BusMessages messages(source);
  message.openContainer("a{sv}");
  for (std::size_t count = source.below(4); count > 0; --count)
    messages.dictionary(message, itemKeys);
  message.closeContainer();
}

void writeTrashedItems(sdbus::Message& message, Bytes& source) {
  BusMessages messages(source);
  message.openContainer("(say(xu))");
  for (std::size_t count = source.below(4); count > 0; --count) {
    message.openStruct("say(xu)");
    message << messages.text() << dataFromString(source.bytes());
    message.openStruct("xu");
    message << source.integer<std::int64_t>() << source.integer<std::uint32_t>();
    message.closeStruct();
    message.closeStruct();
  }
  message.closeContainer();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  ByteSource source(data, size);
  constexpr std::array readers{checkItems, checkStatus, checkTrashedItems};
  const std::size_t kind = source.below(4);
  // Mostly the reader of what is written.
  const std::size_t reader = source.below(8) < 7 ? kind : source.below(readers.size());
  auto message = BusMessages::sent([&](sdbus::Message& to) {
    if (kind == 0) return writeItems(to, source);
    if (kind == 1) return BusMessages(source).dictionary(to, statusKeys);
    if (kind == 2) return writeTrashedItems(to, source);
    BusMessages(source).variant(to);
  });
  try {
    readers[reader % readers.size()](message);
  } catch (const sdbus::Error&) {
    return 0;  // which the connection makes an error of the call
  }
  return 0;
}
