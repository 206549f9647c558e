#include <gtest/gtest.h>
#include <limits>

#include "foundation/PropertyList.h"
#include "fs/FSChangeToken.h"
#include "support/LogCapture.h"

namespace mirabel::testing {
namespace {

constexpr std::uint64_t largest = std::numeric_limits<std::uint64_t>::max();
const UUID volume = UUID::fromString("0F1E2D3C-4B5A-6978-8796-A5B4C3D2E1F0").value();

PropertyList::Dictionary dictionary() {
  return {{"version", PropertyList(Number::of(std::uint64_t{0}))},
          {"deviceUUID", PropertyList(volume.description())},
          {"streamEventID", PropertyList(Number::of(std::uint64_t{7}))},
          {"offset", PropertyList(Number::of(std::uint64_t{200}))},
          {"appLibraryVersionToken", PropertyList(Number::of(std::uint64_t{3}))}};
}

TEST(FSChangeTokenTest, BytesGiveBackTheToken) {
  const LogCapture log;
  constexpr std::uint64_t half = std::uint64_t{1} << 63;
  for (const std::uint64_t n :
       {std::uint64_t{0}, std::uint64_t{1}, std::uint64_t{255}, half - 1, half, largest}) {
    const FSChangeToken token{n, volume, largest - n, n, n / 2};
    EXPECT_EQ(FSChangeToken::decode(token.encode()), token) << token.description();
  }
  EXPECT_TRUE(log.lines().empty());
}

TEST(FSChangeTokenTest, AnythingElseIsNoToken) {
  std::vector<Data> unusable = {{}, {1, 2, 3}, dataFromString("bplist00")};
  const auto add = [&](PropertyList::Value value) {
    unusable.push_back(PropertyList(std::move(value)).encode().value());
  };
  add(PropertyList::Array{});
  EXPECT_EQ(FSChangeToken::decode(PropertyList(dictionary()).encode().value()),
            (FSChangeToken{0, volume, 7, 200, 3}));
  for (std::size_t i = 0; i < dictionary().size(); ++i) {
    auto missing = dictionary();
    missing.erase(missing.begin() + static_cast<std::ptrdiff_t>(i));
    add(missing);
    for (const PropertyList& wrong :
         {PropertyList(std::string("7")), PropertyList(Number::of(1.0)), PropertyList(true),
          PropertyList(Number::of(std::int64_t{-1}))}) {
      auto mistyped = dictionary();
      mistyped[i].second = wrong;
      add(mistyped);
    }
  }
  for (const Data& bytes : unusable) {
    const LogCapture log;
    EXPECT_FALSE(FSChangeToken::decode(bytes));
    ASSERT_EQ(log.lines().size(), 1U);
    EXPECT_EQ(log.lines().front().level, LogLevel::error);
    EXPECT_TRUE(
        log.lines().front().text.starts_with("[ERROR] can't decode token from provided data; "));
  }
  const LogCapture log;
  EXPECT_FALSE(FSChangeToken::decode(std::nullopt));
  EXPECT_TRUE(log.lines().empty());
}

}  // namespace
}  // namespace mirabel::testing
