#pragma once

#include <optional>
#include <string_view>

#include "mirabel/Values.h"

namespace mirabel {

/// The moment that a person means by "older than": a moment in RFC 3339 form, a day (its first
/// moment here, in the local time zone), or how long ago it was: a whole number with one of the
/// units s, m, h, d, w. Nothing for what is none of these, or lies outside the calendar.
[[nodiscard]] std::optional<Date> referenceDateFrom(std::string_view text, const Date& now);

}  // namespace mirabel
