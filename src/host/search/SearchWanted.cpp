#include "host/search/SearchWanted.h"

#include <algorithm>
#include <glib.h>

#include "host/search/SearchRow.h"

namespace mirabel {
namespace {

constexpr std::size_t mostWords = 100;
// What a query may cost: each trigram is a list that is read. The text decides anyway.
constexpr std::size_t mostTrigramsOfWord = 4;
constexpr std::size_t mostTrigrams = 24;

/// Folded, without what is around it, and without those that are there already. Nothing where no
/// row can hold all of them.
std::optional<std::vector<std::string>> distinct(const std::vector<std::string>& texts) {
  std::vector<std::string> folded;
  for (const std::string& text : texts) {
    if (text.size() > longestSearchText) return {};
    std::string word = trimmedFoldedText(text);
    if (word.empty() || std::ranges::find(folded, word) != folded.end()) continue;
    if (folded.size() == mostWords) return {};
    folded.push_back(std::move(word));
  }
  return folded;
}

/// The beginnings of its characters, and its end.
std::vector<std::size_t> boundaries(std::string_view text) {
  std::vector<std::size_t> found;
  for (std::size_t i = 0; i < text.size(); ++i)
    if ((static_cast<unsigned char>(text[i]) & 0xC0) != 0x80) found.push_back(i);
  found.push_back(text.size());
  return found;
}

/// Adds trigrams that are spread over the text, its first and its last among them.
void addTrigrams(std::string& expression, std::size_t& count, std::string_view text) {
  const auto starts = boundaries(text);
  if (starts.size() < 4) return;
  const std::size_t all = starts.size() - 3;
  const std::size_t taken = std::min((all + 4) / 3, mostTrigramsOfWord);
  for (std::size_t i = 0; i < taken && count < mostTrigrams; ++i, ++count) {
    const std::size_t at = taken == 1 ? 0 : i * (all - 1) / (taken - 1);
    if (!expression.empty()) expression += " AND ";
    expression += '"';
    expression += text.substr(starts[at], starts[at + 3] - starts[at]);  // letters and spaces
    expression += '"';
  }
}

/// The words of a text as they stand among those of another that it is part of.
std::string_view inside(std::string_view words, std::string_view text, Match worst) {
  if (words.empty()) return words;
  // The first byte may be that of another character. That takes a space away, and finds more.
  const bool beginsWithWord = text.starts_with(words.substr(1, 1));
  const bool endsWithWord = text.ends_with(words.substr(words.size() - 2, 1));
  if (worst == Match::insideWord && beginsWithWord) words.remove_prefix(1);
  if (worst != Match::wholeWord && endsWithWord) words.remove_suffix(1);
  return words;
}

}  // namespace

std::optional<SearchWanted> SearchWanted::from(const SearchQuery& query) {
  SearchWanted wanted;
  auto words = distinct(query.words);
  auto tags = distinct(query.tags);
  if (!words || !tags) return {};
  const bool isBounded = query.type || query.modifiedSince || query.modifiedBefore || query.domain;
  if (words->empty() && tags->empty() && !isBounded) return {};
  wanted.words_ = std::move(*words);
  for (const std::string& label : *tags)
    wanted.tags_.push_back(searchTag(label));
  wanted.type_ = query.type;
  if (wanted.type_ && wanted.type_->ends_with("/*")) wanted.type_->pop_back();
  if (query.modifiedSince) wanted.since_ = searchTime(*query.modifiedSince);
  if (query.modifiedBefore) wanted.before_ = searchTime(*query.modifiedBefore);
  wanted.domain_ = query.domain;
  wanted.includesTrashed_ = query.includesTrashed;
  return wanted;
}

std::optional<Match> SearchWanted::match(const SearchRowView& row) const {
  if (!passes(row)) return {};
  Match worst = Match::wholeWord;
  for (const std::string& word : words_) {
    const auto inName = bestMatch(row.name, word);
    const auto inTags = inName == Match::wholeWord ? inName : bestMatch(row.tags, word);
    if (!inName && !inTags) return {};
    const Match best =
        std::min(inName.value_or(Match::insideWord), inTags.value_or(Match::insideWord));
    worst = std::max(worst, best);
  }
  return worst;
}

bool SearchWanted::passes(const SearchRowView& row) const {
  if (row.isTrashed && !includesTrashed_) return false;
  if (domain_ && row.domain != *domain_) return false;
  if (type_ && (type_->ends_with('/') ? !row.type.starts_with(*type_) : row.type != *type_)) {
    return false;
  }
  if ((since_ || before_) && !row.modified) return false;
  if (since_ && *row.modified < *since_) return false;
  if (before_ && *row.modified >= *before_) return false;
  return std::ranges::all_of(
      tags_, [&](const std::string& tag) { return row.tags.find(tag) != std::string_view::npos; });
}

std::string SearchWanted::expression(Match worst) const {
  std::string expression;
  std::size_t count = 0;
  for (const std::string& word : words_)
    addTrigrams(expression, count, inside(wordsOf(word), word, worst));
  for (const std::string& tag : tags_)
    addTrigrams(expression, count, wordsOf(tag));
  return expression;
}

}  // namespace mirabel
