// Lines: the name of an item, a tag of it, a tag that is searched for (none where it is empty), and
// words. Folding is stable, the full-text index takes every query, and finds every item that
// matches.

#include <sqlite3.h>
#include <string>

#include "ByteSource.h"
#include "Require.h"
#include "foundation/Unicode.h"
#include "host/search/SearchRow.h"
#include "host/search/SearchText.h"
#include "host/search/SearchWanted.h"

using namespace mirabel;

namespace {

/// The table of words as the search index has it, with one row.
class Words {
 public:
  Words() {
    require(::sqlite3_open(":memory:", &database_) == SQLITE_OK);
    run("CREATE VIRTUAL TABLE words USING fts5(text, content='', columnsize=0, detail=none,"
        " tokenize='trigram case_sensitive 1')");
    insert_ = prepared("INSERT INTO words(rowid, text) VALUES(1, ?)");
    find_ = prepared("SELECT rowid FROM words WHERE words MATCH ?");
  }
  void set(const std::string& text) {
    run("INSERT INTO words(words) VALUES('delete-all')");
    require(step(insert_, text) == SQLITE_DONE);
  }
  /// Ends the process where the index does not understand the expression.
  bool finds(const std::string& expression) {
    const int result = step(find_, expression);
    require(result == SQLITE_ROW || result == SQLITE_DONE);
    return result == SQLITE_ROW;
  }

 private:
  void run(const char* sql) {
    require(::sqlite3_exec(database_, sql, nullptr, nullptr, nullptr) == SQLITE_OK);
  }
  sqlite3_stmt* prepared(const char* sql) {
    sqlite3_stmt* statement = nullptr;
    require(::sqlite3_prepare_v2(database_, sql, -1, &statement, nullptr) == SQLITE_OK);
    return statement;
  }
  static int step(sqlite3_stmt* statement, const std::string& text) {
    ::sqlite3_bind_text(statement, 1, text.data(), static_cast<int>(text.size()), SQLITE_TRANSIENT);
    const int result = ::sqlite3_step(statement);
    ::sqlite3_reset(statement);
    return result;
  }

  sqlite3* database_ = nullptr;
  sqlite3_stmt* insert_ = nullptr;
  sqlite3_stmt* find_ = nullptr;
};

std::string requireFolded(std::string_view text) {
  std::string folded = foldedText(text);
  require(isUTF8(folded));
  require(foldedText(folded) == folded);
  const std::string words = wordsOf(folded);
  require(words.size() <= folded.size() + 2);
  require(words.find("  ") == std::string::npos);
  require(words.empty() || (words.front() == ' ' && words.back() == ' ' && words.size() > 2));
  return folded;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::size_t longest = 1024;
  constexpr std::size_t longestExpression = 1024;
  if (size > longest) return 0;
  static Words index;
  std::string_view rest(reinterpret_cast<const char*>(data), size);
  SearchRow item;
  item.name = requireFolded(takeUpTo(rest, '\n'));
  item.tags = searchTag(takeUpTo(rest, '\n'));
  SearchQuery query;
  if (const std::string_view tag = takeUpTo(rest, '\n'); !tag.empty()) query.tags.emplace_back(tag);
  while (!rest.empty())
    query.words.emplace_back(takeUpTo(rest, '\n'));
  const auto wanted = SearchWanted::from(query);
  if (!wanted) return 0;
  index.set(wordsOf(item.name + item.tags));
  const auto match = wanted->match({item.name, item.tags, item.type, {}, item.domain, false});
  for (const Match worst : {Match::wholeWord, Match::beginningOfWord, Match::insideWord}) {
    const std::string expression = wanted->expression(worst);
    require(expression.size() <= longestExpression);
    if (expression.empty()) continue;
    require(index.finds(expression) || !match || *match > worst);
  }
  return 0;
}
