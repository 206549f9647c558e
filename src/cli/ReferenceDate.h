#pragma once

#include <optional>
#include <string_view>

#include "mirabel/Values.h"

namespace mirabel {

/// The moment that a person means: a moment in RFC 3339 form, or a day (its first moment here, in
/// the local time zone). Nothing for what is neither, or lies outside the calendar.
[[nodiscard]] std::optional<Date> dateFrom(std::string_view text);

/// The same for "older than", where it may also be how long ago it was: a whole number with one of
/// the units s, m, h, d, w.
[[nodiscard]] std::optional<Date> referenceDateFrom(std::string_view text, const Date& now);

}  // namespace mirabel
