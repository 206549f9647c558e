// A line that says in which time zone and when it is asked, and any text as a date or an age: it is
// none, or a moment of the calendar that is the same when it is written and read again.

#include <array>
#include <cstdlib>
#include <ctime>

#include "ByteSource.h"
#include "Require.h"
#include "cli/ReferenceDate.h"

using namespace mirabel;

namespace {

// From the first to the last hour of a day, and one that has days without a midnight.
constexpr std::array zones{"UTC0", "<+14>-14", "<-12>12", "CET-1CEST,M3.5.0/0,M10.5.0/1"};

void setZone(std::size_t which) {
  ::setenv("TZ", zones[which], 1);
  ::tzset();
}

void requireInCalendar(const Date& date) {
  require(date >= Date::earliest && date <= Date::latest);
  require(date.nanoseconds < 1'000'000'000);
  require(Date::fromRFC3339(date.rfc3339()) == date);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  ByteSource source(data, size);
  setZone(source.below(zones.size()));
  Date now{1'763'700'000, 5};
  if (source.flag()) now = source.flag() ? Date::earliest : Date::latest;
  const std::string_view text = source.rest();
  if (const auto date = Date::fromRFC3339(text)) requireInCalendar(*date);
  const auto date = referenceDateFrom(text, now);
  if (!date) return 0;
  requireInCalendar(*date);
  // It is a day or a moment, or lies before now.
  require(*date <= now || Date::fromRFC3339(text));
  return 0;
}
