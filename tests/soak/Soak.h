#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <mutex>
#include <string>

#include "soak/SoakClient.h"
#include "support/TempHome.h"

namespace mirabel::testing {

/// Many programs that ask a service at once, and one that writes into its documents meanwhile.
class Soak {
 public:
  struct Limits {
    std::chrono::steady_clock::time_point end;
    std::size_t calls;  ///< or a few more, for those under way
    std::size_t clients;
  };
  /// Both outlive it.
  Soak(const SoakTruth& truth, const TempHome& home, Limits limits)
      : truth_(truth), home_(home), limits_(limits) {}

  /// Returns when the time is over, the calls were made or an answer was wrong; all have left then.
  void run();
  [[nodiscard]] std::size_t calls() const { return calls_; }
  /// What the first wrong answer was; empty where there was none.
  [[nodiscard]] std::string failure();

 private:
  [[nodiscard]] bool goesOn() const;
  void drive(std::size_t number);
  void write();
  void fail(const std::string& what);

  const SoakTruth& truth_;
  const TempHome& home_;
  const Limits limits_;
  std::atomic<std::size_t> calls_ = 0;
  std::atomic<bool> hasFailed_ = false;
  std::mutex mutex_;
  std::string failure_;
};

}  // namespace mirabel::testing
