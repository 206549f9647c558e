// A service under the load of a thousand programs, for as long as it is asked to: answers must stay
// correct, and its memory and descriptors return to where they were once all have left. They come
// and leave in four rounds, so that what grows with each call shows as a row that goes on growing.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <limits>
#include <sys/resource.h>

#include "platform/VesselManager.h"
#include "soak/Footprint.h"
#include "soak/ServedHome.h"
#include "soak/Soak.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t folders = 20;
constexpr std::size_t filesInEach = 300;
constexpr std::size_t firstCalls = 5000;
constexpr std::size_t rounds = 4;
constexpr std::size_t anyNumber = std::numeric_limits<std::size_t>::max();

void fill(const TempHome& home) {
  for (std::size_t folder = 0; folder < folders; ++folder) {
    const std::string name = "folder " + std::to_string(folder);
    home.makeFolder(name);
    for (std::size_t file = 0; file < filesInEach; ++file)
      home.writeFile(name + "/report " + std::to_string(folder * 1000 + file) + ".txt", "text");
  }
  home.makeFolder("busy");
}

SoakTruth learn() {
  BusClient client;
  SoakTruth truth;
  std::vector<ItemRecord> root;
  list(client, std::string(VesselRootContainerItemIdentifier), root);
  for (const ItemRecord& folder : root) {
    if (folder.filename == "busy") {
      truth.busyFolder = folder.itemIdentifier;
      continue;
    }
    std::vector<ItemRecord> files;
    list(client, folder.itemIdentifier, files);
    truth.folders[folder.itemIdentifier] = sortedIdentifiers(files);
    for (const ItemRecord& file : files) {
      truth.identifiers.push_back(file.itemIdentifier);
      truth.names[file.itemIdentifier] = file.filename;
    }
  }
  return truth;
}

struct Wanted {
  std::size_t seconds = 10;
  std::size_t clients = 1000;
  std::size_t calls = 0;  ///< 0: as many as there is time for
};

void print(const char* what, std::size_t calls, const Footprint& footprint) {
  std::printf("%s: %zu calls, resident %zu KiB, %zu descriptors\n", what, calls,
              footprint.residentKiB, footprint.descriptors);
  std::fflush(stdout);
}

/// Why it did not go well; empty where it did.
std::string soak(const Wanted& wanted) {
  const TempHome home;
  fill(home);
  const ServedHome served(home.path());
  const SoakTruth truth = learn();
  // What a service that has been used once holds on to is not counted: its caches, and what the
  // allocator keeps at hand for each of its threads.
  Soak first(truth, home, {Clock::now() + std::chrono::seconds(30), firstCalls, wanted.clients});
  first.run();
  if (const std::string failure = first.failure(); !failure.empty()) return failure;
  const Footprint before = settled(served.process());
  print("before", first.calls(), before);
  const auto start = Clock::now();
  std::size_t calls = 0;
  Footprint after;
  for (std::size_t round = 1; round <= rounds; ++round) {
    const auto end = start + std::chrono::milliseconds(wanted.seconds * 1000 * round / rounds);
    const std::size_t callsUpToHere = wanted.calls * round / rounds;
    Soak soak(truth, home,
              {wanted.calls == 0 ? end : start + std::chrono::seconds(wanted.seconds),
               wanted.calls == 0 ? anyNumber : callsUpToHere - std::min(calls, callsUpToHere),
               wanted.clients});
    soak.run();
    calls += soak.calls();
    if (const std::string failure = soak.failure(); !failure.empty()) return failure;
    after = settled(served.process());
    print("all have left", calls, after);
  }
  const std::chrono::duration<double> took = Clock::now() - start;
  std::printf("%zu clients, %zu calls in %.0f s\n", wanted.clients, calls, took.count());
  if (calls < wanted.calls) return "the calls were not made in time";
  if (!isAsBefore(after, before)) return "the service holds more than before";
  return {};
}

}  // namespace
}  // namespace mirabel::testing

int main(int count, char** arguments) {
  rlimit files{};
  if (::getrlimit(RLIMIT_NOFILE, &files) == 0) {
    files.rlim_cur = files.rlim_max;
    ::setrlimit(RLIMIT_NOFILE, &files);
  }
  mirabel::testing::Wanted wanted;
  CLI::App program("A service under the load of many programs.");
  program.add_option("seconds", wanted.seconds, "how long; with --calls, at most")
      ->check(CLI::PositiveNumber)
      ->capture_default_str();
  program.add_option("--clients", wanted.clients, "how many programs")
      ->check(CLI::PositiveNumber)
      ->capture_default_str();
  program
      .add_option("--calls", wanted.calls, "end when so many were made, fail where they were not")
      ->check(CLI::PositiveNumber);
  CLI11_PARSE(program, count, arguments);
  try {
    const std::string failure = mirabel::testing::soak(wanted);
    if (failure.empty()) return 0;
    std::fprintf(stderr, "soak: %s\n", failure.c_str());
  } catch (const std::exception& error) {
    std::fprintf(stderr, "soak: %s\n", error.what());
  }
  return 1;
}
