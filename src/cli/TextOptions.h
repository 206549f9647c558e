#pragma once

#include <CLI/CLI.hpp>
#include <optional>
#include <string>
#include <vector>

namespace mirabel {

// Texts of the command line, taken letter for letter. The parsing library's own options take
// "[a,b]" for a list of two, "{}" for an empty one and an empty text for none, but "[draft]" is the
// name of a file, and an empty name is to be refused and not passed over.
//
// The library splits what stands in brackets before anybody else sees it. So a NUL, which no
// argument holds, is put behind each closing bracket at an argument's end, and taken away here.

/// The arguments as the library is to get them.
[[nodiscard]] std::vector<std::string> withGuardedBrackets(std::vector<std::string> arguments);
/// The same text without guards; for messages of the library as well.
[[nodiscard]] std::string withoutGuards(std::string text);

/// Options as of `CLI::App::add_option`; `text` outlives the app. An option that takes several is
/// given again for each.
CLI::Option* addText(CLI::App& app, const char* name, std::string& text, const char* help);
CLI::Option* addText(CLI::App& app, const char* name, std::optional<std::string>& text,
                     const char* help);
CLI::Option* addTexts(CLI::App& app, const char* name, std::vector<std::string>& texts,
                      const char* help);

}  // namespace mirabel
