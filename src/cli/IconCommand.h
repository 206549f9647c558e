#pragma once

#include <cstdint>
#include <string>

#include "cli/Program.h"

namespace mirabel {

struct IconOptions {
  std::string item;
  std::string file;  ///< where the picture goes; "-" for standard output
  std::int64_t size = 256;
};
/// Writes the icon of an app library's application as a PNG file, in place of what the file held.
ExitCode runIcon(Program& program, const IconOptions& options);

}  // namespace mirabel
