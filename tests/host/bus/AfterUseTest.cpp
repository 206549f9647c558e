#include <gtest/gtest.h>

#include "host/bus/AfterUse.h"

namespace mirabel::testing {
namespace {

using namespace std::chrono_literals;

TEST(AfterUse, WorksOnceForEachUseAndAlsoWhereUseNeverEnds) {
  const bus::AfterUse::Times cases[] = {{1ms, 1h}, {1h, 1ms}};
  for (const auto& times : cases) {
    std::atomic<int> works = 0;
    const auto work = [&works] {
      ++works;
      works.notify_all();
    };
    bus::AfterUse after(times, work);
    for (int expected = 1; expected <= 3; ++expected) {
      after.used();
      works.wait(expected - 1);
      EXPECT_EQ(works, expected);
    }
  }
}

TEST(AfterUse, EndsAtOnce) {
  bus::AfterUse after({1h, 1h}, [] { FAIL() << "it was used just now"; });
  after.used();
}

}  // namespace
}  // namespace mirabel::testing
