#pragma once

#include <string>

#include "support/LogCapture.h"

namespace mirabel::testing {

inline LogLine debug(const std::string& text) {
  return {LogLevel::debug, "[DEBUG] " + text};
}
inline LogLine error(const std::string& text) {
  return {LogLevel::error, "[ERROR] " + text};
}

}  // namespace mirabel::testing
