#include <atomic>
#include <gtest/gtest.h>

#include "linux/volume/FollowThread.h"
#include "support/NoDescriptors.h"

namespace mirabel::testing {
namespace {

TEST(FollowThread, EndsAlsoWhereTheProcessMayHaveNoFurtherDescriptors) {
  if (NoDescriptors::areNeeded) GTEST_SKIP() << "the sanitizer takes descriptors itself";
  std::atomic<bool> hasLooked = false;
  {
    const NoDescriptors none;
    const FollowThread thread({[] { return nullptr; },
                               [&] {
                                 hasLooked = true;
                                 hasLooked.notify_all();
                               },
                               [] { return true; }});
    hasLooked.wait(false);
  }
  SUCCEED() << "it looked, and its end was not waited for in vain";
}

}  // namespace
}  // namespace mirabel::testing
