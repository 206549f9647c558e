#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace mirabel {

/// Text as it is compared: compatible forms made one, accents dropped, case folded, control
/// characters become spaces. What is not UTF-8 is replaced by U+FFFD. Folding twice changes
/// nothing.
[[nodiscard]] std::string foldedText(std::string_view text);

/// The same without spaces at its ends.
[[nodiscard]] std::string trimmedFoldedText(std::string_view text);

/// Folded texts as FTS5 gets them: what is neither letter nor digit becomes a space, one between
/// two words, one before the first and one after the last, so that the ends of words are part of
/// the trigrams. Empty where there is no word.
[[nodiscard]] std::string wordsOf(std::string_view folded);

/// How well a word matches, the best first.
enum class Match { wholeWord, beginningOfWord, insideWord };

/// The best place of a folded word in a folded text; nothing where it is not part of it.
[[nodiscard]] std::optional<Match> bestMatch(std::string_view text, std::string_view word);

/// Names the version of the tables that folding is made from: texts that were folded with another
/// one can't be compared.
[[nodiscard]] std::string foldingVersion();

}  // namespace mirabel
