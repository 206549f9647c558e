#include "soak/SoakClient.h"

#include <algorithm>
#include <functional>

#include "host/bus/BusItems.h"
#include "host/bus/BusNames.h"
#include "host/bus/BusOptions.h"

namespace mirabel::testing {
namespace {

void require(bool holds, const std::string& what) {
  if (!holds) throw SoakFailure{what};
}

std::vector<std::string> sortedIdentifiers(const std::vector<ItemRecord>& items) {
  std::vector<std::string> identifiers;
  for (const ItemRecord& item : items)
    identifiers.push_back(item.itemIdentifier);
  std::sort(identifiers.begin(), identifiers.end());
  return identifiers;
}

}  // namespace

void SoakClient::connect() {
  service_.reset();
  connection_ = sdbus::createSessionBusConnection();
  service_ = sdbus::createProxy(*connection_, bus::serviceName, bus::objectPath);
}

std::size_t SoakClient::pick(std::size_t count) {
  return std::uniform_int_distribution<std::size_t>(0, count - 1)(random_);
}

sdbus::MethodReply SoakClient::call(const char* interface, const char* method,
                                    const std::function<void(sdbus::MethodCall&)>& write) {
  auto message = service_->createMethodCall(interface, method);
  if (write) write(message);
  return service_->callMethod(message, 120'000'000);
}

std::size_t SoakClient::step() {
  switch (pick(16)) {
    case 0:
      return list();
    case 1:
      return leaveInTheMiddle();
    case 2:
    case 3:
      return follow();
    case 4:
      return watch();
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
  auto reply =
      call(bus::providerInterface, "GetItem", [&](auto& message) { message << identifier; });
  const ItemRecord item = bus::readItem(reply);
  require(item.itemIdentifier == identifier && item.filename == truth_.names.at(identifier),
          "an item was answered that was not asked for");
  return 1;
}

std::size_t SoakClient::list() {
  const auto folder = std::next(truth_.folders.begin(), pick(truth_.folders.size()));
  std::vector<ItemRecord> items;
  std::vector<std::uint8_t> page;
  std::size_t calls = 0;
  do {
    auto reply = call(bus::providerInterface, "ListItems",
                      [&](auto& message) { message << folder->first << page; });
    const auto some = bus::readItems(reply);
    items.insert(items.end(), some.begin(), some.end());
    page = bus::readBytes(reply);
    ++calls;
  } while (!page.empty());
  require(sortedIdentifiers(items) == folder->second, "a listing is not what lies in the folder");
  return calls;
}

std::size_t SoakClient::leaveInTheMiddle() {
  const auto folder = std::next(truth_.folders.begin(), pick(truth_.folders.size()));
  {
    auto message = service_->createMethodCall(bus::providerInterface, "ListItems");
    message << folder->first << std::vector<std::uint8_t>();
    message.dontExpectReply();
    static_cast<void>(service_->callMethod(message, 0));
  }
  connect();
  return 1;
}

std::size_t SoakClient::follow() {
  if (anchor_.empty()) {
    auto reply = call(bus::providerInterface, "GetCurrentSyncAnchor",
                      [&](auto& message) { message << truth_.busyFolder; });
    anchor_ = bus::readBytes(reply);
    return 1;
  }
  auto reply = call(bus::providerInterface, "EnumerateChanges",
                    [&](auto& message) { message << truth_.busyFolder << anchor_; });
  for (const ItemRecord& item : bus::readItems(reply)) {
    require(
        item.parentItemIdentifier == truth_.busyFolder || item.itemIdentifier == truth_.busyFolder,
        "a change of another folder was told");
  }
  std::vector<std::string> deleted;
  reply >> deleted;
  anchor_ = bus::readBytes(reply);
  require(!anchor_.empty(), "there is an anchor to go on from");
  return 1;
}

std::size_t SoakClient::watch() {
  const char* method = pick(2) == 0 ? "Watch" : "Unwatch";
  static_cast<void>(
      call(bus::providerInterface, method, [&](auto& message) { message << truth_.busyFolder; }));
  return 1;
}

std::size_t SoakClient::search() {
  const std::string& identifier = truth_.identifiers[pick(truth_.identifiers.size())];
  auto reply = call(bus::providerInterface, "Search", [&](auto& message) {
    message << std::vector<std::string>{truth_.names.at(identifier)} << bus::Options();
  });
  const auto found = sortedIdentifiers(bus::readItems(reply));
  require(std::binary_search(found.begin(), found.end(), identifier),
          "a file is not found by its name");
  return 1;
}

// Each gets an error that has a name of ours or of the bus.
std::size_t SoakClient::sendNonsense() {
  static const std::vector<std::function<void(SoakClient&)>> kinds = {
      [](SoakClient& client) {
        client.call(bus::providerInterface, "GetItem",
                    [](auto& message) { message << std::uint32_t{7}; });
      },
      [](SoakClient& client) {
        client.call(bus::providerInterface, "GetItem",
                    [](auto& message) { message << std::string(100'000, 'x'); });
      },
      [](SoakClient& client) {
        client.call(bus::providerInterface, "ListItems", [&](auto& message) {
          message << client.truth_.busyFolder << std::vector<std::uint8_t>(500, 0xA5);
        });
      },
      [](SoakClient& client) {
        client.call(bus::providerInterface, "EnumerateChanges", [&](auto& message) {
          message << client.truth_.busyFolder << std::vector<std::uint8_t>(3, 1);
        });
      },
      [](SoakClient& client) { client.call(bus::operationsInterface, "Explode"); },
      [](SoakClient& client) {
        client.call(bus::operationsInterface, "Rename", [&](auto& message) {
          message << std::string("did=99999999") << std::string("a/b") << bus::Options();
        });
      },
  };
  try {
    kinds[pick(kinds.size())](*this);
  } catch (const sdbus::Error& error) {
    const std::string& name = error.getName();
    require(name.starts_with("com.norvane.Vessel1.Error.") ||
                name.starts_with("org.freedesktop.DBus.Error."),
            "nonsense was refused as " + name + ": " + error.getMessage());
    return 1;
  }
  throw SoakFailure{"nonsense was not refused"};
}

std::size_t SoakClient::askWithoutReading(const SoakTruth& truth, std::size_t calls) {
  const auto connection = sdbus::createSessionBusConnection();
  const auto service = sdbus::createProxy(*connection, bus::serviceName, bus::objectPath);
  for (std::size_t i = 0; i < calls; ++i) {
    auto message = service->createMethodCall(bus::providerInterface, "ListItems");
    message << truth.folders.begin()->first << std::vector<std::uint8_t>();
    // It would like to know, but never looks.
    static_cast<void>(
        service->callMethod(message, [](sdbus::MethodReply&, const sdbus::Error*) {}));
  }
  return calls;
}

}  // namespace mirabel::testing
