#include "host/search/SearchRun.h"

#include <algorithm>
#include <limits>
#include <tuple>
#include <unordered_set>
#include <utility>

#include "host/search/SearchSchema.h"
#include "host/search/SearchWanted.h"

namespace mirabel {
namespace {

// How many rows that match are compared, the newest of them, in one pass. Reading a row takes about
// a microsecond.
constexpr std::size_t fewestCandidates = 1024;

#define MIRABEL_ROW "SELECT place, identifier, name, tags, type, modified, domain, flags FROM items"
constexpr const char* oneRow = MIRABEL_ROW " WHERE place = ?";
constexpr const char* allRows = MIRABEL_ROW;
#undef MIRABEL_ROW
constexpr const char* placesOfWords = "SELECT rowid FROM words WHERE words MATCH ?";
constexpr const char* recentItems =
    "SELECT identifier FROM items WHERE flags = 0 AND recency IS NOT NULL"
    " ORDER BY recency DESC, identifier LIMIT ?";
constexpr const char* favoriteItems =
    "SELECT identifier FROM items WHERE favorite IS NOT NULL AND flags & 2 = 0"
    " ORDER BY favorite, name, identifier";
static_assert(searchTrashed == 2);

SearchRowView viewOf(const Statement& row) {
  SearchRowView view{row.blob(2), row.blob(3), row.blob(4), {}, row.blob(6), false};
  if (!row.isNull(5)) view.modified = row.integer(5);
  view.isTrashed = (row.integer(7) & searchTrashed) != 0;
  return view;
}

Result<std::vector<std::string>> identifiersOf(Statement& statement) {
  const StatementScope scope(statement);
  std::vector<std::string> identifiers;
  while (true) {
    const auto row = statement.step();
    if (!row) return fail(row.error());
    if (!*row) return identifiers;
    identifiers.emplace_back(statement.blob(0));
  }
}

}  // namespace

/// The best of the rows that it was shown.
class SearchRun::Candidates {
 public:
  Candidates(const SearchWanted& wanted, std::size_t limit) : wanted_(wanted), limit_(limit) {}

  [[nodiscard]] const SearchWanted& wanted() const { return wanted_; }
  /// So many that those of one class that are wanted can't be pushed out by those of a better one.
  [[nodiscard]] std::size_t bound() const {
    return std::max(fewestCandidates, limit_ < largest / 2 ? limit_ * 2 : limit_);
  }
  /// Whether the row matches at least as well as `worst`.
  bool consider(const Statement& row, Match worst) {
    const SearchRowView view = viewOf(row);
    const auto match = wanted_.match(view);
    if (!match || *match > worst) return false;
    if (!places_.insert(row.integer(0)).second) return true;
    found_.push_back(
        {*match, view.modified.value_or(SearchTimes::undated), std::string(row.blob(1))});
    if (found_.size() / 2 >= bound()) keepBest(bound());
    return true;
  }
  [[nodiscard]] bool hasEnough(Match worst) const {
    const auto isGood = [worst](const Candidate& candidate) { return candidate.match <= worst; };
    return static_cast<std::size_t>(std::ranges::count_if(found_, isGood)) >= limit_;
  }
  [[nodiscard]] std::vector<std::string> best() {
    keepBest(limit_);
    std::sort(found_.begin(), found_.end());
    std::vector<std::string> identifiers;
    identifiers.reserve(found_.size());
    for (Candidate& candidate : found_)
      identifiers.push_back(std::move(candidate.identifier));
    return identifiers;
  }

 private:
  struct Candidate {
    Match match = Match::wholeWord;
    std::int64_t modified = 0;
    std::string identifier;
    /// The best first; of those the newest, and else by identifier, so that the order is one.
    friend bool operator<(const Candidate& a, const Candidate& b) {
      return std::tie(a.match, b.modified, a.identifier) <
             std::tie(b.match, a.modified, b.identifier);
    }
  };

  static constexpr std::size_t largest = std::numeric_limits<std::size_t>::max();

  void keepBest(std::size_t count) {
    if (found_.size() <= count) return;
    const auto end = found_.begin() + static_cast<std::ptrdiff_t>(count);
    std::nth_element(found_.begin(), end, found_.end());
    found_.erase(end, found_.end());
  }

