#include "cli/ItemCommandLine.h"

#include <CLI/CLI.hpp>
#include <utility>

#include "cli/TextOptions.h"

namespace mirabel {
namespace {

/// Adds commands whose help ends alike.
class Adder {
 public:
  Adder(CLI::App& app, std::string itemHelp, std::string footer)
      : app_(app), itemHelp_(std::move(itemHelp)), footer_(std::move(footer)) {}

  CLI::App& command(const char* name, const char* description) {
    CLI::App& added = commandWithoutItem(name, description);
    added.footer(itemHelp_ + footer_);
    return added;
  }
  CLI::App& commandWithoutItem(const char* name, const char* description) {
    CLI::App* added = app_.add_subcommand(name, description);
    added->footer(footer_);
    return *added;
  }

  static void item(CLI::App& command, std::string& item) {
    addText(command, "ITEM", item, "An identifier or a path")->required()->type_name("");
  }
  static void items(CLI::App& command, std::vector<std::string>& items) {
    addTexts(command, "ITEM", items, "Identifiers or paths")->required()->type_name("");
  }
  static void parent(CLI::App& command, std::string& parent) {
    addText(command, "--in", parent, "The folder that it goes into")->required()->type_name("ITEM");
  }

 private:
  CLI::App& app_;
  std::string itemHelp_;
  std::string footer_;
};

void addFileCommands(Adder& add, ItemArguments& arguments) {
  CLI::App& create = add.command("mkdir", "Make a folder");
  addText(create, "NAME", arguments.create.name, "Its name")->required()->type_name("");
  Adder::parent(create, arguments.create.parent);

  CLI::App& import = add.command("import", "Copy files or folders from anywhere into a folder");
  addTexts(import, "FILE", arguments.import.files, "Paths of what to copy")
      ->required()
      ->type_name("");
  Adder::parent(import, arguments.import.parent);

  CLI::App& rename = add.command("rename", "Give an item another name");
  Adder::item(rename, arguments.rename.item);
  addText(rename, "NAME", arguments.rename.name, "Its new name")->required()->type_name("");

  CLI::App& move = add.command("mv", "Move an item into another folder");
  Adder::item(move, arguments.move.item);
  addText(move, "PARENT", arguments.move.parent, "The folder that it goes into")
      ->required()
      ->type_name("");
  addText(move, "--name", arguments.move.name, "Its name there (the one that it has)")
      ->type_name("NAME");

  CLI::App& remove = add.command("rm", "Delete items for good, folders with everything in them");
  Adder::items(remove, arguments.remove.items);
  remove.add_flag("--dry-run", arguments.remove.isDryRun, "Say what would be deleted");
}

void addTrashCommands(Adder& add, ItemArguments& arguments) {
  Adder::items(add.command("trash", "Move items to the trash"), arguments.trash);

  CLI::App& restore = add.command("restore", "Put items in the trash back where they came from");
  Adder::items(restore, arguments.restore.items);
  addText(restore, "--to", arguments.restore.parent, "Put them into this folder instead")
      ->type_name("ITEM");

  CLI::App& expire =
      add.commandWithoutItem("expire", "Delete for good what has been in the trash for long");
  addText(expire, "--older-than", arguments.expire.olderThan,
          "A day, a moment in RFC 3339 form, or an age: 30d, 12h, 2w, 45m, 90s")
      ->required()
      ->type_name("DATE|AGE");
  expire.add_flag("--dry-run", arguments.expire.isDryRun, "Say what would be deleted");
}

void addMetadataCommands(Adder& add, ItemArguments& arguments) {
  CLI::App& tag = add.command("tag", "Set the tags of an item, or print them");
  Adder::item(tag, arguments.tag.item);
  auto* labels = addTexts(tag, "LABEL", arguments.tag.labels, "All the tags that it is to have")
                     ->type_name("");
  tag.add_flag("--clear", arguments.tag.clears, "Take all tags away")->excludes(labels);

  CLI::App& favorite = add.command("favorite", "Make an item a favourite");
  Adder::item(favorite, arguments.favorite.item);
  auto* rank =
      addText(favorite, "RANK", arguments.favorite.rank, "Its rank among them (1)")->type_name("");
  favorite.add_flag("--clear", arguments.favorite.clears, "Make it none any more")->excludes(rank);

  CLI::App& used = add.command("used", "Note when an item was used");
  Adder::item(used, arguments.used.item);
  auto* date =
      addText(used, "DATE", arguments.used.date, "A day, or a moment in RFC 3339 form (now)")
          ->type_name("");
  used.add_flag("--clear", arguments.used.clears, "Forget it")->excludes(date);
}

}  // namespace

void addItemCommands(CLI::App& app, ItemArguments& arguments, const std::string& itemHelp,
                     const std::string& footer) {
  Adder add(app, itemHelp, footer);
  addFileCommands(add, arguments);
  addTrashCommands(add, arguments);
  addMetadataCommands(add, arguments);
}

std::optional<ExitCode> runItemCommand(const CLI::App& app, Program& program,
                                       const ItemArguments& arguments) {
  if (app.got_subcommand("mkdir")) return runMakeFolder(program, arguments.create);
  if (app.got_subcommand("import")) return runImport(program, arguments.import);
  if (app.got_subcommand("rename")) return runRename(program, arguments.rename);
  if (app.got_subcommand("mv")) return runMove(program, arguments.move);
  if (app.got_subcommand("rm")) return runRemove(program, arguments.remove);
  if (app.got_subcommand("trash")) return runTrash(program, arguments.trash);
  if (app.got_subcommand("restore")) return runRestore(program, arguments.restore);
  if (app.got_subcommand("expire")) return runExpire(program, arguments.expire);
  if (app.got_subcommand("tag")) return runTag(program, arguments.tag);
  if (app.got_subcommand("favorite")) return runFavorite(program, arguments.favorite);
  if (app.got_subcommand("used")) return runUsed(program, arguments.used);
  return {};
}

}  // namespace mirabel
