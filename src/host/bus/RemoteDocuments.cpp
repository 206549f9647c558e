#include "host/bus/RemoteDocuments.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "host/bus/BusConnection.h"
#include "host/bus/BusErrors.h"
#include "host/bus/BusItems.h"
#include "host/bus/BusNames.h"
#include "host/bus/BusOptions.h"
#include "host/bus/BusQueries.h"
#include "host/bus/BusStatus.h"
#include "host/bus/BusText.h"
#include "host/bus/RemoteWatches.h"
#include "platform/VesselManager.h"

namespace mirabel::bus {
namespace {

using Write = BusConnection::Write;

/// An identifier as an argument. None holds what is no text for the bus: there is no such item, as
/// the service would say.
struct Identifier {
  explicit Identifier(std::string_view identifier) : text(identifier) {}
  std::string text;
};

sdbus::Message& operator<<(sdbus::Message& call, const Identifier& identifier) {
  if (!isBusText(identifier.text)) throw errorForBus(Error::nonExistentItem(identifier.text));
  return call << identifier.text;
}

/// Writes arguments that the bus has types for.
template <class... Arguments>
Write arguments(const Arguments&... values) {
  return [values...](sdbus::Message& call) { (call << ... << values); };
}

/// A name for arguments "sa{sv}" at the end of others: as text, or as bytes in the options.
struct NameArgument {
  explicit NameArgument(const std::string& name) {
    setNameOption(options, "name", name);
    text = textOption(options, "name").value_or("");
    options.erase("name");
  }
  std::string text;
  Options options;
};

/// Which of a document's names is meant.
void setPlace(Options& options, const ItemTarget& item) {
  if (!item.path.empty()) options["path"] = sdbus::Variant(dataFromString(item.path));
}

Options placeOptions(const ItemTarget& item) {
  Options options;
  setPlace(options, item);
  return options;
}

/// A container that is asked for with each question.
class RemoteContainer final : public DocumentContainer {
 public:
  RemoteContainer(std::shared_ptr<BusConnection> connection, std::string_view identifier)
      : connection_(std::move(connection)), identifier_(identifier) {}

  Result<ItemPage> items(const Data& page) override {
    // For the service that would be the first one, and it is none that was handed out.
    if (page.empty()) return fail(Error::syncAnchorExpired());
    return connection_->call(providerInterface, "ListItems", arguments(identifier_, page),
                             [](sdbus::Message& reply) {
                               ItemPage answer;
                               answer.items = readItems(reply);
                               Data next = readBytes(reply);
                               if (!next.empty()) answer.nextPage = std::move(next);
                               return answer;
                             });
  }
  Result<ItemChanges> changes(const Data& anchor) override {
    return connection_->call(providerInterface, "EnumerateChanges", arguments(identifier_, anchor),
                             [](sdbus::Message& reply) {
                               ItemChanges answer;
                               answer.updated = readItems(reply);
                               reply >> answer.deleted;
                               answer.anchor = readBytes(reply);
                               reply >> answer.moreComing;
                               return answer;
                             });
  }
  Result<Data> currentSyncAnchor() override {
    return connection_->call(providerInterface, "GetCurrentSyncAnchor", arguments(identifier_),
                             readBytes);
  }

