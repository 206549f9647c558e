#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "host/bus/BusClient.h"

namespace mirabel::testing {

/// What the clients know to be true, for as long as they run.
struct SoakTruth {
  std::vector<std::string> identifiers;                     ///< of files that nobody changes
  std::map<std::string, std::string> names;                 ///< of those
  std::map<std::string, std::vector<std::string>> folders;  ///< identifiers in each folder, sorted
  std::string busyFolder;                                   ///< in which files come and go
};

/// One program on the bus that asks at random, and checks each answer. Used by one thread.
class SoakClient {
 public:
  SoakClient(const SoakTruth& truth, unsigned seed) : truth_(truth), random_(seed) { connect(); }

  /// Makes one call or a few; answers how many. Throws `SoakFailure` for an answer that is wrong.
  std::size_t step();
  /// Asks so many times without ever reading an answer, and goes.
  static std::size_t askWithoutReading(const SoakTruth& truth, std::size_t calls);

 private:
  static constexpr std::uint64_t longestAnswer = 120'000'000;  // microseconds

  void connect();
  [[nodiscard]] std::size_t pick(std::size_t count);
  std::size_t lookUp();
  std::size_t listFolder();
  std::size_t leaveInTheMiddle();
  std::size_t follow();
  std::size_t search();
  std::size_t sendNonsense();

  const SoakTruth& truth_;
  std::mt19937 random_;
  std::unique_ptr<BusClient> client_;
  std::vector<std::uint8_t> anchor_;  ///< of the busy folder
};

struct SoakFailure {
  std::string what;
};

std::vector<std::string> sortedIdentifiers(const std::vector<ItemRecord>& items);
/// Appends what lies in the container; answers how many calls that took. Throws `SoakFailure`.
std::size_t list(BusClient& client, const std::string& container, std::vector<ItemRecord>& items);

}  // namespace mirabel::testing
