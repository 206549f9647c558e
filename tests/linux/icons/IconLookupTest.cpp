#include "linux/icons/IconFixture.h"
#include "linux/icons/IconLookup.h"

namespace mirabel::testing {
namespace {

class IconLookupTest : public IconFixture {
 protected:
  void writeTheme(const std::string& theme, const std::string& inherits,
                  const std::string& directories) const {
    write(icons + theme + "/index.theme",
          "[Icon Theme]\nInherits=" + inherits + "\n" + directories);
  }
  /// Relative to the home, "" for none.
  std::string find(std::string_view name, const IconSize& size, const std::string& theme) const {
    const IconFolders where = folders();
    const auto found = IconLookup(where, {".png", ".svg"}).find(name, size, theme);
    if (!found) return "";
    EXPECT_TRUE(found->starts_with(home.path() + "/")) << *found;
    return found->substr(home.path().size() + 1);
  }

  const std::string sizes =
      "Directories=16,32,48,24@2,48@2,any\n[16]\nSize=16\nType=Fixed\n"
      "[32]\nSize=32\nThreshold=3\n[48]\nSize=48\nType=Fixed\n"
      "[24@2]\nSize=24\nScale=2\nType=Fixed\n[48@2]\nSize=48\nScale=2\nType=Fixed\n"
      "[any]\nSize=128\nMinSize=64\nMaxSize=512\nType=Scalable\n";
};

TEST_F(IconLookupTest, TheFirstDirectoryThatFitsWinsAndElseTheNearest) {
  writeTheme("mine", "", sizes);
  for (const char* file : {"16/a.png", "48/a.png", "48@2/a.png", "any/a.svg", "16/small.png",
                           "48/both.svg", "48/both.png", "16/b.png", "32/b.png", "48/b.png",
                           "24@2/c.png", "48/c.png", "any/d.svg", "48@2/d.png"})
    write(icons + "mine/" + file, "x");
  const struct {
    const char* name;
    IconSize size;
    const char* file;
  } cases[] = {{"a", {16, 1}, "16/a.png"},       {"a", {48, 1}, "48/a.png"},
               {"a", {48, 2}, "48@2/a.png"},     {"a", {64, 1}, "any/a.svg"},
               {"a", {20, 1}, "16/a.png"},       {"a", {40, 1}, "48/a.png"},
               {"a", {4096, 1}, "any/a.svg"},    {"small", {512, 1}, "16/small.png"},
               {"both", {48, 1}, "48/both.png"}, {"both.svg", {48, 1}, "48/both.png"},
               {"b", {35, 1}, "32/b.png"},       {"b", {43, 1}, "48/b.png"},
               {"b", {42, 1}, "48/b.png"},       {"b", {41, 1}, "32/b.png"},
               {"b", {23, 1}, "32/b.png"},       {"b", {21, 1}, "16/b.png"},
               {"c", {24, 2}, "24@2/c.png"},     {"c", {48, 1}, "48/c.png"},
               {"d", {63, 1}, "any/d.svg"},      {"d", {90, 1}, "any/d.svg"}};
  for (const auto& c : cases)
    EXPECT_EQ(find(c.name, c.size, "mine"), icons + "mine/" + c.file) << c.name << c.size.size;
}

TEST_F(IconLookupTest, ThemesStandInForEachOtherAndTheCommonOneComesLast) {
  writeTheme("mine", "hicolor,parent,mine", sizes);
  writeTheme("parent", "mine,../mine,grandparent", sizes);
  writeTheme("grandparent", "parent", sizes);
  write(icons + "hicolor/48x48/apps/in-all.png", "x");
  write(icons + "grandparent/48/in-all.png", "x");
  write(icons + "grandparent/48/old.png", "x");
  write(icons + "hicolor/64x64/apps/common.png", "x");
  write(data + "pixmaps/common.png", "x");
  write(data + "pixmaps/single.svg", "x");
  EXPECT_EQ(find("in-all", {48, 1}, "mine"), icons + "grandparent/48/in-all.png");
  EXPECT_EQ(find("old", {16, 1}, "mine"), icons + "grandparent/48/old.png");
  EXPECT_EQ(find("common", {48, 1}, "mine"), icons + "hicolor/64x64/apps/common.png");
  EXPECT_EQ(find("single", {48, 1}, "mine"), data + "pixmaps/single.svg");
  EXPECT_EQ(find("common", {48, 1}, "no such theme"), icons + "hicolor/64x64/apps/common.png");
  EXPECT_EQ(find("nowhere", {48, 1}, "mine"), "");
}

TEST_F(IconLookupTest, AThemeThatLiesInSeveralFoldersIsOne) {
  writeTheme("mine", "", sizes);
  write(data + "flatpak/exports/share/icons/mine/48/exported.png", "x");
  write(".icons/mine/48/own.png", "x");
  EXPECT_EQ(find("exported", {48, 1}, "mine"),
            data + "flatpak/exports/share/icons/mine/48/exported.png");
  EXPECT_EQ(find("own", {48, 1}, "mine"), ".icons/mine/48/own.png");
}

TEST_F(IconLookupTest, NamesThatLeadOutAreNone) {
  write("secret.png", "x");
  write(icons + "hicolor/48x48/secret.png", "x");
  for (const char* name : {"", ".", "..", "../secret", "../../../../../secret", "a/b", "/secret"})
    EXPECT_EQ(find(name, {48, 1}, "hicolor"), "") << name;
  EXPECT_EQ(find("secret", {48, 1}, "../.."), "");
  EXPECT_EQ(find(std::string_view("secret\0", 7), {48, 1}, "hicolor"), "");
}

}  // namespace
}  // namespace mirabel::testing
