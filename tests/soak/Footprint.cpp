#include "soak/Footprint.h"

#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>

namespace mirabel::testing {

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

Footprint settled(pid_t process, const Footprint& before) {
  using Clock = std::chrono::steady_clock;
  const auto end = Clock::now() + std::chrono::seconds(30);
  Footprint now = footprintOf(process);
  while (!isAsBefore(now, before) && Clock::now() < end) {
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    now = footprintOf(process);
  }
  return now;
}

}  // namespace mirabel::testing