 private:
  std::shared_ptr<BusConnection> connection_;
  Identifier identifier_;
};

/// A reply that holds something else than an item: whoever waits for the answer must hear of it.
Documents::ItemResult itemIn(sdbus::Message& reply) {
  try {
    return readItem(reply);
  } catch (const sdbus::Error& error) {
    return fail(errorFromBus(error));
  }
}

/// A service that does not know this leaves errors without information.
void describeErrors(BusConnection& connection) {
  connection.callAsync(managerInterface, "DescribeErrors", {},
                       [](sdbus::Message*, const Error&) {});
}

/// Begins an operation that hands back the item.
void begin(BusConnection& connection, const char* method, const Write& write,
           Documents::ItemHandler handler) {
  connection.callInTurn(operationsInterface, method, write,
                        [handler = std::move(handler)](sdbus::Message* reply, const Error& error) {
                          if (reply == nullptr) return handler(fail(error));
                          handler(itemIn(*reply));
                        });
}

void beginWithoutItem(BusConnection& connection, const char* interface, const char* method,
                      const Write& write, Documents::ErrorHandler handler) {
  connection.callInTurn(interface, method, write,
                        [handler = std::move(handler)](sdbus::Message* reply, const Error& error) {
                          handler(reply == nullptr ? std::optional(error) : std::nullopt);
                        });
}

}  // namespace

std::unique_ptr<RemoteDocuments> RemoteDocuments::connect(const HomePlaces& places,
                                                          std::chrono::milliseconds patience) {
  auto connection = BusConnection::open();
  if (!connection) return nullptr;
  const auto readPlaces = [](sdbus::Message& reply) {
    HomePlaces answer;
    answer.home = stringView(readBytes(reply));
    answer.stateFolder = stringView(readBytes(reply));
    return answer;
  };
  const auto served = connection->call(managerInterface, "GetHome", {}, readPlaces, patience);
  if (!served || *served != places) return nullptr;
  describeErrors(*connection);
  return std::unique_ptr<RemoteDocuments>(new RemoteDocuments(std::move(connection), places));
}

bool RemoteDocuments::hasBus() {
  return BusConnection::hasBus();
}

RemoteDocuments::RemoteDocuments(std::shared_ptr<BusConnection> connection, HomePlaces places)
    : connection_(std::move(connection)),
      watches_(std::make_shared<RemoteWatches>(*connection_)),
      places_(std::move(places)) {
  connection_->listen(
      [watches = watches_](const std::string& container) { watches->signalled(container); },
      [connection = connection_.get(), watches = watches_](bool isThere) {
        if (isThere) describeErrors(*connection);
        watches->serviceMoved(isThere);
      });
}

RemoteDocuments::~RemoteDocuments() {
  connection_->end();
}

Documents::ItemResult RemoteDocuments::item(std::string_view identifier) {
  return connection_->call(providerInterface, "GetItem", arguments(Identifier(identifier)),
                           readItem);
}

Documents::ItemResult RemoteDocuments::itemAtPath(const std::string& path) {
  return connection_->call(providerInterface, "GetItemAtPath", arguments(dataFromString(path)),
                           readItem);
}

Result<std::unique_ptr<DocumentContainer>> RemoteDocuments::container(std::string_view identifier) {
  auto container = std::make_unique<RemoteContainer>(connection_, identifier);
  // These are always there; and an anchor of the working set is more than a question.
  if (identifier == VesselWorkingSetContainerItemIdentifier ||
      identifier == VesselAllDirectoriesContainerItemIdentifier)
    return container;
  const auto anchor = container->currentSyncAnchor();
  const bool isThere = anchor || anchor.error().is(LocalVesselError::unableToGetDeviceUUID);
  if (!isThere) return fail(anchor.error());
  return container;
}

Result<std::unique_ptr<ContainerWatch>> RemoteDocuments::watch(std::string_view identifier,
                                                               std::function<void()> changed) {
  if (!isBusText(identifier)) return fail(Error::nonExistentItem(identifier));
  return RemoteWatches::add(watches_, std::string(identifier), std::move(changed));
}

Result<UniqueFd> RemoteDocuments::openFile(std::string_view identifier, Access access) {
  const std::string mode = access == Access::reading ? "r" : "rw";
  return connection_->call(providerInterface, "OpenItem", arguments(Identifier(identifier), mode),
                           [](sdbus::Message& reply) {
                             sdbus::UnixFd file;
                             reply >> file;
                             return UniqueFd(file.release());
                           });
}

void RemoteDocuments::importDocument(const std::string& source, const std::string& parent,
                                     ItemHandler handler) {
  begin(*connection_, "ImportPath", arguments(dataFromString(source), Identifier(parent)),
        std::move(handler));
}

void RemoteDocuments::createDirectory(const std::string& name, const std::string& parent,
                                      ItemHandler handler) {
  const NameArgument named(name);
  begin(*connection_, "CreateDirectory", arguments(named.text, Identifier(parent), named.options),
        std::move(handler));
}

void RemoteDocuments::rename(const ItemTarget& item, const std::string& name, ItemHandler handler) {
  NameArgument named(name);
  setPlace(named.options, item);
  begin(*connection_, "Rename",
        arguments(Identifier(item.itemIdentifier), named.text, named.options), std::move(handler));
}

void RemoteDocuments::reparent(const ItemTarget& item, const std::string& parent,
                               const std::optional<std::string>& newName, ItemHandler handler) {
  Options options = placeOptions(item);
  if (newName) setNameOption(options, "name", *newName);
  begin(*connection_, "Reparent",
        arguments(Identifier(item.itemIdentifier), Identifier(parent), options),
        std::move(handler));
}

void RemoteDocuments::remove(const ItemTarget& item, ErrorHandler handler) {
  beginWithoutItem(*connection_, operationsInterface, "Delete",
                   arguments(Identifier(item.itemIdentifier), placeOptions(item)),
                   std::move(handler));
}

void RemoteDocuments::trash(const ItemTarget& item, ItemHandler handler) {
  begin(*connection_, "Trash", arguments(Identifier(item.itemIdentifier), placeOptions(item)),
        std::move(handler));
}

void RemoteDocuments::restore(const ItemTarget& item, const std::optional<std::string>& parent,
                              ItemHandler handler) {
  if (parent && !isBusText(*parent)) return handler(fail(Error::nonExistentItem(*parent)));
  Options options = placeOptions(item);
  if (parent) options["parent"] = sdbus::Variant(*parent);
  begin(*connection_, "Restore", arguments(Identifier(item.itemIdentifier), options),
        std::move(handler));
}

void RemoteDocuments::setLastUsedDate(const std::string& identifier,
                                      const std::optional<Date>& date, ItemHandler handler) {
  const std::string text = date ? date->rfc3339() : std::string();
  begin(*connection_, "SetLastUsedDate", arguments(Identifier(identifier), text),
        std::move(handler));
}

void RemoteDocuments::setTagData(const std::string& identifier, const std::optional<Data>& tagData,
                                 ItemHandler handler) {
  begin(*connection_, "SetTagData", arguments(Identifier(identifier), tagData.value_or(Data())),
        std::move(handler));
}

void RemoteDocuments::setFavoriteRank(const std::string& identifier,
                                      const std::optional<Number>& rank, ItemHandler handler) {
  if (!rank) {
    return begin(*connection_, "ClearFavoriteRank", arguments(Identifier(identifier)),
                 std::move(handler));
  }
  const auto variant =
      std::visit([](const auto& value) { return sdbus::Variant(value); }, rank->value);
  begin(*connection_, "SetFavoriteRank", arguments(Identifier(identifier), variant),
        std::move(handler));
}

Result<TrashFindings> RemoteDocuments::itemsTrashedBefore(const Date& date) {
  return connection_->call(managerInterface, "FindTrashedItems", arguments(date.rfc3339()),
                           [](sdbus::Message& reply) {
                             TrashFindings found;
                             found.old = readTrashedItems(reply);
                             reply >> found.undated;
                             return found;
                           });
}

void RemoteDocuments::removeItemsTrashedBefore(const Date& date, ErrorHandler handler) {
  beginWithoutItem(*connection_, managerInterface, "RemoveTrashedItems", arguments(date.rfc3339()),
                   std::move(handler));
}

Progress RemoteDocuments::progress() {
  const auto progress =
      connection_->call(managerInterface, "GetProgress", {}, [](sdbus::Message& reply) {
        Progress answer;
        reply >> answer.entriesCopied >> answer.bytesCopied >> answer.entriesRemoved;
        return answer;
      });
  return progress.value_or(Progress());
}

Result<std::vector<ItemRecord>> RemoteDocuments::appLibraries() {
  return connection_->call(providerInterface, "ListAppLibraries", {}, readItems);
}

Result<ApplicationContainer> RemoteDocuments::applicationContainer(const std::string& bundle) {
  return connection_->call(providerInterface, "GetDefaultContainer", arguments(shown(bundle)),
                           [](sdbus::Message& reply) {
                             ApplicationContainer container;
                             container.item = readItem(reply);
                             reply >> container.isAppLibrary;
                             return container;
                           });
}

Result<std::optional<Data>> RemoteDocuments::icon(const std::string& identifier,
                                                  std::uint32_t side) {
  return connection_->call(providerInterface, "GetIcon", arguments(Identifier(identifier), side),
                           [](sdbus::Message& reply) {
                             Data picture = readBytes(reply);
                             return picture.empty() ? std::nullopt
                                                    : std::optional(std::move(picture));
                           });
}

Result<std::vector<ItemRecord>> RemoteDocuments::search(const SearchQuery& query) {
  return connection_->call(providerInterface, "Search",
                           arguments(wordsFor(query), optionsFor(query)), readItems);
}

Result<std::vector<ItemRecord>> RemoteDocuments::recent(std::size_t limit) {
  return connection_->call(providerInterface, "GetRecent", arguments(limited(limit)), readItems);
}

Result<std::vector<ItemRecord>> RemoteDocuments::favorites(std::size_t limit) {
  return connection_->call(providerInterface, "GetFavorites", arguments(limited(limit)), readItems);
}

Result<StatusReport> RemoteDocuments::status() {
  return connection_->call(managerInterface, "GetStatus", {}, readStatus);
}

}  // namespace mirabel::bus
