#pragma once

#include <string>
#include <vector>

#include "cli/Program.h"

namespace mirabel {

/// Runs the program with the arguments that follow its name, and answers its exit code.
[[nodiscard]] int runCommandLine(const std::vector<std::string>& arguments, Streams streams);

}  // namespace mirabel
