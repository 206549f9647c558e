#include <gtest/gtest.h>
#include <numeric>
#include <rapidcheck/gtest.h>

#include "foundation/BinaryLists.h"
#include "foundation/PropertyList.h"

namespace mirabel {
namespace {

using Array = PropertyList::Array;
using Dictionary = PropertyList::Dictionary;

PropertyList text(std::string value) {
  return PropertyList(std::move(value));
}
template <class T>
PropertyList number(T value) {
  return PropertyList(Number::of(value));
}

/// One value of each type, and a container within a container.
PropertyList sample() {
  Dictionary inner{{"é", text("日本\U0001F600")}, {"", PropertyList(Array{})}};
  return PropertyList(Dictionary{
      {"z", PropertyList(Array{PropertyList(true), PropertyList(false), number(std::int64_t{-1})})},
      {"a", number(~std::uint64_t{0})},
      {"r", number(0.1)},
      {"date", PropertyList(Date{1'795'253'400, 500'000'000})},
      {"data", PropertyList(Data{0, 1, 0xFF})},
      {"inner", PropertyList(std::move(inner))},
  });
}

rc::Gen<PropertyList> scalars() {
  using namespace rc;
  const auto wrap = [](auto value) { return PropertyList(std::move(value)); };
  // The first and last of each length in UTF-8, and what UTF-16 has to write as two units.
  const auto characters =
      gen::element<std::string>("", "a", "\x7F", "\u0080", "\u07FF", "\u0800", "\uD7FF", "\uE000",
                                "\uFFFF", "\U00010000", "\U0010FFFF");
  const auto texts =
      gen::map(gen::container<std::vector<std::string>>(characters),
               [](const std::vector<std::string>& pieces) {
                 return text(std::accumulate(pieces.begin(), pieces.end(), std::string()));
               });
  const auto dates = gen::map(
      gen::inRange<std::int64_t>(Date::earliest.seconds, Date::latest.seconds), [](auto seconds) {
        return PropertyList(Date{seconds, seconds % 2 == 0 ? 0u : 500'000'000u});
      });
  return gen::oneOf(texts, dates, gen::map<bool>(wrap), gen::map<Data>(wrap),
                    gen::map<std::int64_t>([](auto v) { return number(v); }),
                    gen::map<std::uint64_t>([](auto v) { return number(v); }),
                    gen::map<double>([](auto v) { return number(v); }),
                    gen::map<float>([](auto v) { return number(double{v}); }));
}

rc::Gen<PropertyList> values(int depth) {
  using namespace rc;
  if (depth == 0) return scalars();
  const auto elements = gen::container<Array>(gen::lazy([=] { return values(depth - 1); }));
  const auto arrays = gen::map(elements, [](Array array) { return PropertyList(array); });
  const auto dictionaries = gen::map(elements, [](const Array& array) {
    Dictionary dictionary;
    for (const PropertyList& value : array) {
      dictionary.emplace_back("key " + std::to_string(dictionary.size() * 7 % 5), value);
      if (dictionary.size() == 5) break;
    }
    return PropertyList(dictionary);
  });
  return gen::oneOf(scalars(), arrays, dictionaries);
}

RC_GTEST_PROP(PropertyListProperties, WhatWasWrittenIsReadBackInItsOrder, ()) {
  const PropertyList value = *values(2).as("a value");
  const auto bytes = value.encode();
  RC_ASSERT(bytes.has_value());
  const auto again = PropertyList::decode(*bytes);
  RC_ASSERT(again.has_value());
  RC_ASSERT(*again == value);
}

TEST(PropertyListWriter, UsesTheSmallestSizesAndSharesEqualScalars) {
  const PropertyList value(Array{text("a"), number(std::int64_t{255}), text("a"),
                                 number(std::uint64_t{255}), number(0.5), text("é")});
  const Data expected = binaryList({{0xA6, 1, 2, 1, 2, 3, 4},
                                    {0x51, 'a'},
                                    {0x10, 0xFF},
                                    {0x22, 0x3F, 0, 0, 0},
                                    {0x61, 0x00, 0xE9}});
  EXPECT_EQ(value.encode().value(), expected);
}

TEST(PropertyListWriter, RefusesWhatCouldNotBeReadBack) {
  PropertyList deep;
  for (int i = 0; i < 64; ++i) {
    deep = PropertyList(Array{deep});
  }
  const std::vector<std::pair<const char*, PropertyList>> cases{
      {"overlong form", text("\xC0\x80")},
      {"surrogate", text("\xED\xA0\x80")},
      {"beyond Unicode", text("\xF4\x90\x80\x80")},
      {"cut character", text("a\xE2\x82")},
      {"stray continuation", text("\x80")},
      {"key that is not UTF-8", PropertyList(Dictionary{{"\xFF", PropertyList(true)}})},
      {"key twice", PropertyList(Dictionary{{"k", text("1")}, {"k", text("2")}})},
      {"before the year 1", PropertyList(Date{Date::earliest.seconds - 1, 0})},
      {"rounds up into the year 10000", PropertyList(Date::latest)},
      {"no nanoseconds", PropertyList(Date{0, 1'000'000'000})},
      {"too deep", deep},
  };
  for (const auto& [name, value] : cases) {
    EXPECT_FALSE(value.encode().has_value()) << name;
  }
}

TEST(PropertyListReader, TakesUnusualButWellFormedLists) {
  // Contents before their container, bytes that belong to nothing, one object used three times,
  // integers longer than needed, references of 3 and offsets of 5 bytes.
  const std::vector<Data> objects{
      {0x14, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 7},
      {0x5F, 0x13, 0, 0, 0, 0, 0, 0, 0, 1, 'k', /* unused */ 0xEE, 0xEE},
      {0xD1, 0, 0, 1, 0, 0, 3},
      {0xAF, 0x10, 4, 0, 0, 0, 0, 0, 1, 0, 0, 1, 0, 0, 4},
      {0x14, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0x80, 0, 0, 0, 0, 0, 0, 0},
  };
  const auto list =
      PropertyList::decode(binaryList(objects, {.offsetSize = 5, .referenceSize = 3, .top = 2}));
  const PropertyList expected(
      Dictionary{{"k", PropertyList(Array{number(std::int64_t{7}), text("k"), text("k"),
                                          number(std::numeric_limits<std::int64_t>::min())})}});
  ASSERT_TRUE(list.has_value()) << list.error().description();
  EXPECT_EQ(*list, expected);
}

TEST(PropertyListReader, RefusesMalformedObjects) {
  const std::vector<std::pair<const char*, std::vector<Data>>> cases{
      {"contains itself", {{0xA1, 0}}},
      {"contains its container", {{0xA1, 1}, {0xD1, 2, 0}, {0x51, 'k'}}},
      {"no such object", {{0xA1, 1}}},
      {"no such key", {{0xD1, 2, 1}, {0x09}}},
      {"key is a number", {{0xD1, 1, 1}, {0x10, 1}}},
      {"key twice", {{0xD2, 1, 2, 3, 3}, {0x51, 'k'}, {0x61, 0, 'k'}, {0x09}}},
      {"null", {{0x00}}},
      {"fill byte", {{0x0F}}},
      {"UID", {{0x80, 1}}},
      {"set", {{0xC1, 1}, {0x09}}},
      {"integer of 32 bytes", {Data(33, 0x15)}},
      {"integer beyond 64 bits", {{0x14, 0, 0, 0, 0, 0, 0, 0, 1, 0, 0, 0, 0, 0, 0, 0, 0}}},
      {"integer cut by the table", {{0x13, 0, 0, 0, 0}}},
      {"real of 2 bytes", {{0x21, 0, 0}}},
      {"date of 4 bytes", {{0x32, 0, 0, 0, 0}}},
      {"date not a number", {{0x33, 0x7F, 0xF8, 0, 0, 0, 0, 0, 0}}},
      {"date without end", {{0x33, 0x7F, 0xF0, 0, 0, 0, 0, 0, 0}}},
      {"date in the year 10^20", {{0x33, 0x45, 0, 0, 0, 0, 0, 0, 0}}},
      {"data cut by the table", {{0x43, 1, 2}}},
      {"data of 2^60 bytes", {{0x4F, 0x13, 0x10, 0, 0, 0, 0, 0, 0, 0, 1}}},
      {"array of 2^60 objects", {{0xAF, 0x13, 0x10, 0, 0, 0, 0, 0, 0, 0, 0}}},
      {"dictionary of 2^63 - 1 entries", {{0xDF, 0x13, 0x7F, 255, 255, 255, 255, 255, 255, 255}}},
      {"text of 2^63 characters",
       {{0x6F, 0x14, 0, 0, 0, 0, 0, 0, 0, 0, 0x80, 0, 0, 0, 0, 0, 0, 0, 0, 'a'}}},
      {"negative count", {{0x4F, 0x13, 255, 255, 255, 255, 255, 255, 255, 255}}},
      {"count that is text", {{0x4F, 0x51, 1}}},
      {"count cut off", {{0x4F}}},
      {"ASCII beyond 127", {{0x51, 0x80}}},
      {"lone high surrogate", {{0x62, 0xD8, 0, 0, 'a'}}},
      {"lone low surrogate", {{0x61, 0xDC, 0}}},
      {"high surrogate at the end", {{0x61, 0xD8, 0}}},
  };
  for (const auto& [name, objects] : cases) {
    EXPECT_FALSE(PropertyList::decode(binaryList(objects)).has_value()) << name;
  }
}

TEST(PropertyListReader, RefusesTablesThatDoNotFitTheBytes) {
  const std::vector<Data> objects{{0xA1, 1}, {0x09}};
  ASSERT_TRUE(PropertyList::decode(binaryList(objects)).has_value());
  const std::vector<std::pair<const char*, ListShape>> cases{
      {"no offset size", {.claimedOffsetSize = 0}},
      {"offset size 9", {.claimedOffsetSize = 9}},
      {"offset size of another table", {.claimedOffsetSize = 2}},
      {"no reference size", {.referenceSize = 0}},
      {"reference size 9", {.referenceSize = 9}},
      {"no objects", {.claimedCount = 0}},
      {"one object too many", {.claimedCount = 3}},
      {"2^60 objects", {.claimedCount = std::uint64_t{1} << 60}},
      {"a product that wraps around",
       {.offsetSize = 8, .claimedCount = (std::uint64_t{1} << 61) + 2}},
      {"no such top object", {.top = 2}},
      {"table in the header", {.claimedTableStart = 0}},
      {"table in the trailer", {.claimedTableStart = 15}},
      {"table far away", {.claimedTableStart = ~std::uint64_t{0}}},
      {"offset in the header", {.movedOffset = 7}},
      {"offset of the table itself", {.movedOffset = 11}},
      {"wrong header", {.header = "bplist10"}},
  };
  for (const auto& [name, shape] : cases) {
    EXPECT_FALSE(PropertyList::decode(binaryList(objects, shape)).has_value()) << name;
  }
}

TEST(PropertyListReader, RefusesSmallListsThatUnfoldIntoLargeOnes) {
  std::vector<Data> laughs;
  for (std::uint8_t i = 1; i <= 40; ++i) {
    laughs.push_back({0xAA, i, i, i, i, i, i, i, i, i, i});
  }
  laughs.push_back({0x51, 'h'});
  EXPECT_FALSE(PropertyList::decode(binaryList(laughs)).has_value());

  Data longText(100'005, 'a');
  longText[0] = 0x5F, longText[1] = 0x12;
  longText[2] = 0, longText[3] = 1, longText[4] = 0x86, longText[5] = 0xA0;
  Data manyTimes(1004, 1);
  manyTimes[0] = 0xAF, manyTimes[1] = 0x11, manyTimes[2] = 0x03, manyTimes[3] = 0xE8;
  longText.push_back('a');
  EXPECT_FALSE(
      PropertyList::decode(binaryList({manyTimes, longText}, {.offsetSize = 4})).has_value());

  std::vector<Data> nest;
  for (std::uint8_t i = 1; i <= 64; ++i) {
    nest.push_back({0xA1, i});
  }
  nest.push_back({0x09});
  EXPECT_FALSE(PropertyList::decode(binaryList(nest)).has_value());
  EXPECT_TRUE(PropertyList::decode(binaryList(nest, {.top = 1})).has_value());
}

TEST(PropertyListReader, RefusesAListCutAnywhere) {
  const Data bytes = sample().encode().value();
  for (std::size_t length = 0; length < bytes.size(); ++length) {
    EXPECT_FALSE(PropertyList::decode(std::span(bytes).first(length)).has_value()) << length;
  }
}

TEST(PropertyListReader, ReadsAListWithAFlippedBitAsNothingOrAsAWholeValue) {
  const Data original = sample().encode().value();
  for (std::size_t bit = 0; bit < original.size() * 8; ++bit) {
    Data bytes = original;
    bytes[bit / 8] = static_cast<std::uint8_t>(bytes[bit / 8] ^ 1u << bit % 8);
    const auto value = PropertyList::decode(bytes);
    if (!value) continue;
    const auto written = value->encode();
    ASSERT_TRUE(written.has_value()) << bit;
    EXPECT_EQ(PropertyList::decode(*written), value) << bit;
  }
}

}  // namespace
}  // namespace mirabel
