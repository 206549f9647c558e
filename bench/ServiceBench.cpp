// The service on a private bus, asked by a program that waits for each answer: what a look-up of an
// item costs beside a call that does nothing. Both go from the client through the bus to the
// service and back. The items are those of a folder, asked for in turn: once the service knows them
// it makes sure only that they are as they were. Packages it looks up each time, like whatever it
// has not been asked for lately.
#include <array>
#include <cstdlib>
#include <filesystem>
#include <sdbus-c++/sdbus-c++.h>

#include "BenchHome.h"
#include "ChildProcess.h"
#include "host/bus/BusItems.h"
#include "host/bus/BusNames.h"
#include "platform/VesselManager.h"

namespace mirabel::bench {
namespace {

constexpr const char* itemRow = "service: one item / a call that does nothing";
constexpr const char* lookUpRow = "service: one look-up / a call that does nothing";
constexpr std::size_t callsPerRound = 2000;

/// A bus of our own, which the environment names for as long as it lives.
class PrivateBus {
 public:
  PrivateBus() : daemon_({"dbus-daemon", "--session", "--nofork", "--print-address=1"}) {
    const std::string address = daemon_.hasStarted() ? daemon_.hear() : "";
    isThere_ = !address.empty();
    if (isThere_) ::setenv("DBUS_SESSION_BUS_ADDRESS", address.c_str(), 1);
  }
  ~PrivateBus() { ::unsetenv("DBUS_SESSION_BUS_ADDRESS"); }
  [[nodiscard]] bool isThere() const { return isThere_; }

 private:
  ChildProcess daemon_;
  bool isThere_ = false;
};

std::vector<std::string> identifiersIn(sdbus::IProxy& service, std::string_view container) {
  auto call = service.createMethodCall(bus::providerInterface, "ListItems");
  call << std::string(container) << Data();
  auto reply = service.callMethod(call);
  std::vector<std::string> identifiers;
  for (const ItemRecord& item : bus::readItems(reply))
    identifiers.push_back(item.itemIdentifier);
  return identifiers;
}

std::string identifierAt(sdbus::IProxy& service, const std::string& path) {
  auto call = service.createMethodCall(bus::providerInterface, "GetItemAtPath");
  call << dataFromString(path);
  auto reply = service.callMethod(call);
  return bus::readItem(reply).itemIdentifier;
}

void askForNothing(sdbus::IProxy& service) {
  const auto call = service.createMethodCall("org.freedesktop.DBus.Peer", "Ping");
  static_cast<void>(service.callMethod(call));
}

void askFor(sdbus::IProxy& service, const std::string& identifier) {
  auto call = service.createMethodCall(bus::providerInterface, "GetItem");
  call << identifier;
  auto reply = service.callMethod(call);
  require(reply.isValid() && !reply.isEmpty(), "an item is answered");
}

}  // namespace

void runServiceBenchmarks(const Scale& scale) {
  if (!scale.includesAny({itemRow, lookUpRow})) return;
  const BenchHome home(BenchHome::Where::memory);
  const std::string folder = home.makeFolder("folder", 200);
  const std::string packages = home.makeFolder("packages", 0);
  for (int i = 0; i < 50; ++i)
    std::filesystem::create_directory(packages + "/" + std::to_string(i) + ".package");
  const PrivateBus bus;
  if (!bus.isThere()) return;
  printHeading("a service on a bus of its own, median of " + std::to_string(scale.rounds) +
               " rounds of " + std::to_string(callsPerRound) + " calls");
  const ChildProcess serving(ChildProcess::role({"serve", home.path()}));
  require(serving.hear() == "ready", "the service starts");
  const auto connection = sdbus::createSessionBusConnection();
  const auto service = sdbus::createProxy(*connection, bus::serviceName, bus::objectPath);
  const auto files = identifiersIn(*service, identifierAt(*service, folder));
  const auto lookedUp = identifiersIn(*service, identifierAt(*service, packages));
  require(files.size() == 200 && lookedUp.size() == 50, "all items are listed");
  const auto secondsToAskFor = [&](const std::vector<std::string>& identifiers) {
    return secondsOf([&] {
      for (std::size_t i = 0; i < callsPerRound; ++i)
        askFor(*service, identifiers[i % identifiers.size()]);
    });
  };
  Comparison item{itemRow, {}, {}, 1.5};
  Comparison lookUp{lookUpRow, {}, {}};
  for (int round = 0; round < scale.rounds; ++round) {
    item.reference.push_back(secondsOf([&] {
      for (std::size_t i = 0; i < callsPerRound; ++i)
        askForNothing(*service);
    }));
    lookUp.reference.push_back(item.reference.back());
    item.ours.push_back(secondsToAskFor(files));
    lookUp.ours.push_back(secondsToAskFor(lookedUp));
  }
  print(item);
  print(lookUp);
}

}  // namespace mirabel::bench
