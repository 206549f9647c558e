#include "cli/UsageText.h"

#include <CLI/CLI.hpp>
#include <optional>
#include <string_view>
#include <utility>

#include "cli/TextOptions.h"

namespace mirabel {
namespace {

std::string before(const std::string& text, std::string_view mark) {
  return text.substr(0, text.find(mark));
}

std::string after(const std::string& text, std::string_view mark) {
  const std::size_t place = text.find(mark);
  return place == std::string::npos ? text : text.substr(place + mark.size());
}

std::optional<UsageFault> unknownOption(const CLI::App& app) {
  for (const std::string& extra : app.remaining(true)) {
    if (!extra.starts_with('-') || extra.size() < 2) continue;
    return UsageFault{"there is no option " + withoutGuards(extra) +
                          "; a name that begins with a dash follows --",
                      ""};
  }
  return {};
}

UsageFault unexpected(const CLI::App& app) {
  const auto extras = app.remaining(true);
  const std::string first = extras.empty() ? "" : withoutGuards(extras.front());
  if (app.get_subcommands().empty()) return {"there is no command " + first, ""};
  return {"\"" + first + "\" is one argument too many", ""};
}

UsageFault mismatch(const std::string& text) {
  const std::string name = before(text, ":");
  if (text.find("missing") != std::string::npos) return {name + " has no value", name};
  if (text.find("At Most") != std::string::npos) return {name + " is given more than once", name};
  return {text, name};
}

UsageFault conversion(const CLI::App& app, const std::string& text) {
  const std::string name = before(after(text, "Could not convert: "), " = ");
  const CLI::Option* global = app.get_option_no_throw(name);
  const bool isFlag = global != nullptr && global->get_items_expected() == 0;
  return {name + (isFlag ? " takes no value" : " takes a number"), name};
}

}  // namespace

UsageFault usageFault(const CLI::App& app, const CLI::ParseError& error) {
  const std::string text = withoutGuards(error.what());
  // What is missing may be what was taken for an option.
  if (auto unknown = unknownOption(app)) return *std::move(unknown);
  if (dynamic_cast<const CLI::ExtrasError*>(&error) != nullptr) return unexpected(app);
  if (dynamic_cast<const CLI::ArgumentMismatch*>(&error) != nullptr) return mismatch(text);
  if (dynamic_cast<const CLI::ConversionError*>(&error) != nullptr) return conversion(app, text);
  if (dynamic_cast<const CLI::RequiredError*>(&error) != nullptr) {
    const std::string name = before(text, " is required");
    return {name + " is missing", name};
  }
  if (dynamic_cast<const CLI::ExcludesError*>(&error) != nullptr) {
    return {before(text, " excludes ") + " and " + after(text, " excludes ") + " don't go together",
            ""};
  }
  if (dynamic_cast<const CLI::ValidationError*>(&error) != nullptr) {
    const std::string name = before(text, ": ");
    return {name + " " + after(text, ": "), name};
  }
  return {text, ""};
}

}  // namespace mirabel
