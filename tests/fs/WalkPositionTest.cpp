#include <gtest/gtest.h>

#include "fs/WalkPosition.h"

namespace mirabel::testing {
namespace {

TEST(WalkPosition, IsTheSameAfterItWasWrittenAndRead) {
  const std::uint64_t most = ~std::uint64_t{0};
  for (const WalkPosition& position :
       {WalkPosition{}, WalkPosition{most, most, {{"/home/me", most, most}}, "a"},
        WalkPosition{7, 1, {{"/", 1, 0}, {"\xff\n", 2, 3}, {"h\xc3\xb6", 4, 5}}, "\xfe"}}) {
    EXPECT_EQ(WalkPosition::decode(position.encode()), position);
  }
}

}  // namespace
}  // namespace mirabel::testing
