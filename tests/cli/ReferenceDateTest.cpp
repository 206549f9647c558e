#include <cstdlib>
#include <ctime>
#include <gtest/gtest.h>
#include <string>

#include "cli/ReferenceDate.h"

namespace mirabel::testing {
namespace {

constexpr Date now{1'763'700'000, 500};

/// Another time zone while it lives.
class TimeZone {
 public:
  explicit TimeZone(const char* name) { set(name); }
  ~TimeZone() { set(before_.empty() ? nullptr : before_.c_str()); }
  TimeZone(const TimeZone&) = delete;
  TimeZone& operator=(const TimeZone&) = delete;

 private:
  static void set(const char* name) {
    name == nullptr ? ::unsetenv("TZ") : ::setenv("TZ", name, 1);
    ::tzset();
  }
  std::string before_ = std::getenv("TZ") == nullptr ? "" : std::getenv("TZ");
};

std::optional<Date> date(const char* rfc3339) {
  return Date::fromRFC3339(rfc3339);
}

TEST(ReferenceDate, AgesCountBackFromNow) {
  const std::pair<const char*, std::int64_t> cases[] = {
      {"0s", 0},          {"90s", 90},       {"45m", 45 * 60}, {"12h", 43'200},
      {"30d", 2'592'000}, {"2w", 1'209'600}, {"007d", 604'800}};
  for (const auto& [text, seconds] : cases) {
    EXPECT_EQ(referenceDateFrom(text, now), (Date{now.seconds - seconds, now.nanoseconds})) << text;
  }
}

TEST(ReferenceDate, ADayBeginsAtLocalMidnightAndAMomentIsExact) {
  const TimeZone zone("EST5EDT,M3.2.0,M11.1.0");
  EXPECT_EQ(referenceDateFrom("2026-11-21", now), date("2026-11-21T05:00:00Z"));
  EXPECT_EQ(dateFrom("2026-11-21"), date("2026-11-21T05:00:00Z"));
  EXPECT_EQ(dateFrom("2026-11-21T09:30:00Z"), date("2026-11-21T09:30:00Z"));
  EXPECT_EQ(dateFrom("30d"), std::nullopt);
  EXPECT_EQ(referenceDateFrom("2026-07-01", now), date("2026-07-01T04:00:00Z"));
  EXPECT_EQ(referenceDateFrom("1969-12-31", now), date("1969-12-31T05:00:00Z"));
  EXPECT_EQ(referenceDateFrom("2026-11-21T09:30:00.5Z", now), date("2026-11-21T09:30:00.5Z"));
  EXPECT_EQ(referenceDateFrom("2026-11-21T09:30:00+02:00", now), date("2026-11-21T07:30:00Z"));
}

TEST(ReferenceDate, TheFirstDayBeginsBeforeTheCalendarInTheEast) {
  const TimeZone zone("<+14>-14");
  EXPECT_EQ(referenceDateFrom("0001-01-01", now), std::nullopt);
  EXPECT_EQ(referenceDateFrom("0001-01-02", now), date("0001-01-01T10:00:00Z"));
}

TEST(ReferenceDate, EverythingElseIsRefused) {
  for (const char* text :
       {"", "d", "30", "30 d", "-30d", "+30d", "30D", "3.5d", "30days", "1d2h", "0x1d", "yesterday",
        "2026-13-01", "2026-02-30", "26-11-21", "999999w", "2026-11-21x"})
    EXPECT_EQ(referenceDateFrom(text, now), std::nullopt) << text;
  for (const char* text : {"2026-11-21T25:00:00Z", "9223372036854775807w", "99999999999999999999d"})
    EXPECT_EQ(referenceDateFrom(text, now), std::nullopt) << text;
}

}  // namespace
}  // namespace mirabel::testing
