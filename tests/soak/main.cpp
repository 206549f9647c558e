// A service under the load of a thousand programs, for as long as it is asked to: answers must stay
// correct, and its memory and descriptors return to where they were once all have left.
//
// usage: service_soak [SECONDS [CLIENTS]]     10 seconds, 1,000 clients
#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <sys/resource.h>
#include <thread>

#include "host/bus/BusItems.h"
#include "host/bus/BusNames.h"
#include "platform/VesselManager.h"
#include "soak/ServedHome.h"
#include "soak/SoakClient.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t folders = 20;
constexpr std::size_t filesInEach = 300;
constexpr std::size_t threads = 8;
constexpr std::size_t mostOpenListings = 16;

/// What the service holds.
struct Footprint {
  std::size_t residentKiB = 0;
  std::size_t descriptors = 0;
};

Footprint footprintOf(pid_t process) {
  Footprint footprint;
  const std::string folder = "/proc/" + std::to_string(process);
  std::ifstream status(folder + "/status");
  for (std::string line; std::getline(status, line);)
    if (line.starts_with("VmRSS:")) footprint.residentKiB = std::stoul(line.substr(6));
  for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator(folder + "/fd"))
    ++footprint.descriptors;
  return footprint;
}

void fill(const TempHome& home) {
  for (std::size_t folder = 0; folder < folders; ++folder) {
    const std::string name = "folder " + std::to_string(folder);
    home.makeFolder(name);
    for (std::size_t file = 0; file < filesInEach; ++file)
      home.writeFile(name + "/report " + std::to_string(folder * 1000 + file) + ".txt", "text");
  }
  home.makeFolder("busy");
}

std::vector<ItemRecord> allItems(sdbus::IProxy& service, const std::string& container) {
  std::vector<ItemRecord> items;
  std::vector<std::uint8_t> page;
  do {
    auto call = service.createMethodCall(bus::providerInterface, "ListItems");
    call << container << page;
    auto reply = service.callMethod(call);
    const auto some = bus::readItems(reply);
    items.insert(items.end(), some.begin(), some.end());
    page = bus::readBytes(reply);
  } while (!page.empty());
  return items;
}

SoakTruth learn(sdbus::IProxy& service) {
  SoakTruth truth;
  for (const ItemRecord& folder :
       allItems(service, std::string(VesselRootContainerItemIdentifier))) {
    if (folder.filename == "busy") {
      truth.busyFolder = folder.itemIdentifier;
      continue;
    }
    auto& within = truth.folders[folder.itemIdentifier];
    for (const ItemRecord& file : allItems(service, folder.itemIdentifier)) {
      truth.identifiers.push_back(file.itemIdentifier);
      truth.names[file.itemIdentifier] = file.filename;
      within.push_back(file.itemIdentifier);
    }
    std::sort(within.begin(), within.end());
  }
  return truth;
}

/// One run.
class Soak {
 public:
  Soak(const SoakTruth& truth, const TempHome& home, Clock::time_point end, std::size_t clients)
      : truth_(truth), home_(home), end_(end), clients_(clients) {}

  void run() {
    std::vector<std::jthread> running;
    for (std::size_t i = 0; i < threads; ++i)
      running.emplace_back([this, i] { drive(static_cast<unsigned>(i)); });
    running.emplace_back([this] { write(); });
    running.emplace_back([this] { calls_ += SoakClient::askWithoutReading(truth_, 500); });
    running.clear();
  }
  [[nodiscard]] std::size_t calls() const { return calls_; }
  [[nodiscard]] std::string failure() {
    const std::lock_guard lock(mutex_);
    return failure_;
  }

