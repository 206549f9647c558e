#include "cli/ReferenceDate.h"

#include <charconv>
#include <cstdint>
#include <ctime>
#include <limits>
#include <string>
#include <utility>

namespace mirabel {
namespace {

constexpr std::size_t dayLength = std::string_view("2026-11-21").size();

std::optional<std::int64_t> secondsIn(char unit) {
  constexpr std::pair<char, std::int64_t> units[] = {
      {'s', 1}, {'m', 60}, {'h', 3'600}, {'d', 86'400}, {'w', 604'800}};
  for (const auto& [name, seconds] : units) {
    if (name == unit) return seconds;
  }
  return {};
}

std::optional<Date> ago(std::string_view text, const Date& now) {
  if (text.empty() || text.front() == '-') return {};
  const auto unit = secondsIn(text.back());
  const std::string_view digits = text.substr(0, text.size() - 1);
  std::int64_t count = 0;
  const auto [stopped, failure] = std::from_chars(digits.begin(), digits.end(), count);
  if (!unit || failure != std::errc() || stopped != digits.end()) return {};
  if (count > std::numeric_limits<std::int64_t>::max() / *unit) return {};
  const std::int64_t age = count * *unit;
  if (age > now.seconds - Date::earliest.seconds) return {};
  return Date{now.seconds - age, now.nanoseconds};
}

/// `day` is one of the calendar, "YYYY-MM-DD".
std::optional<Date> localMidnight(const std::string& day) {
  std::tm midnight{};
  midnight.tm_year = std::stoi(day.substr(0, 4)) - 1900;
  midnight.tm_mon = std::stoi(day.substr(5, 2)) - 1;
  midnight.tm_mday = std::stoi(day.substr(8, 2));
  midnight.tm_isdst = -1;  // as it is on that day
  midnight.tm_wday = -1;   // stays like this when there is no such time
  const std::time_t seconds = std::mktime(&midnight);
  // East of Greenwich the first day of the calendar begins before it.
  if (midnight.tm_wday < 0 || Date{seconds, 0} < Date::earliest) return {};
  return Date{seconds, 0};
}

}  // namespace

std::optional<Date> dateFrom(std::string_view text) {
  const auto date = Date::fromRFC3339(text);
  return date && text.size() == dayLength ? localMidnight(std::string(text)) : date;
}

std::optional<Date> referenceDateFrom(std::string_view text, const Date& now) {
  return Date::fromRFC3339(text) ? dateFrom(text) : ago(text, now);
}

}  // namespace mirabel
