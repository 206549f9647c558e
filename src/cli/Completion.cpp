#include "cli/Completion.h"

#include <CLI/CLI.hpp>
#include <string_view>
#include <vector>

namespace mirabel {
namespace {

struct CommandOption {
  std::string name;  ///< with its dashes
  std::string help;
  bool takesValue;
};

struct Command {
  std::string name;
  std::string help;
  std::vector<CommandOption> options;
  std::vector<std::string> words;  ///< that its arguments may be, beside paths
};

std::vector<CommandOption> optionsOf(const CLI::App& app) {
  std::vector<CommandOption> options;
  for (const CLI::Option* option : app.get_options()) {
    for (const std::string& name : option->get_lnames())
      options.push_back({"--" + name, option->get_description(), option->get_items_expected() > 0});
    for (const std::string& name : option->get_snames())
      options.push_back({"-" + name, option->get_description(), option->get_items_expected() > 0});
  }
  return options;
}

std::vector<std::string> wordsOf(const CLI::App& command) {
  const std::string& name = command.get_name();
  if (name == "completion") return {"bash", "zsh", "fish"};
  if (name == "ls" || name == "anchor" || name == "changes" || name == "watch") {
    return {"root", "workingset", "alldirs"};
  }
  for (const CLI::Option* option : command.get_options())
    if (option->get_positional() && option->get_name() == "ITEM") return {"root"};
  return {};
}

std::vector<Command> commandsOf(const CLI::App& app) {
  std::vector<Command> commands;
  for (const CLI::App* command : app.get_subcommands([](const CLI::App*) { return true; })) {
    commands.push_back(
        {command->get_name(), command->get_description(), optionsOf(*command), wordsOf(*command)});
  }
  return commands;
}

std::string joined(const std::vector<std::string>& words) {
  std::string text;
  for (const std::string& word : words)
    text += (text.empty() ? "" : " ") + word;
  return text;
}

std::string names(const std::vector<CommandOption>& options) {
  std::vector<std::string> all;
  all.reserve(options.size());
  for (const CommandOption& option : options)
    all.push_back(option.name);
  return joined(all);
}

/// In single quotes, for any of the shells.
std::string shellQuoted(std::string_view text) {
  std::string result = "'";
  for (const char character : text)
    result += character == '\'' ? std::string("'\\''") : std::string(1, character);
  return result + "'";
}

std::string forBash(const CLI::App& app) {
  std::string commands;
  std::string cases;
  for (const Command& command : commandsOf(app)) {
    commands += (commands.empty() ? "" : " ") + command.name;
    cases += "    " + command.name + ") options=" + shellQuoted(names(command.options)) +
             " words=" + shellQuoted(joined(command.words)) + " ;;\n";
  }
  return "# bash completion for mirabel\n"
         "_mirabel() {\n"
         "  local current=${COMP_WORDS[COMP_CWORD]} command= word options= words=\n"
         "  local -r commands=" +
         shellQuoted(commands) + " global=" + shellQuoted(names(optionsOf(app))) +
         "\n"
         "  for word in \"${COMP_WORDS[@]:1:COMP_CWORD-1}\"; do\n"
         "    if [[ \" $commands \" == *\" $word \"* ]]; then command=$word; break; fi\n"
         "  done\n"
         "  case $command in\n"
         "    '') words=$commands ;;\n" +
         cases +
         "  esac\n"
         "  if [[ $current == -* ]]; then\n"
         "    mapfile -t COMPREPLY < <(compgen -W \"$options $global\" -- \"$current\")\n"
         "    return\n"
         "  fi\n"
         "  mapfile -t COMPREPLY < <(compgen -W \"$words\" -- \"$current\")\n"
         "  if [[ -n $command ]]; then\n"
         "    compopt -o filenames\n"
         "    mapfile -t -O \"${#COMPREPLY[@]}\" COMPREPLY < <(compgen -f -- \"$current\")\n"
         "  fi\n"
         "}\n"
         "complete -F _mirabel mirabel\n";
}

std::string zshOption(const CommandOption& option) {
  return shellQuoted(option.name + ":" + option.help);
}

std::string forZsh(const CLI::App& app) {
  std::string commands;
  std::string cases;
  for (const Command& command : commandsOf(app)) {
    commands += "    " + shellQuoted(command.name + ":" + command.help) + "\n";
    cases += "    " + command.name + ")\n      options+=(";
    for (const CommandOption& option : command.options)
      cases += zshOption(option) + " ";
    cases += ")\n      words=(" + joined(command.words) + ") ;;\n";
  }
  std::string global;
  for (const CommandOption& option : optionsOf(app))
    global += zshOption(option) + " ";
  return "#compdef mirabel\n"
         "local -a commands options words\n"
         "local command= word\n"
         "commands=(\n" +
         commands +
         ")\n"
         "options=(" +
         global +
         ")\n"
         "for word in \"${(@)words[2,CURRENT-1]}\" \"${(@)${(z)LBUFFER}[2,-1]}\"; do\n"
         "  if [[ -n ${commands[(r)$word:*]} ]]; then command=$word; break; fi\n"
         "done\n"
         "words=()\n"
         "case $command in\n" +
         cases +
         "esac\n"
         "if [[ $PREFIX == -* ]]; then\n"
         "  _describe option options\n"
         "elif [[ -z $command ]]; then\n"
         "  _describe command commands\n"
         "else\n"
         "  compadd -- $words\n"
         "  _files\n"
         "fi\n";
}

std::string forFish(const CLI::App& app) {
  const auto line = [](const std::string& condition, const CommandOption& option) {
    const bool isLong = option.name.starts_with("--");
    return "complete -c mirabel" + condition + (isLong ? " -l " : " -s ") +
           option.name.substr(isLong ? 2 : 1) + (option.takesValue ? " -r" : "") + " -d " +
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