  const SearchWanted& wanted_;
  std::size_t limit_;
  std::unordered_set<std::int64_t> places_;
  std::vector<Candidate> found_;
};

struct SearchRun::Statements {
  Statement oneRow, allRows, placesOfWords, recents, favorites;
};

SearchRun::SearchRun(SearchStore& store, std::unique_ptr<Statements> statements)
    : store_(store), statements_(std::move(statements)) {}
SearchRun::~SearchRun() = default;

Result<std::unique_ptr<SearchRun>> SearchRun::create(SearchStore& store) {
  std::optional<Error> error;
  const auto make = [&](const char* sql) {
    auto statement = store.database().prepare(sql);
    if (statement) return *std::move(statement);
    error = statement.error();
    return Statement(nullptr);
  };
  std::unique_ptr<Statements> statements(new Statements{
      make(oneRow), make(allRows), make(placesOfWords), make(recentItems), make(favoriteItems)});
  if (error) return fail(*error);
  return std::unique_ptr<SearchRun>(new SearchRun(store, std::move(statements)));
}

// Rows are collected from what is sure to have all that match, until there are no more; or else the
// newest of all, of whole words, and of beginnings of words, which are listed as well. Whatever the
// passes leave out is older than enough of its class.
Result<std::vector<std::string>> SearchRun::search(const SearchQuery& query) {
  const auto wanted = SearchWanted::from(query);
  if (!wanted || query.limit == 0) return {};
  Candidates candidates(*wanted, query.limit);
  const bool isListed = !wanted->expression(Match::insideWord).empty();
  if (isListed) {
    const auto isComplete = collect(candidates, Match::insideWord);
    if (!isComplete) return fail(isComplete.error());
    if (*isComplete) return candidates.best();
  }
  for (const Match worst : {Match::wholeWord, Match::beginningOfWord}) {
    if (auto collected = collect(candidates, worst); !collected) return fail(collected.error());
    if (candidates.hasEnough(worst)) return candidates.best();
  }
  if (!isListed) {
    if (auto collected = collectFromAll(candidates); !collected) return fail(collected.error());
  }
  return candidates.best();
}

/// The newest that match at least as well as `worst`, as far as trigrams lead to them.
Result<bool> SearchRun::collect(Candidates& candidates, Match worst) {
  const std::string expression = candidates.wanted().expression(worst);
  if (expression.empty()) return true;
  auto places = placesOf(expression);
  if (!places) return fail(places.error());
  const auto times = store_.times();
  if (!times) return fail(times.error());
  const auto isOlder = [&](std::int64_t a, std::int64_t b) {
    return (*times)->at(a) < (*times)->at(b);
  };
  std::ranges::make_heap(*places, isOlder);
  Statement& row = statements_->oneRow;
  for (std::size_t found = 0; !places->empty(); places->pop_back()) {
    if (found == candidates.bound()) return false;
    std::ranges::pop_heap(*places, isOlder);
    const StatementScope scope(row);
    const auto isThere = row.bind(1, places->back()).step();
    if (!isThere) return fail(isThere.error());
    if (*isThere && candidates.consider(row, worst)) ++found;
  }
  return true;
}

Result<std::vector<std::int64_t>> SearchRun::placesOf(const std::string& expression) {
  Statement& statement = statements_->placesOfWords;
  const StatementScope scope(statement);
  statement.bindBlob(1, expression);
  std::vector<std::int64_t> places;
  while (true) {
    const auto row = statement.step();
    if (!row) return fail(row.error());
    if (!*row) return places;
    places.push_back(statement.integer(0));
  }
}

Result<void> SearchRun::collectFromAll(Candidates& candidates) {
  Statement& rows = statements_->allRows;
  const StatementScope scope(rows);
  while (true) {
    const auto row = rows.step();
    if (!row) return fail(row.error());
    if (!*row) return {};
    candidates.consider(rows, Match::insideWord);
  }
}

Result<std::vector<std::string>> SearchRun::recent(std::size_t limit) {
  constexpr std::size_t most = std::numeric_limits<std::int32_t>::max();
  statements_->recents.bind(1, static_cast<std::int64_t>(std::min(limit, most)));
  return identifiersOf(statements_->recents);
}

Result<std::vector<std::string>> SearchRun::favorites() {
  return identifiersOf(statements_->favorites);
}

}  // namespace mirabel
