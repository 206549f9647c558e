#include <gtest/gtest.h>
#include <limits>

#include "foundation/PropertyList.h"
#include "mirabel/TagData.h"

namespace mirabel {
namespace {

TEST(TagData, ComesBackWithLabelsByteForByte) {
  const std::vector<Tag> tags{
      {"red", 6}, {"red", 0}, {"", std::numeric_limits<int>::min()}, {"\xFF caf\xE9", 1}};
  EXPECT_EQ(decodeTagData(encodeTagData(tags).value()), tags);
  EXPECT_EQ(decodeTagData(encodeTagData({}).value()), std::vector<Tag>{});
}

TEST(TagData, IsReadStrictlyButForAMissingColor) {
  const PropertyList label(std::string("red"));
  const auto decoded = [](PropertyList::Dictionary entry) {
    const PropertyList list(PropertyList::Array{PropertyList(std::move(entry))});
    return decodeTagData(list.encode().value());
  };
  const auto color = [](auto value) { return PropertyList(Number::of(value)); };
  EXPECT_EQ(decoded({{"label", label}}), (std::vector<Tag>{{"red", 0}}));
  EXPECT_FALSE(decoded({{"color", color(std::int64_t{1})}}));
  EXPECT_FALSE(decoded({{"label", color(std::int64_t{1})}}));
  EXPECT_FALSE(decoded({{"label", label}, {"color", label}}));
  EXPECT_FALSE(decoded({{"label", label}, {"color", color(1.5)}}));
  EXPECT_FALSE(decoded({{"label", label}, {"color", color(std::int64_t{1} << 31)}}));
  EXPECT_FALSE(decodeTagData(label.encode().value()));
  EXPECT_FALSE(decodeTagData({}));
}

}  // namespace
}  // namespace mirabel
