#include <cerrno>
#include <utility>

#include "host/bus/BusCall.h"
#include "host/bus/BusNames.h"
#include "host/bus/BusOptions.h"
#include "host/bus/BusQueries.h"
#include "platform/EnumerationObservers.h"

namespace mirabel::bus {
namespace {

using CallPointer = std::shared_ptr<BusCall>;

constexpr std::uint32_t largestIcon = 4096;

void getItem(const CallPointer& call) {
  Documents* documents = call->documents();
  if (documents != nullptr) call->reply(documents->item(call->argument<std::string>()));
}

std::function<bool(BusCall&)> getItemAtOnce(Recall recall) {
  return [recall = std::move(recall)](BusCall& call) {
    if (!call.caller().isKnownToSeeAll()) return false;
    const auto item = recall(call.argument<std::string>());
    if (item) {
      call.reply(*item);
    } else {
      call.readAgain();
    }
    return item != nullptr;
  };
}

void getItemAtPath(const CallPointer& call) {
  Documents* documents = call->allDocuments();
  if (documents == nullptr) return;
  call->reply(documents->itemAtPath(std::string(stringView(call->argument<Data>()))));
}

/// The container that the first argument names; null, and the call is answered, where it can't be
/// had.
DocumentContainer* containerOf(const CallPointer& call) {
  if (call->documents() == nullptr) return nullptr;
  const auto container = call->caller().container(call->argument<std::string>());
  if (container) return *container;
  call->fail(container.error());
  return nullptr;
}

void listItems(const CallPointer& call) {
  DocumentContainer* container = containerOf(call);
  if (container == nullptr) return;
  Data page = call->argument<Data>();
  if (page.empty()) page = dataFromString(VesselInitialPageSortedByName);
  const auto answer = container->items(page);
  if (!answer) return call->fail(answer.error());
  call->reply([&](sdbus::Message& reply) {
    write(reply, answer->items);
    write(reply, answer->nextPage.value_or(Data()));
  });
}

void getCurrentSyncAnchor(const CallPointer& call) {
  DocumentContainer* container = containerOf(call);
  if (container == nullptr) return;
  const auto anchor = container->currentSyncAnchor();
  if (!anchor) return call->fail(anchor.error());
  call->reply([&](sdbus::Message& reply) { write(reply, *anchor); });
}

void enumerateChanges(const CallPointer& call) {
  DocumentContainer* container = containerOf(call);
  if (container == nullptr) return;
  const auto changes = container->changes(call->argument<Data>());
  if (!changes) return call->fail(changes.error());
  call->reply([&](sdbus::Message& reply) {
    write(reply, changes->updated);
    write(reply, changes->deleted);
    write(reply, changes->anchor);
    reply << changes->moreComing;
  });
}

void watch(const CallPointer& call, const Signaller& signaller) {
  if (call->documents() == nullptr) return;
  const auto container = call->argument<std::string>();
  const auto watching = call->caller().watch(
      container,
      [signaller, container, name = call->caller().name()] { signaller(name, container); });
  if (!watching) return call->fail(watching.error());
  call->reply();
}

void unwatch(const CallPointer& call) {
  if (call->documents() == nullptr) return;
  call->caller().unwatch(call->argument<std::string>());
  call->reply();
}

void openItem(const CallPointer& call) {
  Documents* documents = call->documents();
  if (documents == nullptr) return;
  const auto identifier = call->argument<std::string>();
  const auto mode = call->argument<std::string>();
  if (mode != "r" && mode != "rw") return call->failInvalid("the mode is \"r\" or \"rw\"");
  auto file = documents->openFile(
      identifier, mode == "r" ? Documents::Access::reading : Documents::Access::readingAndWriting);
  if (!file) return call->fail(file.error());
  const sdbus::UnixFd handedOut(file->release(), sdbus::adopt_fd);
  call->reply([&](sdbus::Message& reply) { reply << handedOut; });
}

void getIcon(const CallPointer& call) {
  Documents* documents = call->documents();
  if (documents == nullptr) return;
  const auto identifier = call->argument<std::string>();
  const auto side = call->argument<std::uint32_t>();
  if (side < 1 || side > largestIcon) return call->fail(Error::posix(EINVAL, "1 to 4096 pixels"));
  const auto picture = documents->icon(identifier, side);
  if (!picture) return call->fail(picture.error());
  call->reply([&](sdbus::Message& reply) { write(reply, picture->value_or(Data())); });
}

void getDefaultContainer(const CallPointer& call) {
  Documents* documents = call->documents();
  if (documents == nullptr) return;
  const auto container = documents->applicationContainer(call->argument<std::string>());
  if (!container) return call->fail(container.error());
  call->reply([&](sdbus::Message& reply) {
    write(reply, container->item);
    reply << container->isAppLibrary;
  });
}

void listAppLibraries(const CallPointer& call) {
  Documents* documents = call->documents();
  if (documents != nullptr) call->reply(documents->appLibraries());
}

void search(const CallPointer& call) {
  Documents* documents = call->documents();
  if (documents == nullptr) return;
  auto words = call->argument<std::vector<std::string>>();
  const auto options = call->argument<Options>();
  const auto query = queryFrom(std::move(words), options);
  if (!query) return call->failInvalid(query.error());
  call->reply(documents->search(*query));
}

void getRecent(const CallPointer& call) {
  Documents* documents = call->documents();
  if (documents == nullptr) return;
  call->reply(documents->recent(std::min(call->argument<std::uint32_t>(), mostFound)));
}

void getFavorites(const CallPointer& call) {
  Documents* documents = call->documents();
  if (documents == nullptr) return;
  call->reply(documents->favorites(std::min(call->argument<std::uint32_t>(), mostFound)));
}

}  // namespace

std::vector<BusMethod> providerMethods(Signaller signaller, Recall recall) {
  constexpr const char* of = providerInterface;
  constexpr const char* item = "a{sv}";
  constexpr const char* items = "aa{sv}";
  return {
      {of,
       "GetItem",
       "s",
       {"itemIdentifier"},
       item,
       {"item"},
       Lane::lookups,
       getItem,
       getItemAtOnce(std::move(recall))},
      {of, "GetItemAtPath", "ay", {"path"}, item, {"item"}, Lane::lookups, getItemAtPath},
      {of,
       "ListItems",
       "say",
       {"container", "page"},
       "aa{sv}ay",
       {"items", "nextPage"},
       Lane::enumerations,
       listItems},
      {of,
       "GetCurrentSyncAnchor",
       "s",
       {"container"},
       "ay",
       {"anchor"},
       Lane::enumerations,
       getCurrentSyncAnchor},
      {of,
       "EnumerateChanges",
       "say",
       {"container", "anchor"},
       "aa{sv}asayb",
       {"updated", "deleted", "anchor", "moreComing"},
       Lane::enumerations,
       enumerateChanges},
      {of,
       "Watch",
       "s",
       {"container"},
       "",
       {},
       Lane::enumerations,
       [signaller = std::move(signaller)](const CallPointer& call) { watch(call, signaller); }},
      {of, "Unwatch", "s", {"container"}, "", {}, Lane::enumerations, unwatch},
      {of, "OpenItem", "ss", {"itemIdentifier", "mode"}, "h", {"file"}, Lane::lookups, openItem},
      {of,
       "GetIcon",
       "su",
       {"itemIdentifier", "side"},
       "ay",
       {"picture"},
       Lane::enumerations,
       getIcon},
      {of,
       "GetDefaultContainer",
       "s",
       {"bundleIdentifier"},
       "a{sv}b",
       {"item", "isAppLibrary"},
       Lane::lookups,
       getDefaultContainer},
      {of, "ListAppLibraries", "", {}, items, {"items"}, Lane::enumerations, listAppLibraries},
      {of, "Search", "asa{sv}", {"words", "options"}, items, {"items"}, Lane::enumerations, search},
      {of, "GetRecent", "u", {"limit"}, items, {"items"}, Lane::enumerations, getRecent},
      {of, "GetFavorites", "u", {"limit"}, items, {"items"}, Lane::enumerations, getFavorites},
  };
}

}  // namespace mirabel::bus
