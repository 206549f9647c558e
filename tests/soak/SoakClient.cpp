#include "soak/SoakClient.h"

#include <algorithm>
#include <functional>

#include "host/bus/BusOptions.h"

namespace mirabel::testing {
namespace {

using Page = std::vector<std::uint8_t>;

void require(bool holds, const std::string& what) {
  if (!holds) throw SoakFailure{what};
}

BusClient::Answer required(BusClient::Answer answer) {
  require(answer.error.empty(), answer.error + ": " + answer.message);
  return answer;
}

}  // namespace

std::vector<std::string> sortedIdentifiers(const std::vector<ItemRecord>& items) {
  std::vector<std::string> identifiers;
  for (const ItemRecord& item : items)
    identifiers.push_back(item.itemIdentifier);
  std::sort(identifiers.begin(), identifiers.end());
  return identifiers;
}

std::size_t list(BusClient& client, const std::string& container, std::vector<ItemRecord>& items) {
  Page page;
  std::size_t calls = 0;
  do {
    auto answer = required(client.provider("ListItems", container, page));
    const auto some = bus::readItems(answer.reply);
    items.insert(items.end(), some.begin(), some.end());
    page = bus::readBytes(answer.reply);
    ++calls;
  } while (!page.empty());
  return calls;
}

void SoakClient::connect() {
  client_ = std::make_unique<BusClient>(longestAnswer);
}

std::size_t SoakClient::pick(std::size_t count) {
  return std::uniform_int_distribution<std::size_t>(0, count - 1)(random_);
}

std::size_t SoakClient::step() {
  static_cast<void>(client_->takeSignals());
  switch (pick(16)) {
    case 0:
      return listFolder();
    case 1:
      return leaveInTheMiddle();
    case 2:
    case 3:
      return follow();
    case 4:
      required(client_->provider(pick(2) == 0 ? "Watch" : "Unwatch", truth_.busyFolder));
      return 1;
    case 5:
      return search();
    case 6:
    case 7:
      return sendNonsense();
    default:
      return lookUp();
  }
}

std::size_t SoakClient::lookUp() {
  const std::string& identifier = truth_.identifiers[pick(truth_.identifiers.size())];
  const ItemRecord item = BusClient::item(required(client_->provider("GetItem", identifier)));
  require(item.itemIdentifier == identifier && item.filename == truth_.names.at(identifier),
          "an item was answered that was not asked for");
  return 1;
}

std::size_t SoakClient::listFolder() {
  const auto folder = std::next(truth_.folders.begin(), pick(truth_.folders.size()));
  std::vector<ItemRecord> items;
  const std::size_t calls = list(*client_, folder->first, items);
  require(sortedIdentifiers(items) == folder->second, "a listing is not what lies in the folder");
  return calls;
}

std::size_t SoakClient::leaveInTheMiddle() {
  const auto folder = std::next(truth_.folders.begin(), pick(truth_.folders.size()));
  {
    auto message = client_->methodCall(bus::providerInterface, "ListItems");
    message << folder->first << Page();
    message.dontExpectReply();
    static_cast<void>(client_->send(message));
  }  // a message goes before its connection
  connect();
  return 1;
}

std::size_t SoakClient::follow() {
  if (anchor_.empty()) {
    anchor_ =
        BusClient::bytes(required(client_->provider("GetCurrentSyncAnchor", truth_.busyFolder)));
    return 1;
  }
  auto answer = required(client_->provider("EnumerateChanges", truth_.busyFolder, anchor_));
  for (const ItemRecord& item : bus::readItems(answer.reply)) {
    require(
        item.parentItemIdentifier == truth_.busyFolder || item.itemIdentifier == truth_.busyFolder,
        "a change of another folder was told");
  }
  std::vector<std::string> deleted;
  answer.reply >> deleted;
  anchor_ = bus::readBytes(answer.reply);
  require(!anchor_.empty(), "there is an anchor to go on from");
  return 1;
}

std::size_t SoakClient::search() {
  const std::string& identifier = truth_.identifiers[pick(truth_.identifiers.size())];
  const std::vector<std::string> words{truth_.names.at(identifier)};
  const auto found = sortedIdentifiers(
      BusClient::items(required(client_->provider("Search", words, bus::Options()))));
  require(std::binary_search(found.begin(), found.end(), identifier),
          "a file is not found by its name");
  return 1;
}

// Each gets an error that has a name of ours or of the bus.
std::size_t SoakClient::sendNonsense() {
  const std::function<BusClient::Answer()> kinds[] = {
      [&] { return client_->provider("GetItem", std::string(100'000, 'x')); },
      [&] { return client_->provider("ListItems", truth_.busyFolder, Page(500, 0xA5)); },
      [&] { return client_->operations("Explode"); }};
  const auto answer = kinds[pick(std::size(kinds))]();
  require(answer.error.starts_with("com.norvane.Vessel1.Error.") ||
              answer.error.starts_with("org.freedesktop.DBus.Error."),
          "nonsense was answered with " + answer.error + ": " + answer.message);
  return 1;
}

std::size_t SoakClient::askWithoutReading(const SoakTruth& truth, std::size_t calls) {
  const auto connection = sdbus::createSessionBusConnection();
  const auto service = sdbus::createProxy(*connection, bus::serviceName, bus::objectPath);
  for (std::size_t i = 0; i < calls; ++i) {
    auto message = service->createMethodCall(bus::providerInterface, "ListItems");
    message << truth.folders.begin()->first << Page();
    // It would like to know, but never looks.
    static_cast<void>(
        service->callMethod(message, [](sdbus::MethodReply&, const sdbus::Error*) {}));
  }
  return calls;
}

}  // namespace mirabel::testing
