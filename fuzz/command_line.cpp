// Arguments, each up to a NUL: they are refused in one line that a terminal can show, or every text
// that a command gets is one of them, letter for letter, and they say the same when they are put
// down in another form.

#include <CLI/CLI.hpp>
#include <algorithm>
#include <set>
#include <sstream>

#include "ByteSource.h"
#include "Require.h"
#include "cli/ArgumentParser.h"
#include "foundation/Unicode.h"

using namespace mirabel;

namespace {

using Texts = std::vector<std::string>;

/// Everything that was said, as a list: texts and numbers that a command looks at.
class Said {
 public:
  explicit Said(const Arguments& all) {
    add(all.global.home);
    for (const std::string* text : {&all.path, &all.item, &all.list.item, &all.changes.item,
                                    &all.changes.since, &all.watch.item, &all.container,
                                    &all.bundle, &all.icon.item, &all.icon.file, &all.host.shell})
      add(*text);
    add(all.list.page);
    add(all.watch.since);
    add(all.items);
    const SearchOptions& search = all.host.search;
    add(search.words);
    add(search.tags);
    for (const auto* text : {&search.type, &search.since, &search.before})
      add(*text);
    for (const bool flag :
         {all.global.json, all.global.embedded, all.global.verbose, search.includesTrashed,
          all.items.remove.isDryRun, all.items.expire.isDryRun, all.items.tag.clears,
          all.items.favorite.clears, all.items.used.clears})
      numbers.push_back(flag ? 1 : 0);
    for (const std::uint32_t limit : {search.limit, all.host.mostRecent, all.host.mostFavorites})
      numbers.push_back(limit);
    numbers.push_back(all.global.timeout.count());
    numbers.push_back(all.icon.size);
    numbers.push_back(static_cast<std::int64_t>(all.list.pages.value_or(0)));
  }

  Texts texts;
  std::vector<std::int64_t> numbers;

  friend bool operator==(const Said&, const Said&) = default;

 private:
  void add(const std::string& text) { texts.push_back(text); }
  void add(const std::optional<std::string>& text) {
    if (text) add(*text);
  }
  void add(const Texts& list) { texts.insert(texts.end(), list.begin(), list.end()); }
  void add(const ItemArguments& items) {
    for (const std::string* text :
         {&items.create.name, &items.create.parent, &items.import.parent, &items.rename.item,
          &items.rename.name, &items.move.item, &items.move.parent, &items.expire.olderThan,
          &items.tag.item, &items.favorite.item, &items.used.item})
      add(*text);
    for (const Texts* list : {&items.import.files, &items.remove.items, &items.trash,
                              &items.restore.items, &items.tag.labels})
      add(*list);
    for (const auto* text :
         {&items.move.name, &items.restore.parent, &items.favorite.rank, &items.used.date})
      add(*text);
  }
};

/// What was told instead of running anything.
void requireTold(int code, const std::string& out, const std::string& err, bool isJSON) {
  require(code == 0 || code == 2);
  require(code != 0 || (!out.empty() && err.empty()));
  if (code == 0 || err.starts_with("Gives every file")) return;
  require(out.empty() && !err.empty() && err.find('\n') == err.size() - 1 && isUTF8(err));
  for (const char c : err)
    require(static_cast<unsigned char>(c) >= 0x20 || c == '\n');
  require(err.starts_with(isJSON ? "{\"error\":" : "mirabel: "));
}

bool isFlag(const CLI::Option& option) {
  return option.get_items_expected_max() == 0;
}

/// Each text is one of the arguments, or the end of one that begins with an option.
void requireGiven(const Texts& texts, const Texts& arguments) {
  static const Said defaults{Arguments()};
  std::multiset<std::string> expected(defaults.texts.begin(), defaults.texts.end());
  for (const std::string& text : texts) {
    const bool isArgument = std::ranges::any_of(arguments, [&](const std::string& argument) {
      return argument == text || (argument.starts_with('-') && argument.ends_with(text));
    });
    require(isArgument || expected.contains(text));
  }
}

/// The options of one app in their long form, and what stands without them.
void rewrite(const CLI::App& app, Texts& options, Texts& positionals) {
  for (const CLI::Option* option : app.get_options()) {
    if (option->count() == 0) continue;
    const std::string name = "--" + (option->get_lnames().empty() ? "" : option->get_lnames()[0]);
    if (isFlag(*option)) {
      if (option->as<bool>()) options.push_back(name);
      continue;
    }
    for (std::string value : option->results()) {
      std::erase(value, '\0');
      if (option->get_positional()) {
        positionals.push_back(value);
      } else if (value.empty()) {
        options.insert(options.end(), {name, value});
      } else {
        options.push_back(name + "=" + value);
      }
    }
  }
}

Texts inAnotherForm(const CLI::App& app) {
  Texts all;
  Texts positionals;
  rewrite(app, all, positionals);
  const CLI::App& command = *app.get_subcommands().front();
  all.push_back(command.get_name());
  rewrite(command, all, positionals);
  all.emplace_back("--");
  all.insert(all.end(), positionals.begin(), positionals.end());
  return all;
}

void requireInBounds(const Arguments& parsed) {
  constexpr std::uint32_t most = 10'000;
  for (const std::uint32_t limit :
       {parsed.host.search.limit, parsed.host.mostRecent, parsed.host.mostFavorites})
    require(limit >= 1 && limit <= most);
  require(parsed.list.pages.value_or(1) >= 1);
  const auto timeout = parsed.global.timeout.count();
  require(timeout >= 0 && timeout <= 86'400'000);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static ArgumentParser parser;
  static ArgumentParser other;
  constexpr std::size_t longest = 512;
  if (size > longest) return 0;
  std::string_view rest(reinterpret_cast<const char*>(data), size);
  Texts arguments;
  while (!rest.empty())
    arguments.emplace_back(takeUpTo(rest, '\0'));

  std::ostringstream out;
  std::ostringstream err;
  if (const auto code = parser.parse(arguments, {out, err})) {
    const auto end = std::ranges::find(arguments, "--");
    requireTold(*code, out.str(), err.str(), std::find(arguments.begin(), end, "--json") != end);
    return 0;
  }
  require(out.str().empty() && err.str().empty());
  requireInBounds(parser.arguments());
  const Said said(parser.arguments());
  requireGiven(said.texts, arguments);
  require(!other.parse(inAnotherForm(parser.app()), {out, err}));
  require(Said(other.arguments()) == said);
  return 0;
}
