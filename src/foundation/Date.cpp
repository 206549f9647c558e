#include <algorithm>
#include <cmath>
#include <cstdio>

#include "mirabel/Values.h"

namespace mirabel {
namespace {

using std::chrono::days;
using std::chrono::sys_days;

constexpr std::int64_t secondsPerDay = 86'400;
constexpr std::uint32_t nanosecondsPerSecond = 1'000'000'000;

std::optional<Date> inCalendar(const Date& date) {
  if (date < Date::earliest || date > Date::latest) return std::nullopt;
  return date;
}

/// Reads a text from the left; each step tells whether what it asked for was there.
class TextReader {
 public:
  explicit TextReader(std::string_view text) : rest_(text) {}

  [[nodiscard]] bool isAtEnd() const { return rest_.empty(); }

  bool skipAnyOf(std::string_view characters) {
    if (rest_.empty() || characters.find(rest_.front()) == std::string_view::npos) return false;
    rest_.remove_prefix(1);
    return true;
  }

  std::optional<unsigned> digit() {
    if (rest_.empty() || rest_.front() < '0' || rest_.front() > '9') return std::nullopt;
    const unsigned value = static_cast<unsigned>(rest_.front() - '0');
    rest_.remove_prefix(1);
    return value;
  }

  /// Exactly `count` digits, with a value up to `largest`.
  std::optional<unsigned> number(int count, unsigned largest) {
    unsigned value = 0;
    for (int i = 0; i < count; ++i) {
      const auto next = digit();
      if (!next) return std::nullopt;
      value = value * 10 + *next;
    }
    if (value > largest) return std::nullopt;
    return value;
  }

 private:
  std::string_view rest_;
};

/// Seconds from 1970 to the midnight that a "YYYY-MM-DD" names.
std::optional<std::int64_t> readDay(TextReader& reader) {
  const auto year = reader.number(4, 9999);
  if (!year || !reader.skipAnyOf("-")) return std::nullopt;
  const auto month = reader.number(2, 12);
  if (!month || !reader.skipAnyOf("-")) return std::nullopt;
  const auto day = reader.number(2, 31);
  if (!day) return std::nullopt;
  const std::chrono::year_month_day date{std::chrono::year(static_cast<int>(*year)),
                                         std::chrono::month(*month), std::chrono::day(*day)};
  if (!date.ok()) return std::nullopt;
  return std::int64_t{sys_days(date).time_since_epoch().count()} * secondsPerDay;
}

/// Seconds since midnight of an "HH:MM:SS". A leap second counts as the second after it.
std::optional<std::int64_t> readTimeOfDay(TextReader& reader) {
  const auto hour = reader.number(2, 23);
  if (!hour || !reader.skipAnyOf(":")) return std::nullopt;
  const auto minute = reader.number(2, 59);
  if (!minute || !reader.skipAnyOf(":")) return std::nullopt;
  const auto second = reader.number(2, 60);
  if (!second) return std::nullopt;
  return *hour * 3600 + *minute * 60 + *second;
}

/// Nanoseconds of a fraction, 0 where there is none. Digits after the ninth are dropped.
std::optional<std::uint32_t> readFraction(TextReader& reader) {
  if (!reader.skipAnyOf(".")) return 0;
  std::uint32_t value = 0;
  std::uint32_t unit = nanosecondsPerSecond;
  auto next = reader.digit();
  if (!next) return std::nullopt;
  for (; next; next = reader.digit()) {
    unit /= 10;
    value += *next * unit;
  }
  return value;
}

/// Seconds to add to UTC for the local time that was read.
std::optional<std::int64_t> readOffset(TextReader& reader) {
  if (reader.skipAnyOf("Zz")) return 0;
  const bool isEast = reader.skipAnyOf("+");
  if (!isEast && !reader.skipAnyOf("-")) return std::nullopt;
  const auto hours = reader.number(2, 23);
  if (!hours || !reader.skipAnyOf(":")) return std::nullopt;
  const auto minutes = reader.number(2, 59);
  if (!minutes) return std::nullopt;
  const std::int64_t offset = *hours * 3600 + *minutes * 60;
  return isEast ? offset : -offset;
}

std::string fractionText(std::uint32_t nanoseconds) {
  std::string digits = std::to_string(nanosecondsPerSecond + nanoseconds);
  digits.front() = '.';
  digits.erase(digits.find_last_not_of('0') + 1);
  return digits;
}

}  // namespace

Date Date::now() {
  const auto time = std::chrono::system_clock::now();
  const auto second = std::chrono::floor<std::chrono::seconds>(time);
  const std::chrono::nanoseconds fraction = time - second;
  return {second.time_since_epoch().count(), static_cast<std::uint32_t>(fraction.count())};
}

std::optional<Date> Date::fromReferenceSeconds(double secondsSince2001) {
  // Also keeps what follows within the integer's range; not a number fails the comparison.
  if (!(std::abs(secondsSince2001) < 1e12)) return std::nullopt;
  const double whole = std::floor(secondsSince2001);
  const double fraction = std::round((secondsSince2001 - whole) * nanosecondsPerSecond);
  Date date{static_cast<std::int64_t>(whole) + referenceEpoch,
            static_cast<std::uint32_t>(fraction)};
  if (date.nanoseconds == nanosecondsPerSecond) date = {date.seconds + 1, 0};
  return inCalendar(date);
}

double Date::referenceSeconds() const {
  return static_cast<double>(seconds) - static_cast<double>(referenceEpoch) + nanoseconds * 1e-9;
}

std::string Date::rfc3339() const {
  const Date date = std::clamp(*this, earliest, latest);
  const std::chrono::sys_seconds second{std::chrono::seconds(date.seconds)};
  const sys_days midnight = std::chrono::floor<days>(second);
  const std::chrono::year_month_day day(midnight);
  const std::chrono::hh_mm_ss time(second - midnight);
  std::array<char, 64> text;
  std::snprintf(text.data(), text.size(), "%04d-%02u-%02uT%02d:%02d:%02d", int(day.year()),
                unsigned(day.month()), unsigned(day.day()), int(time.hours().count()),
                int(time.minutes().count()), int(time.seconds().count()));
  return std::string(text.data()) + (date.nanoseconds == 0 ? "" : fractionText(date.nanoseconds)) +
         "Z";
}

std::optional<Date> Date::fromRFC3339(std::string_view text) {
  TextReader reader(text);
  const auto midnight = readDay(reader);
  if (!midnight) return std::nullopt;
  if (reader.isAtEnd()) return inCalendar({*midnight, 0});
  if (!reader.skipAnyOf("Tt ")) return std::nullopt;
  const auto timeOfDay = readTimeOfDay(reader);
  if (!timeOfDay) return std::nullopt;
  const auto fraction = readFraction(reader);
  if (!fraction) return std::nullopt;
  const auto offset = readOffset(reader);
  if (!offset || !reader.isAtEnd()) return std::nullopt;
  return inCalendar({*midnight + *timeOfDay - *offset, *fraction});
}

}  // namespace mirabel
