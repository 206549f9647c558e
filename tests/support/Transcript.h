#pragma once

#include <algorithm>
#include <gtest/gtest.h>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "support/LogCapture.h"

namespace mirabel::testing {

/// Looks in what was logged so far for lines that people and tools search for, one of `expected`
/// after the other and letter for letter. A section opens with "┏label" and closes with "┗". Other
/// lines may stand between them, but none that tells of an error.
inline void expectTranscript(const LogCapture& log, const std::string& expected) {
  constexpr std::string_view opening = "[DEBUG] ┏";
  std::vector<std::string> lines;
  std::string all;
  for (const LogLine& line : log.lines()) {
    std::string text = line.text;
    if (text.starts_with("[DEBUG] ┗")) text = "┗";
    if (text.starts_with(opening)) text = "┏" + text.substr(text.find(' ', opening.size()) + 1);
    all += "\n" + text;
    lines.push_back(std::move(text));
  }
  std::istringstream wanted(expected);
  auto from = lines.begin();
  for (std::string line; std::getline(wanted, line);) {
    if (line.empty()) continue;
    const auto found = std::find(from, lines.end(), line);
    if (found == lines.end()) {
      ADD_FAILURE() << line << "\nis not in its place in" << all;
      return;
    }
    const auto isError = [](const std::string& text) { return text.starts_with("[ERROR]"); };
    EXPECT_EQ(std::find_if(from, found, isError), found) << "before " << line << all;
    from = found + 1;
  }
}

}  // namespace mirabel::testing
