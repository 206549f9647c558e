#include <gtest/gtest.h>
#include <string>

#include "foundation/Unicode.h"
#include "host/search/SearchText.h"

namespace mirabel {
namespace {

using namespace std::string_view_literals;

TEST(SearchText, FoldsCaseAccentsAndForms) {
  const struct {
    std::string_view text;
    std::string_view folded;
  } cases[] = {
      {"Cafe\u0301", "cafe"},  // the accent as a character of its own
      {"STRASSE straße", "strasse strasse"},
      {"Ångström İzmir", "angstrom izmir"},
      {"ﬁnal Ｆｕｌｌ №5", "final full no5"},
      {"ΟΔΟΣ Οδός", "οδοσ οδοσ"},
      {"Ёлка й", "елка и"},
      {"سَلام", "سلام"},
      {"が か\u3099", "か\u3099 か\u3099"},  // another letter, however it is written
      {"soft\u00ADhyphen zero\u200Bwidth", "softhyphen zerowidth"},
      {"tab\there\nNUL\0end"sv, "tab here nul end"},
      {"\xFF bytes \xC3", "\uFFFD bytes \uFFFD"},
      {"", ""},
  };
  for (const auto& each : cases)
    EXPECT_EQ(foldedText(each.text), each.folded) << each.text;
  EXPECT_EQ(trimmedFoldedText("  A b\n"), "a b");
  EXPECT_EQ(trimmedFoldedText(" \t"), "");
}

// What is stored has been folded, and what is asked is folded once more at other places.
TEST(SearchText, FoldingTwiceChangesNothingOfAnyCharacter) {
  for (char32_t c = 1; c < 0x30000; ++c) {
    if (c >= 0xD800 && c < 0xE000) continue;
    std::u16string units;
    if (c >= 0x10000) units += static_cast<char16_t>(0xD7C0 + (c >> 10));
    units += static_cast<char16_t>(c < 0x10000 ? c : 0xDC00 | (c & 0x3FF));
    const std::string once = foldedText("a" + utf8FromUTF16(units).value() + "b");
    EXPECT_TRUE(isUTF8(once));
    EXPECT_EQ(foldedText(once), once) << std::hex << static_cast<std::uint32_t>(c);
  }
}

TEST(SearchText, WordsStandBetweenSingleSpaces) {
  EXPECT_EQ(wordsOf("annual_report--2024.pdf"), " annual report 2024 pdf ");
  EXPECT_EQ(wordsOf("  «λ»…か\u3099 🎉x"), " λ か\u3099 x ");
  EXPECT_EQ(wordsOf("name\ntag one\ntwo\n"), " name tag one two ");
  EXPECT_EQ(wordsOf("-\" * 🎉"), "");
}

TEST(SearchText, TheBestPlaceOfAWordCounts) {
  using enum Match;
  const struct {
    std::string_view text;
    std::string_view word;
    std::optional<Match> match;
  } cases[] = {
      {"annual report.pdf", "report", wholeWord},
      {"annual reports", "report", beginningOfWord},
      {"report", "port", insideWord},
      {"report portal", "port", beginningOfWord},
      {"report-2024", "report-2024", wholeWord},
      {"report 2024", "report-2024", std::nullopt},
      {"größe λόγος", "λόγος", wholeWord},
      {"größe", "öße", insideWord},
      {"か\u3099く", "か", beginningOfWord},
      {"a🎉b", "🎉", insideWord},
      {"", "a", std::nullopt},
  };
  for (const auto& each : cases)
    EXPECT_EQ(bestMatch(each.text, each.word), each.match) << each.text << ", " << each.word;
}

}  // namespace
}  // namespace mirabel
