#pragma once

#include <string>

namespace CLI {
class App;
}

namespace mirabel {

/// A script that completes commands, options and arguments of the program: made of what its command
/// line is, so that it knows all of that. `shell`: bash, zsh or fish.
[[nodiscard]] std::string completionFor(const CLI::App& app, const std::string& shell);

}  // namespace mirabel
