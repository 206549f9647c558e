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

// Of what a very common word finds, the newest are put in order. It is far more than a person
// looks at, and few enough to be read within a millisecond or two.
constexpr std::size_t fewestCandidates = 1024;

constexpr const char* ofWords =
    "SELECT i.place, i.identifier, i.name, i.tags, i.type, i.modified, i.domain, i.flags"
    " FROM words CROSS JOIN items i ON i.place = words.rowid"
    " WHERE words MATCH ? ORDER BY words.rowid DESC";
constexpr const char* ofAll =
    "SELECT place, identifier, name, tags, type, modified, domain, flags FROM items"
    " ORDER BY place DESC";
constexpr const char* recentItems =
    "SELECT identifier FROM items WHERE flags = 0 AND recency IS NOT NULL"
    " ORDER BY recency DESC, identifier LIMIT ?";
constexpr const char* favoriteItems =
    "SELECT identifier FROM items WHERE favorite IS NOT NULL AND flags & 2 = 0"
    " ORDER BY favorite, name, identifier";
static_assert(searchTrashed == 2);

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

SearchRowView viewOf(const Statement& row) {
  SearchRowView view{row.blob(2), row.blob(3), row.blob(4), {}, row.blob(6), false};
  if (!row.isNull(5)) view.modified = row.integer(5);
  view.isTrashed = (row.integer(7) & searchTrashed) != 0;
  return view;
}

/// Collects what matches a query, from one statement after the other.
class Candidates {
 public:
  Candidates(const SearchWanted& wanted, std::size_t limit) : wanted_(wanted), limit_(limit) {}

  enum class End { reached, notReached };
  /// Rows whose words match at least as well as `worst`, up to the bound.
  Result<End> collect(Statement& statement, Match worst) {
    const StatementScope scope(statement);
    std::size_t found = 0;
    while (true) {
      const auto row = statement.step();
      if (!row) return fail(row.error());
      if (!*row) return End::reached;
      const SearchRowView view = viewOf(statement);
      const auto match = wanted_.match(view);
      if (!match || *match > worst) continue;
      add(statement, view, *match);
      if (++found == bound()) return End::notReached;
    }
  }

  [[nodiscard]] std::size_t bound() const {
    return std::max(fewestCandidates, std::min(limit_, limit_ * 2));
  }
  [[nodiscard]] std::size_t wholeWords() const {
    return static_cast<std::size_t>(
        std::ranges::count(found_, Match::wholeWord, &Candidate::match));
  }
  [[nodiscard]] std::vector<std::string> best() {
    const std::size_t count = std::min(limit_, found_.size());
    std::partial_sort(found_.begin(), found_.begin() + static_cast<std::ptrdiff_t>(count),
                      found_.end());
    std::vector<std::string> identifiers;
    identifiers.reserve(count);
    for (std::size_t i = 0; i < count; ++i)
      identifiers.push_back(std::move(found_[i].identifier));
    return identifiers;
  }

 private:
  void add(const Statement& statement, const SearchRowView& view, Match match) {
    if (!places_.insert(statement.integer(0)).second) return;
    constexpr auto undated = std::numeric_limits<std::int64_t>::min();
    found_.push_back({match, view.modified.value_or(undated), std::string(statement.blob(1))});
  }

  const SearchWanted& wanted_;
  std::size_t limit_;
  std::unordered_set<std::int64_t> places_;
  std::vector<Candidate> found_;
};

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

struct SearchRun::Statements {
  Statement ofWords, ofAll, recents, favorites;
};

SearchRun::SearchRun(std::unique_ptr<Statements> statements) : statements_(std::move(statements)) {}
SearchRun::~SearchRun() = default;

Result<std::unique_ptr<SearchRun>> SearchRun::create(Database& database) {
  auto words = database.prepare(ofWords);
  if (!words) return fail(words.error());
  auto all = database.prepare(ofAll);
  if (!all) return fail(all.error());
  auto recents = database.prepare(recentItems);
  if (!recents) return fail(recents.error());
  auto favorites = database.prepare(favoriteItems);
  if (!favorites) return fail(favorites.error());
  return std::unique_ptr<SearchRun>(new SearchRun(std::unique_ptr<Statements>(new Statements{
      *std::move(words), *std::move(all), *std::move(recents), *std::move(favorites)})));
}

Result<std::vector<std::string>> SearchRun::search(const SearchQuery& query) {
  const auto wanted = SearchWanted::from(query);
  if (!wanted || query.limit == 0) return {};
  Candidates candidates(*wanted, query.limit);
  const auto collect = [&](Match worst) {
    const std::string expression = wanted->expression(worst);
    if (expression.empty() && worst == Match::insideWord) {
      return candidates.collect(statements_->ofAll, worst);
    }
    if (expression.empty()) return Result<Candidates::End>(Candidates::End::reached);
    statements_->ofWords.bindBlob(1, expression);
    return candidates.collect(statements_->ofWords, worst);
  };
  const auto end = collect(Match::insideWord);
  if (!end) return fail(end.error());
  if (*end == Candidates::End::reached) return candidates.best();
  // There are more than were looked at, and better ones may be among them.
  if (auto whole = collect(Match::wholeWord); !whole) return fail(whole.error());
  if (candidates.wholeWords() < query.limit) {
    if (auto begun = collect(Match::beginningOfWord); !begun) return fail(begun.error());
  }
  return candidates.best();
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
