#pragma once

#include <string_view>

namespace mirabel {

/// Logs `message` at error level and ends the process with SIGABRT: a programming error, or a
/// state in which going on would harm.
[[noreturn]] void fatalError(std::string_view message);

}  // namespace mirabel
