#include <cerrno>
#include <gmock/gmock.h>

#include "linux/icons/IconFixture.h"
#include "linux/icons/IconTheme.h"

namespace mirabel::testing {
namespace {

using Type = IconThemeDirectory::Type;
using ::testing::ElementsAre;

IconThemeDirectory directory(Type type, int size, int scale = 1, int minSize = 0, int maxSize = 0,
                             int threshold = 2) {
  return {"d",      type, size, scale, minSize == 0 ? size : minSize, maxSize == 0 ? size : maxSize,
          threshold};
}

TEST(IconThemeDirectoryTest, EachTypeHasItsOwnReach) {
  const struct {
    IconThemeDirectory directory;
    IconSize wanted;
    bool matches;
    int distance;
  } cases[] = {
      {directory(Type::fixed, 48), {48, 1}, true, 0},
      {directory(Type::fixed, 48), {47, 1}, false, 1},
      {directory(Type::fixed, 48), {64, 1}, false, 16},
      {directory(Type::fixed, 24, 2), {24, 2}, true, 0},
      {directory(Type::fixed, 48), {24, 2}, false, 0},  // the pixels fit, the drawing does not
      {directory(Type::fixed, 24, 2), {24, 1}, false, 24},
      {directory(Type::scalable, 64, 1, 16, 256), {16, 1}, true, 0},
      {directory(Type::scalable, 64, 1, 16, 256), {256, 1}, true, 0},
      {directory(Type::scalable, 64, 1, 16, 256), {15, 1}, false, 1},
      {directory(Type::scalable, 64, 1, 16, 256), {128, 3}, false, 128},
      {directory(Type::threshold, 32), {30, 1}, true, 0},
      {directory(Type::threshold, 32), {34, 1}, true, 0},
      {directory(Type::threshold, 32), {29, 1}, false, 1},
      {directory(Type::threshold, 32), {36, 1}, false, 2},
      {directory(Type::threshold, 32, 1, 0, 0, 0), {33, 1}, false, 1},
      {directory(Type::threshold, 4096, 16, 0, 0, 4096), {1, 1}, false, 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::to_string(c.directory.size) + " for " + std::to_string(c.wanted.size));
    EXPECT_EQ(c.directory.matches(c.wanted), c.matches);
    EXPECT_EQ(c.directory.distance(c.wanted), c.distance);
  }
}

class IconThemeTest : public IconFixture {
 protected:
  std::vector<std::string> directoriesOf(const std::string& index) const {
    write("index.theme", index);
    std::vector<std::string> paths;
    const auto theme = IconTheme::read(at("index.theme"));
    if (!theme) return {theme.error().description()};
    for (const auto& each : theme->directories)
      paths.push_back(each.path);
    return paths;
  }
};

TEST_F(IconThemeTest, DirectoriesThatCannotBeOnesAreLeftOut) {
  EXPECT_THAT(directoriesOf("[Icon Theme]\nDirectories=a, b/apps ,,c,d,e,../f,/g,h/../../i,j,k,l\n"
                            "ScaledDirectories=m\n"
                            "[a]\nSize=48\n[b/apps]\nSize=16\n[c]\n[d]\nSize=0\n[e]\nSize=x\n"
                            "[../f]\nSize=48\n[/g]\nSize=48\n[h/../../i]\nSize=48\n"
                            "[j]\nSize=99999999999\n[k]\nSize=48\nScale=0\n"
                            "[l]\nSize=48\nType=Threshold\nThreshold=-3\n[m]\nSize=24\nScale=2\n"),
              ElementsAre("a", "b/apps", "m"));
  EXPECT_THAT(directoriesOf("[Icon Theme]\nName=x\n"), ElementsAre());
  EXPECT_THAT(directoriesOf("\x01\x02 no key file"),
              ElementsAre(::testing::HasSubstr("no file of keys")));
  EXPECT_TRUE(IconTheme::read(at("missing")).error().isPosix(ENOENT));
}

}  // namespace
}  // namespace mirabel::testing
