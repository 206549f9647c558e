#include "soak/Footprint.h"

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>

namespace mirabel::testing {
namespace {

// More than the service waits before it gives memory back.
constexpr std::chrono::seconds untilSettled{5};

}  // namespace

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

bool isAsBefore(const Footprint& now, const Footprint& before) {
  return now.residentKiB <= before.residentKiB + mostGrowthKiB &&
         now.descriptors <= before.descriptors + mostOpenListings;
}

Footprint settled(pid_t process) {
  using Clock = std::chrono::steady_clock;
  Footprint least = footprintOf(process);
  for (auto since = Clock::now(); Clock::now() < since + untilSettled;) {
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
    const Footprint now = footprintOf(process);
    if (now.residentKiB >= least.residentKiB && now.descriptors >= least.descriptors) continue;
    least = {std::min(now.residentKiB, least.residentKiB),
             std::min(now.descriptors, least.descriptors)};
    since = Clock::now();
  }
  return least;
}

}  // namespace mirabel::testing
