#include <nlohmann/json.hpp>
#include <ostream>
#include <sstream>

#include "cli/Commands.h"
#include "cli/ItemJSON.h"
#include "cli/OperationRun.h"
#include "cli/ReferenceDate.h"

namespace mirabel {
namespace {

ExitCode print(Program& program, const Result<std::vector<ItemRecord>>& found) {
  if (!found) return program.report(found.error(), "can't search");
  for (const ItemRecord& item : *found)
    printOutcome(program, item);
  return ExitCode::done;
}

// What a shell passes as one argument may be several words.
std::vector<std::string> wordsOf(const std::vector<std::string>& arguments) {
  std::vector<std::string> words;
  for (const std::string& argument : arguments) {
    std::istringstream rest(argument);
    for (std::string word; rest >> word;)
      words.push_back(std::move(word));
  }
  return words;
}

/// False for what is no date.
bool setDate(const std::optional<std::string>& text, std::optional<Date>& date) {
  if (!text) return true;
  date = referenceDateFrom(*text, Date::now());
  return date.has_value();
}

}  // namespace

ExitCode runSearch(Program& program, const SearchOptions& options) {
  SearchQuery query;
  query.words = wordsOf(options.words);
  query.tags = options.tags;
  query.type = options.type;
  query.includesTrashed = options.includesTrashed;
  query.limit = options.limit;
  if (!setDate(options.since, query.modifiedSince) ||
      !setDate(options.before, query.modifiedBefore)) {
    return program.reportUsage(
        "--since and --before take a date like 2026-11-21, or an age like 30d");
  }
  const bool asksForNothing = query.words.empty() && query.tags.empty() && !query.type &&
                              !query.modifiedSince && !query.modifiedBefore;
  if (asksForNothing)
    return program.reportUsage("say what to search for: words, a tag, a type, a date");
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  return print(program, documents->search(query));
}

ExitCode runRecent(Program& program, std::uint32_t limit) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  return print(program, documents->recent(limit));
}

ExitCode runFavorites(Program& program, std::uint32_t limit) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  return print(program, documents->favorites(limit));
}

}  // namespace mirabel
