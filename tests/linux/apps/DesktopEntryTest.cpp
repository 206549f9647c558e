#include <gtest/gtest.h>
#include <string>
#include <utility>
#include <vector>

#include "linux/apps/DesktopEntry.h"

namespace mirabel::testing {
namespace {

std::optional<DesktopEntry> parse(const std::string& text,
                                  const std::vector<std::string>& locales = {"C"}) {
  return DesktopEntry::parse(text, languagesOf(locales));
}

DesktopEntry ofLines(const std::string& lines, const std::vector<std::string>& locales = {"C"}) {
  return parse("[Desktop Entry]\nType=Application\n" + lines + "\n", locales).value();
}

TEST(DesktopEntryTest, OtherBytesAreNoEntry) {
  const std::string nul("[Desktop Entry]\nType=Application\nName=a\0b\n", 43);
  for (const std::string& text :
       {std::string(), std::string("{}"), nul, std::string("[Other]\nType=Application\n"),
        std::string("Type=Application\n[Desktop Entry]\n")})
    EXPECT_FALSE(parse(text)) << text;
}

TEST(DesktopEntryTest, NameIsInTheFirstLanguageThatHasOne) {
  const std::string lines =
      "Name=Notes\nName[de]=Notizen\nName[de_AT]=Merkzettel\nName[sr@latin]=Beleske\nName[fr]=\n";
  const std::pair<std::vector<std::string>, const char*> cases[] = {
      {{"C"}, "Notes"},
      {{"de_DE.UTF-8"}, "Notizen"},
      {{"de_AT"}, "Merkzettel"},
      {{"sr_RS@latin"}, "Beleske"},
      {{"es_ES", "de"}, "Notizen"},
      {{"es_ES", "C", "de"}, "Notes"},
      {{"fr"}, "Notes"},
      {{"../x"}, "Notes"},
  };
  for (const auto& [locales, name] : cases)
    EXPECT_EQ(ofLines(lines, locales).localizedName, name) << locales.front();
  EXPECT_EQ(ofLines("Name[de]=Notizen").localizedName, std::nullopt);
  EXPECT_EQ(ofLines("Name=").localizedName, std::nullopt);
}

TEST(DesktopEntryTest, NameIsBoundedText) {
  EXPECT_EQ(ofLines("Name=a\377b").localizedName, "a\xEF\xBF\xBD\x62");
  std::string umlauts = "a";
  for (int i = 0; i < 50'000; ++i)
    umlauts += "\xC3\xBC";
  EXPECT_EQ(ofLines("Name=" + umlauts).localizedName, umlauts.substr(0, 1023));
  EXPECT_EQ(ofLines("Name=" + std::string(1024, 'n')).localizedName, std::string(1024, 'n'));
}

TEST(DesktopEntryTest, FilesAreOpenedByCommandsThatTakeThem) {
  const std::pair<const char*, bool> cases[] = {
      {"Exec=a %f\nMimeType=text/plain;", true},
      {"Exec=a %F\nMimeType=text/plain", true},
      {"Exec=a --x=%u -\nMimeType=text/a;", true},
      {"Exec=a %U\nMimeType=text/plain;", true},
      {"Exec=a %%f\nMimeType=text/plain;", false},
      {"Exec=a %%%f\nMimeType=text/plain;", true},
      {"Exec=a %i %c\nMimeType=text/a;", false},
      {"Exec=a %\nMimeType=text/plain;", false},
      {"Exec=a %f", false},
      {"Exec=a %f\nMimeType= ;", false},
      {"MimeType=text/plain;", false},
  };
  for (const auto& [lines, opens] : cases)
    EXPECT_EQ(ofLines(lines).opensFiles, opens) << lines;
}

TEST(DesktopEntryTest, KeysAreBooleansOrFalse) {
  const std::pair<const char*, std::optional<bool>> cases[] = {
      {"", std::nullopt},
      {"X-Vessel-FileSharingEnabled=true", true},
      {"X-Vessel-FileSharingEnabled=false", false},
      {"X-Vessel-FileSharingEnabled=perhaps", false},
      {"X-Vessel-FileSharingEnabled=", false},
      {"X-Vessel-FileSharingEnabled[de]=true", std::nullopt},
      {"[Desktop Action a]\nX-Vessel-FileSharingEnabled=true", std::nullopt},
  };
  for (const auto& [lines, expected] : cases) {
    const DesktopEntry entry = ofLines(lines);
    EXPECT_EQ(entry.fileSharingEnabled, expected) << lines;
    EXPECT_EQ(entry.hasKeys(), expected.has_value()) << lines;
    EXPECT_EQ(entry.supportsOpenInPlace, std::nullopt) << lines;
  }
}

}  // namespace
}  // namespace mirabel::testing
