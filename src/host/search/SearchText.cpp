#include "host/search/SearchText.h"

#include <algorithm>
#include <glib.h>
#include <memory>

namespace mirabel {
namespace {

struct Free {
  void operator()(char* text) const { g_free(text); }
};
using Text = std::unique_ptr<char, Free>;

// Points and strokes that are put on letters, not those that make another letter of one, as the
// voicing mark of kana and the signs of Indic scripts do: these have lower classes.
constexpr int lowestClassOfAccents = 10;

bool isControl(char c) {
  const auto byte = static_cast<unsigned char>(c);
  return byte < 0x20 || byte == 0x7F;
}

bool isASCII(char c) {
  return static_cast<unsigned char>(c) < 0x80;
}

bool isWordCharacter(gunichar c) {
  return g_unichar_isalnum(c) || g_unichar_ismark(c);
}

void append(std::string& text, gunichar c) {
  char bytes[6];
  text.append(bytes, static_cast<std::size_t>(g_unichar_to_utf8(c, bytes)));
}

/// The folded form of UTF-8 without control characters.
std::string foldedUTF8(const std::string& text) {
  const auto size = static_cast<gssize>(text.size());
  const Text decomposed(g_utf8_normalize(text.data(), size, G_NORMALIZE_ALL));
  std::string bare;
  for (const char* at = decomposed.get(); *at != '\0'; at = g_utf8_next_char(at)) {
    const gunichar c = g_utf8_get_char(at);
    const bool isAccent = g_unichar_combining_class(c) >= lowestClassOfAccents;
    if (!isAccent && g_unichar_type(c) != G_UNICODE_FORMAT) append(bare, c);
  }
  const Text folded(g_utf8_casefold(bare.data(), static_cast<gssize>(bare.size())));
  // Small Cherokee letters have been made capitals.
  std::string lower;
  for (const char* at = folded.get(); *at != '\0'; at = g_utf8_next_char(at))
    append(lower, g_unichar_tolower(g_utf8_get_char(at)));
  return lower;
}

gunichar characterBefore(std::string_view text, std::size_t at) {
  return g_utf8_get_char(g_utf8_prev_char(text.data() + at));
}

}  // namespace

std::string foldedText(std::string_view text) {
  std::string plain(text);
  std::ranges::replace_if(plain, isControl, ' ');
  if (std::ranges::all_of(plain, isASCII)) {
    std::ranges::transform(plain, plain.begin(), g_ascii_tolower);
    return plain;
  }
  const Text valid(g_utf8_make_valid(plain.data(), static_cast<gssize>(plain.size())));
  return foldedUTF8(valid.get());
}

std::string trimmedFoldedText(std::string_view text) {
  std::string folded = foldedText(text);
  folded.erase(0, folded.find_first_not_of(' '));
  folded.erase(folded.find_last_not_of(' ') + 1);
  return folded;
}

std::string wordsOf(std::string_view folded) {
  std::string words;
  words.reserve(folded.size() + 2);
  bool isBetween = true;
  const char* const end = folded.data() + folded.size();
  for (const char* at = folded.data(); at < end;) {
    const char* const next = g_utf8_next_char(at);
    const bool isPart = isWordCharacter(g_utf8_get_char(at));
    if (isPart && isBetween) words += ' ';
    if (isPart) words.append(at, next);
    isBetween = !isPart;
    at = next;
  }
  if (!words.empty()) words += ' ';
  return words;
}

std::optional<Match> bestMatch(std::string_view text, std::string_view word) {
  std::optional<Match> best;
  for (auto at = text.find(word); at != std::string_view::npos; at = text.find(word, at + 1)) {
    const auto end = at + word.size();
    if (at > 0 && isWordCharacter(characterBefore(text, at))) {
      if (!best) best = Match::insideWord;
      continue;
    }
    if (end == text.size() || !isWordCharacter(g_utf8_get_char(text.data() + end))) {
      return Match::wholeWord;
    }
    best = Match::beginningOfWord;
  }
  return best;
}

std::string foldingVersion() {
  return "glib " + std::to_string(glib_major_version) + "." + std::to_string(glib_minor_version) +
         "." + std::to_string(glib_micro_version);
}

}  // namespace mirabel
