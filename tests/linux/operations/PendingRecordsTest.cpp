#include <gtest/gtest.h>

#include "linux/operations/PendingRecords.h"

namespace mirabel::testing {
namespace {

PendingRecords sample() {
  PendingRecords records;
  records.removals.push_back({{"/home/me/Documents/\xFF", 7}, ".mirabel-1-"});
  records.moves.push_back({{"/a", 1},
                           "doc",
                           ".mirabel-1-2",
                           {"/b", (1ULL << 62) + 3},
                           "doc 2",
                           {8, std::string("\1\0\xFF", 3), 9}});
  records.renames.push_back({{"/a", 1}, "readme", ".mirabel-kept-3", "README"});
  return records;
}

// What is half read could remove what it should not.
TEST(PendingRecords, AreNothingWhenAnyOfTheirBytesIsDamaged) {
  const Data whole = sample().encode().value();
  EXPECT_EQ(PendingRecords::decode(whole), sample());
  for (std::size_t length = 0; length < whole.size(); ++length) {
    const Data cut(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length));
    EXPECT_FALSE(PendingRecords::decode(cut)) << length;
  }
  for (std::size_t bit = 0; bit < whole.size() * 8; ++bit) {
    Data flipped = whole;
    flipped[bit / 8] ^= static_cast<std::uint8_t>(1U << (bit % 8));
    EXPECT_FALSE(PendingRecords::decode(flipped)) << bit;
  }
}

}  // namespace
}  // namespace mirabel::testing
