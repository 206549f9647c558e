#include "host/bus/BusStatus.h"

#include <sdbus-c++/sdbus-c++.h>

#include "host/bus/BusDictionary.h"
#include "host/bus/BusText.h"

namespace mirabel::bus {
namespace {

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
    ofStatus<&StatusReport::appLibrariesFailure>("appLibrariesFailure", "s"),
    Property<StatusReport>{"leftOut", "a(ss)", readLeftOut},
    ofStatus<&StatusReport::home>("home", "ay"),
    ofStatus<&StatusReport::stateFolder>("stateFolder", "ay"),
};

void writeLeftOut(sdbus::Message& message,
                  const std::vector<StatusReport::LeftOutApplication>& applications) {
  message.openContainer("(ss)");
  for (const auto& [identifier, reason] : applications) {
    message.openStruct("ss");
    message << shown(identifier) << shown(reason);
    message.closeStruct();
  }
  message.closeContainer();
}

}  // namespace

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
  if (status.appLibrariesFailure) {
    writer.addText("appLibrariesFailure", *status.appLibrariesFailure);
  }
  writer.addWritten("leftOut", "a(ss)",
                    [&](sdbus::Message& to) { writeLeftOut(to, status.leftOut); });
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

}  // namespace mirabel::bus
