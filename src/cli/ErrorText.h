#pragma once

#include <string>

#include "foundation/Error.h"

namespace mirabel {

/// Why something failed, for people: one line in lower case without a full stop, which goes on to
/// say what to do next where there is something to do. Neither domain nor code is in it.
[[nodiscard]] std::string explanation(const Error& error);

}  // namespace mirabel