 private:
  void drive(unsigned number) {
    try {
      std::vector<std::unique_ptr<SoakClient>> mine;
      for (std::size_t i = number; i < clients_; i += threads)
        mine.push_back(std::make_unique<SoakClient>(truth_, static_cast<unsigned>(i)));
      for (std::size_t turn = 0; Clock::now() < end_ && !hasFailed_; ++turn)
        calls_ += mine[turn % mine.size()]->step();
    } catch (const SoakFailure& failure) {
      fail(failure.what);
    } catch (const sdbus::Error& error) {
      fail(error.getName() + ": " + error.getMessage());
    }
  }
  void write() {
    // As fast as the clients ask, so that neither side is all that is measured.
    for (std::size_t i = 0; Clock::now() < end_ && !hasFailed_; ++i) {
      while (calls_ < i * 10 && Clock::now() < end_ && !hasFailed_)
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
      home_.writeFile("busy/" + std::to_string(i % 50), std::to_string(i));
      if (i % 7 == 0) home_.remove("busy/" + std::to_string(i % 50));
    }
  }
  void fail(const std::string& what) {
    const std::lock_guard lock(mutex_);
    if (!hasFailed_.exchange(true)) failure_ = what;
  }

  const SoakTruth& truth_;
  const TempHome& home_;
  const Clock::time_point end_;
  const std::size_t clients_;
  std::atomic<std::size_t> calls_ = 0;
  std::atomic<bool> hasFailed_ = false;
  std::mutex mutex_;
  std::string failure_;
};

/// Waits until the service has noticed that all have left: its descriptors are what they were.
Footprint settled(pid_t process, const Footprint& before) {
  const auto end = Clock::now() + std::chrono::seconds(30);
  Footprint now = footprintOf(process);
  while (now.descriptors > before.descriptors + mostOpenListings && Clock::now() < end) {
    std::this_thread::yield();
    now = footprintOf(process);
  }
  return now;
}

int soak(std::chrono::seconds duration, std::size_t clients) {
  const TempHome home;
  fill(home);
  const ServedHome served(home.path());
  const auto connection = sdbus::createSessionBusConnection();
  const auto service = sdbus::createProxy(*connection, bus::serviceName, bus::objectPath);
  const SoakTruth truth = learn(*service);
  // What a service that has been used once holds on to is not counted.
  Soak first(truth, home, Clock::now() + std::chrono::seconds(2), clients);
  first.run();
  const Footprint before = settled(served.process(), footprintOf(served.process()));
  Soak main(truth, home, Clock::now() + duration, clients);
  main.run();
  const Footprint after = settled(served.process(), before);
  std::printf(
      "%zu clients, %zu calls in %lld s; resident %zu KiB before and %zu KiB after, "
      "descriptors %zu and %zu\n",
      clients, main.calls(), static_cast<long long>(duration.count()), before.residentKiB,
      after.residentKiB, before.descriptors, after.descriptors);
  if (const std::string failure = first.failure() + main.failure(); !failure.empty()) {
    std::fprintf(stderr, "soak: %s\n", failure.c_str());
    return 1;
  }
  // An allocator keeps some of what it was given back, and a bounded number of listings that were
  // left in the middle stay open.
  const bool hasGrown = after.residentKiB > before.residentKiB * 5 / 4 + 8192 ||
                        after.descriptors > before.descriptors + mostOpenListings;
  if (hasGrown) std::fprintf(stderr, "soak: the service holds more than before\n");
  return hasGrown ? 1 : 0;
}

}  // namespace
}  // namespace mirabel::testing

int main(int count, char** arguments) {
  rlimit files{};
  if (::getrlimit(RLIMIT_NOFILE, &files) == 0) {
    files.rlim_cur = files.rlim_max;
    ::setrlimit(RLIMIT_NOFILE, &files);
  }
  const long seconds = count > 1 ? std::strtol(arguments[1], nullptr, 10) : 10;
  const long clients = count > 2 ? std::strtol(arguments[2], nullptr, 10) : 1000;
  if (seconds < 1 || clients < 1) {
    std::fprintf(stderr, "usage: service_soak [SECONDS [CLIENTS]]\n");
    return 2;
  }
  try {
    return mirabel::testing::soak(std::chrono::seconds(seconds), static_cast<std::size_t>(clients));
  } catch (const std::exception& error) {
    std::fprintf(stderr, "soak: %s\n", error.what());
    return 1;
  }
}
