// The service on a private bus, asked by a program that waits for each answer: what a look-up of an
// item costs beside a call that does nothing. Both go from the client through the bus to the
// service and back. The items are those of a folder, asked for in turn.
#include <array>
#include <cstdlib>
#include <sdbus-c++/sdbus-c++.h>

#include "BenchHome.h"
#include "ChildProcess.h"
#include "host/bus/BusItems.h"
#include "host/bus/BusNames.h"
#include "platform/VesselManager.h"

namespace mirabel::bench {
namespace {

constexpr const char* itemRow = "service: one item / a call that does nothing";
constexpr int callsPerRound = 2000;

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

std::vector<std::string> identifiersOf(sdbus::IProxy& service) {
  std::vector<std::string> identifiers;
  std::string container(VesselRootContainerItemIdentifier);
  auto call = service.createMethodCall(bus::providerInterface, "ListItems");
  call << container << Data();
  auto reply = service.callMethod(call);
  const auto top = bus::readItems(reply);
  require(top.size() == 1, "there is one folder");
  call = service.createMethodCall(bus::providerInterface, "ListItems");
  call << top.front().itemIdentifier << Data();
  reply = service.callMethod(call);
  for (const ItemRecord& item : bus::readItems(reply))
    identifiers.push_back(item.itemIdentifier);
  return identifiers;
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
  if (!scale.includesAny({itemRow})) return;
  const BenchHome home(BenchHome::Where::memory);
  static_cast<void>(home.makeFolder("folder", 200));
  const PrivateBus bus;
  if (!bus.isThere()) return;
  printHeading("a service on a bus of its own, median of " + std::to_string(scale.rounds) +
               " rounds of " + std::to_string(callsPerRound) + " calls");
  const ChildProcess serving(ChildProcess::role({"serve", home.path()}));
  require(serving.hear() == "ready", "the service starts");
  const auto connection = sdbus::createSessionBusConnection();
  const auto service = sdbus::createProxy(*connection, bus::serviceName, bus::objectPath);
  const auto identifiers = identifiersOf(*service);
  require(identifiers.size() == 200, "all items are listed");
  Comparison item{itemRow, {}, {}, 1.5};
  for (int round = 0; round < scale.rounds; ++round) {
    item.reference.push_back(secondsOf([&] {
      for (int i = 0; i < callsPerRound; ++i)
        askForNothing(*service);
    }));
    item.ours.push_back(secondsOf([&] {
      for (int i = 0; i < callsPerRound; ++i)
        askFor(*service, identifiers[static_cast<std::size_t>(i) % identifiers.size()]);
    }));
  }
  print(item);
}

}  // namespace mirabel::bench
