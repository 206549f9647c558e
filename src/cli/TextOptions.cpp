#include "cli/TextOptions.h"

#include <utility>

namespace mirabel {
namespace {

constexpr char guard = '\0';

CLI::Option* add(CLI::App& app, const char* name, CLI::callback_t take, const char* help) {
  return app.add_option(name, std::move(take), help);
}

}  // namespace

std::vector<std::string> withGuardedBrackets(std::vector<std::string> arguments) {
  for (std::string& argument : arguments)
    if (argument.ends_with(']')) argument += guard;
  return arguments;
}

std::string withoutGuards(std::string text) {
  std::erase(text, guard);
  return text;
}

CLI::Option* addText(CLI::App& app, const char* name, std::string& text, const char* help) {
  const auto take = [&text](const CLI::results_t& given) {
    text = withoutGuards(given.front());
    return true;
  };
  return add(app, name, take, help);
}

CLI::Option* addText(CLI::App& app, const char* name, std::optional<std::string>& text,
                     const char* help) {
  const auto take = [&text](const CLI::results_t& given) {
    text = withoutGuards(given.front());
    return true;
  };
  return add(app, name, take, help);
}

CLI::Option* addTexts(CLI::App& app, const char* name, std::vector<std::string>& texts,
                      const char* help) {
  const auto take = [&texts](const CLI::results_t& given) {
    texts.clear();
    for (const std::string& text : given)
      texts.push_back(withoutGuards(text));
    return true;
  };
  CLI::Option* option = add(app, name, take, help);
  option->expected(CLI::detail::expected_max_vector_size);
  // What follows the value of a named option is no further value of it.
  if (!option->get_positional()) option->allow_extra_args(false);
  return option;
}

}  // namespace mirabel
