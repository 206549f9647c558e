#pragma once

#include <atomic>
#include <functional>

namespace mirabel {

/// Makes looks fail: while one of these is there, `decide` is asked before each statx of the
/// program, from any thread, for the errno that it fails with (0: it is made). One at a time.
class FailingLooks {
 public:
  using Decide = std::function<int(int directory, const char* name)>;
  explicit FailingLooks(Decide decide);
  ~FailingLooks();
  FailingLooks(const FailingLooks&) = delete;
  FailingLooks& operator=(const FailingLooks&) = delete;
};

/// Fails the n-th statx from now on, and so many more.
class FailingNthLook {
 public:
  FailingNthLook(int n, int errnoValue, int more = 0)
      : left_(n), looks_([this, errnoValue, more](int, const char*) {
          const int left = left_--;
          return left <= 1 && left >= 1 - more ? errnoValue : 0;
        }) {}
  [[nodiscard]] bool wasMet() const { return left_ < 1; }

 private:
  std::atomic<int> left_;
  FailingLooks looks_;
};

}  // namespace mirabel
