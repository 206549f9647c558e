#include <cmath>
#include <gtest/gtest.h>
#include <limits>
#include <rapidcheck/gtest.h>

#include "mirabel/Values.h"

namespace mirabel {
namespace {

TEST(Date, PrintsAndReadsTheSameText) {
  const std::vector<std::pair<const char*, Date>> cases{
      {"1970-01-01T00:00:00Z", {0, 0}},
      {"1969-12-31T23:59:59.5Z", {-1, 500'000'000}},
      {"2001-01-01T00:00:00.000000001Z", {Date::referenceEpoch, 1}},
      {"2024-02-29T12:34:56.12Z", {1'709'210'096, 120'000'000}},
      {"0001-01-01T00:00:00Z", Date::earliest},
      {"9999-12-31T23:59:59.999999999Z", Date::latest},
  };
  for (const auto& [text, date] : cases) {
    EXPECT_EQ(date.rfc3339(), text);
    EXPECT_EQ(Date::fromRFC3339(text), date) << text;
  }
  EXPECT_EQ((Date{Date::latest.seconds + 1, 0}).rfc3339(), Date::latest.rfc3339());
  EXPECT_EQ((Date{std::numeric_limits<std::int64_t>::min(), 0}).rfc3339(),
            Date::earliest.rfc3339());
}

TEST(Date, ReadsOffsetsDaysAndLeapSeconds) {
  const std::vector<std::pair<const char*, const char*>> cases{
      {"2026-11-21", "2026-11-21T00:00:00Z"},
      {"2026-11-21T09:30:00+02:00", "2026-11-21T07:30:00Z"},
      {"2026-12-31t23:30:00-01:30", "2027-01-01T01:00:00Z"},
      {"2026-11-21 09:30:00z", "2026-11-21T09:30:00Z"},
      {"2016-12-31T23:59:60Z", "2017-01-01T00:00:00Z"},
      {"2026-11-21T09:30:00.1234567899Z", "2026-11-21T09:30:00.123456789Z"},
  };
  for (const auto& [text, expected] : cases) {
    const auto date = Date::fromRFC3339(text);
    ASSERT_TRUE(date.has_value()) << text;
    EXPECT_EQ(date->rfc3339(), expected) << text;
  }
}

TEST(Date, RefusesWhatNoCalendarHas) {
  for (const char* text : {"",
                           "2026",
                           "2026-11",
                           "2026-02-29",
                           "2026-13-01",
                           "2026-00-01",
                           "2026-11-31",
                           "2026-1-01",
                           "0000-12-31",
                           "+2026-01-01",
                           "2026-11-21T",
                           "2026-11-21T09:30:00",
                           "2026-11-21T24:00:00Z",
                           "2026-11-21T09:60:00Z",
                           "2026-11-21T09:30:61Z",
                           "2026-11-21T09:30:00.Z",
                           "2026-11-21T09:30:00Z ",
                           "2026-11-21T09:30Z",
                           "2026-11-21T09:30:00+0200",
                           "2026-11-21T09:30:00+24:00",
                           "0001-01-01T00:00:00+00:01",
                           "9999-12-31T23:59:59-00:01"}) {
    EXPECT_FALSE(Date::fromRFC3339(text).has_value()) << text;
  }
  for (const double seconds : {std::nan(""), HUGE_VAL, -HUGE_VAL, 1e300, -1e300, 1e12,
                               double(Date::latest.seconds - Date::referenceEpoch + 1),
                               double(Date::earliest.seconds - Date::referenceEpoch - 1)}) {
    EXPECT_FALSE(Date::fromReferenceSeconds(seconds).has_value()) << seconds;
  }
}

RC_GTEST_PROP(DateProperties, TextKeepsEachNanosecondAndReferenceSecondsWhatADoubleHolds, ()) {
  const Date date{*rc::gen::inRange<std::int64_t>(Date::earliest.seconds, Date::latest.seconds),
                  *rc::gen::inRange<std::uint32_t>(0, 1'000'000'000)};
  RC_ASSERT(Date::fromRFC3339(date.rfc3339()) == date);
  const auto once = Date::fromReferenceSeconds(date.referenceSeconds());
  RC_ASSERT(once.has_value());
  RC_ASSERT(Date::fromReferenceSeconds(once->referenceSeconds()) == once);
  RC_ASSERT(std::abs(once->referenceSeconds() - date.referenceSeconds()) < 1e-4);
}

TEST(Number, ComparesByValueAndNotByKind) {
  constexpr std::int64_t precise = (std::int64_t{1} << 53) + 1;  // no double has this value
  constexpr auto largest = std::numeric_limits<std::uint64_t>::max();
  const std::vector<std::tuple<Number, Number, bool>> cases{
      {Number::of(std::int64_t{3}), Number::of(std::uint64_t{3}), true},
      {Number::of(std::int64_t{3}), Number::of(3.0), true},
      {Number::of(std::uint64_t{3}), Number::of(3.0), true},
      {Number::of(0.0), Number::of(-0.0), true},
      {Number::of(std::int64_t{0}), Number::of(-0.0), true},
      {Number::of(std::nan("")), Number::of(std::nan("")), true},
      {Number::of(std::int64_t{-1}), Number::of(largest), false},
      {Number::of(precise), Number::of(static_cast<double>(precise)), false},
      {Number::of(largest), Number::of(0x1p64), false},
      {Number::of(std::numeric_limits<std::int64_t>::max()), Number::of(0x1p63), false},
      {Number::of(std::numeric_limits<std::int64_t>::min()), Number::of(-0x1p63), true},
      {Number::of(std::int64_t{0}), Number::of(std::nan("")), false},
      {Number::of(std::uint64_t{3}), Number::of(3.5), false},
      {Number::of(largest), Number::of(HUGE_VAL), false},
  };
  for (const auto& [a, b, equal] : cases) {
    EXPECT_EQ(a == b, equal) << a.description() << " " << b.description();
    EXPECT_EQ(b == a, equal) << b.description() << " " << a.description();
  }
}

TEST(Number, IsUnsignedWhenNothingIsLost) {
  constexpr auto largest = std::numeric_limits<std::uint64_t>::max();
  EXPECT_EQ(Number::of(largest).asUnsigned(), largest);
  EXPECT_EQ(Number::of(0x1p63).asUnsigned(), std::uint64_t{1} << 63);
  for (const Number number : {Number::of(std::int64_t{-1}), Number::of(0.5), Number::of(-1.0),
                              Number::of(0x1p64), Number::of(std::nan(""))}) {
    EXPECT_FALSE(number.asUnsigned().has_value()) << number.description();
  }
  EXPECT_EQ(Number::of(largest).description(), "18446744073709551615");
  EXPECT_EQ(Number::of(0.1).description(), "0.1");
}

TEST(UUID, ReadsTheCanonicalFormOnly) {
  const char* text = "00112233-4455-6677-8899-AABBCCDDEEFF";
  const auto uuid = UUID::fromString("00112233-4455-6677-8899-aabbccddeeff");
  ASSERT_TRUE(uuid.has_value());
  EXPECT_EQ(uuid->description(), text);
  EXPECT_EQ(uuid->bytes[15], 0xFF);
  for (const char* other :
       {"", "00112233-4455-6677-8899-AABBCCDDEEF", "00112233-4455-6677-8899-AABBCCDDEEFFF",
        "001122334455-6677-8899-AABB-CCDDEEFF", "00112233-4455-6677-8899-AABBCCDDEEFG",
        "{0112233-4455-6677-8899-AABBCCDDEEF}", "00112233445566778899AABBCCDDEEFF"}) {
    EXPECT_FALSE(UUID::fromString(other).has_value()) << other;
  }
}

}  // namespace
}  // namespace mirabel
