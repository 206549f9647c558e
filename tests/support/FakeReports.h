#pragma once

#include <cstddef>
#include <functional>
#include <mutex>
#include <optional>
#include <vector>

#include "foundation/URL.h"

namespace mirabel::testing {

/// When the file operations of a `FakePlatform` report, and what: at once, on the thread that
/// asked, unless the test holds the reports back. The change itself is made at once in any case.
class FakeReports {
 public:
  void hold();
  /// Makes those that are held back, in their order, on the calling thread; from now on they are
  /// made at once again.
  void release();
  [[nodiscard]] std::size_t held() const;

  /// Passes on a report of the platform's.
  void make(std::function<void()> report);

  /// What every operation that succeeds reports in place of its own URL.
  std::optional<URL> outcome;

 private:
  mutable std::mutex mutex_;
  bool areHeld_ = false;
  std::vector<std::function<void()>> held_;
};

}  // namespace mirabel::testing
