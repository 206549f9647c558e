#pragma once

#include <string>
#include <string_view>

#include "mirabel/Error.h"

namespace mirabel {

/// Why something failed, for people: one line in lower case without a full stop, which goes on to
/// say what to do next where there is something to do. Neither domain nor code is in it.
[[nodiscard]] std::string explanation(const Error& error);

/// A key of `Error::userInfo`: the explanation as the service gave it, which knew more of the error
/// than came over the bus.
inline constexpr std::string_view toldExplanation = "explanation";

}  // namespace mirabel
