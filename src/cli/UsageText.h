#pragma once

#include <string>

namespace CLI {
class App;
class ParseError;
}  // namespace CLI

namespace mirabel {

/// What is wrong with a command line, in one line.
struct UsageFault {
  std::string text;
  std::string option;  ///< that it is about, with its dashes, where it is about one
};

/// The parsing library's error in this program's words; those that it does not come to here are as
/// the library has them. `app` is what was parsed for.
[[nodiscard]] UsageFault usageFault(const CLI::App& app, const CLI::ParseError& error);

}  // namespace mirabel
