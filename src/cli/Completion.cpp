#include "cli/Completion.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <string_view>
#include <vector>

namespace mirabel {
namespace {

/// What stands behind an option, or in an argument's place.
enum class Value { none, text, folder, file, item };

struct CommandOption {
  std::string name;  ///< with its dashes
  std::string help;
  Value value;
};

struct Command {
  std::string name;
  std::string help;
  std::vector<CommandOption> options;  ///< beside the global ones
  std::vector<std::string> words;      ///< that its arguments may be
  bool takesPaths = false;
};

Value valueOf(const CLI::Option& option) {
  if (option.get_items_expected() == 0) return Value::none;
  const std::string type = option.get_type_name();
  if (type == "DIR") return Value::folder;
  if (type == "FILE") return Value::file;
  return type == "ITEM" ? Value::item : Value::text;
}

std::vector<CommandOption> optionsOf(const CLI::App& app) {
  std::vector<CommandOption> options;
  for (const CLI::Option* option : app.get_options()) {
    for (const std::string& name : option->get_lnames())
      options.push_back({"--" + name, option->get_description(), valueOf(*option)});
    for (const std::string& name : option->get_snames())
      options.push_back({"-" + name, option->get_description(), valueOf(*option)});
  }
  return options;
}

std::vector<CommandOption> without(std::vector<CommandOption> options,
                                   const std::vector<CommandOption>& others) {
  std::erase_if(options, [&](const CommandOption& option) {
    return std::ranges::find(others, option.name, &CommandOption::name) != others.end();
  });
  return options;
}

bool hasArgument(const CLI::App& command, std::initializer_list<std::string_view> names) {
  return std::ranges::any_of(command.get_options(), [&](const CLI::Option* option) {
    return option->get_positional() && std::ranges::find(names, option->get_name()) != names.end();
  });
}

std::vector<std::string> wordsOf(const CLI::App& command) {
  const std::string& name = command.get_name();
  if (name == "completion") return {"bash", "zsh", "fish"};
  if (name == "ls" || name == "anchor" || name == "changes" || name == "watch") {
    return {"root", "workingset", "alldirs"};
  }
  if (hasArgument(command, {"ITEM"})) return {"root"};
  return {};
}

std::vector<Command> commandsOf(const CLI::App& app) {
  std::vector<Command> commands;
  const auto global = optionsOf(app);
  for (const CLI::App* command : app.get_subcommands([](const CLI::App*) { return true; })) {
    commands.push_back({command->get_name(), command->get_description(),
                        without(optionsOf(*command), global), wordsOf(*command),
                        hasArgument(*command, {"ITEM", "PATH", "FILE", "PARENT"})});
  }
  return commands;
}

std::string joined(const std::vector<std::string>& words, const char* between = " ") {
  std::string text;
  for (const std::string& word : words)
    text += (text.empty() ? "" : between) + word;
  return text;
}

std::string names(const std::vector<CommandOption>& options) {
  std::vector<std::string> all;
  all.reserve(options.size());
  for (const CommandOption& option : options)
    all.push_back(option.name);
  return joined(all);
}

/// The options of all commands that have such a value, as a pattern of the shell's; no option has a
/// value in one command and none in another.
std::string patternOf(const CLI::App& app, Value value) {
  std::vector<std::string> found;
  const auto add = [&](const std::vector<CommandOption>& options) {
    for (const CommandOption& option : options) {
      const bool isNew = std::ranges::find(found, option.name) == found.end();
      if (option.value == value && isNew) found.push_back(option.name);
    }
  };
  add(optionsOf(app));
  for (const Command& command : commandsOf(app))
    add(command.options);
  return joined(found, "|");
}

/// The same of all that have a value, whichever.
std::string patternOfAll(const CLI::App& app) {
  return joined({patternOf(app, Value::text), patternOf(app, Value::folder),
                 patternOf(app, Value::file), patternOf(app, Value::item)},
                "|");
}

/// In single quotes, for any of the shells.
std::string shellQuoted(std::string_view text) {
  std::string result = "'";
  for (const char character : text)
    result += character == '\'' ? std::string("'\\''") : std::string(1, character);
  return result + "'";
}

// "--home=DIR" comes as three words here, for "=" ends one in bash. What follows an option with a
// value is that value, whatever it looks like; so the words are gone through from the front.
std::string forBash(const CLI::App& app) {
  std::string commands;
  std::string cases;
  for (const Command& command : commandsOf(app)) {
    commands += (commands.empty() ? "" : " ") + command.name;
    cases += "    " + command.name + ") options=" + shellQuoted(names(command.options)) +
             " words=" + shellQuoted(joined(command.words)) +
             (command.takesPaths ? " paths=-f" : "") + " ;;\n";
  }
  return "# bash completion for mirabel\n"
         "_mirabel() {\n"
         "  local current=${COMP_WORDS[COMP_CWORD]} command= word options= words= paths=\n"
         "  local expected= ended=\n"
         "  local -r commands=" +
         shellQuoted(commands) + " global=" + shellQuoted(names(optionsOf(app))) +
         "\n"
         "  for word in \"${COMP_WORDS[@]:1:COMP_CWORD-1}\"; do\n"
         "    if [[ -n $expected ]]; then\n"
         "      [[ $word == = ]] || expected=\n"
         "      continue\n"
         "    fi\n"
         "    if [[ -z $ended ]]; then\n"
         "      case $word in\n"
         "        --) ended=1 ;;\n"
         "        " +
         patternOfAll(app) +
         ") expected=$word ;;\n"
         "      esac\n"
         "    fi\n"
         "    [[ -z $command && \" $commands \" == *\" $word \"* ]] && command=$word\n"
         "  done\n"
         "  case $command in\n"
         "    '') words=$commands ;;\n" +
         cases +
         "  esac\n"
         "  [[ $current == = ]] && current=\n"
         "  case $expected in\n"
         "    '') ;;\n"
         "    " +
         patternOf(app, Value::folder) +
         ") words= paths=-d ;;\n"
         "    " +
         patternOf(app, Value::file) +
         ") words= paths=-f ;;\n"
         "    " +
         patternOf(app, Value::item) +
         ") words=root paths=-f ;;\n"
         "    *) return ;;\n"
         "  esac\n"
         "  if [[ -z $expected$ended && $current == -* ]]; then\n"
         "    mapfile -t COMPREPLY < <(compgen -W \"$options $global\" -- \"$current\")\n"
         "    return\n"
         "  fi\n"
         "  mapfile -t COMPREPLY < <(compgen -W \"$words\" -- \"$current\")\n"
         "  if [[ -n $paths ]]; then\n"
         "    compopt -o filenames 2>/dev/null\n"
         "    mapfile -t -O \"${#COMPREPLY[@]}\" COMPREPLY < <(compgen $paths -- \"$current\")\n"
         "  fi\n"
         "}\n"
         "complete -F _mirabel mirabel\n";
}

// Colons end the name of what _describe offers.
std::string zshOption(const CommandOption& option) {
  return shellQuoted(option.name + ":" + option.help);
}

std::string forZsh(const CLI::App& app) {
  std::string commands;
  std::string cases;
  for (const Command& command : commandsOf(app)) {
    commands += "    " + shellQuoted(command.name + ":" + command.help) + "\n";
    cases += "  " + command.name + ")\n    options+=(";
    for (const CommandOption& option : command.options)
      cases += zshOption(option) + " ";
    cases += ")\n    offered=(" + joined(command.words) + ")" +
             (command.takesPaths ? " paths=1" : "") + " ;;\n";
  }
  std::string global;
  for (const CommandOption& option : optionsOf(app))
    global += zshOption(option) + " ";
  return "#compdef mirabel\n"
         "local -a commands options offered\n"
         "local command= word expected= ended= paths=\n"
         "commands=(\n" +
         commands +
         ")\n"
         "options=(" +
         global +
         ")\n"
         "for word in \"${(@)words[2,CURRENT-1]}\"; do\n"
         "  if [[ -n $expected ]]; then expected=; continue; fi\n"
         "  if [[ -z $ended ]]; then\n"
         "    case $word in\n"
         "      --) ended=1 ;;\n"
         "      " +
         patternOfAll(app) +
         ") expected=$word ;;\n"
         "    esac\n"
         "  fi\n"
         "  if [[ -z $command && -n ${commands[(r)$word:*]} ]]; then command=$word; fi\n"
         "done\n"
         "if [[ -z $expected$ended && $PREFIX == --*=* ]]; then\n"
         "  expected=${PREFIX%%=*}\n"
         "  compset -P '*='\n"
         "fi\n"
         "case $command in\n" +
         cases +
         "esac\n"
         "case $expected in\n"
         "  '') ;;\n"
         "  " +
         patternOf(app, Value::folder) +
         ") _files -/; return ;;\n"
         "  " +
         patternOf(app, Value::file) +
         ") _files; return ;;\n"
         "  " +
         patternOf(app, Value::item) +
         ") compadd -- root; _files; return ;;\n"
         "  *) return 1 ;;\n"
         "esac\n"
         "if [[ -z $ended && $PREFIX == -* ]]; then\n"
         "  _describe option options\n"
         "elif [[ -z $command ]]; then\n"
         "  _describe command commands\n"
         "else\n"
         "  compadd -- $offered\n"
         "  if [[ -n $paths ]]; then _files; fi\n"
         "fi\n";
}

std::string fishValue(Value value) {
  switch (value) {
    case Value::none:
      return "";
    case Value::text:
      return " -x";
    case Value::folder:
      return " -x -a '(__fish_complete_directories)'";
    case Value::file:
      return " -r -F";
    case Value::item:
      return " -r -F -a root";
  }
  return "";
}

std::string forFish(const CLI::App& app) {
  const auto line = [](const std::string& condition, const CommandOption& option) {
    const bool isLong = option.name.starts_with("--");
    return "complete -c mirabel" + condition + (isLong ? " -l " : " -s ") +
           option.name.substr(isLong ? 2 : 1) + fishValue(option.value) + " -d " +
           shellQuoted(option.help) + "\n";
  };
  std::string text = "# fish completion for mirabel\n";
  for (const CommandOption& option : optionsOf(app))
    text += line("", option);
  for (const Command& command : commandsOf(app)) {
    text += "complete -c mirabel -n __fish_use_subcommand -f -a " + command.name + " -d " +
            shellQuoted(command.help) + "\n";
    const std::string condition =
        " -n " + shellQuoted("__fish_seen_subcommand_from " + command.name);
    if (!command.takesPaths) text += "complete -c mirabel" + condition + " -f\n";
    if (!command.words.empty()) {
      text +=
          "complete -c mirabel" + condition + " -a " + shellQuoted(joined(command.words)) + "\n";
    }
    for (const CommandOption& option : command.options)
      text += line(condition, option);
  }
  return text;
}

}  // namespace

std::string completionFor(const CLI::App& app, const std::string& shell) {
  if (shell == "bash") return forBash(app);
  if (shell == "zsh") return forZsh(app);
  return forFish(app);
}

}  // namespace mirabel
