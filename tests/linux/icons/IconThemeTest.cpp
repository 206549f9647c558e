#include <cerrno>
#include <gmock/gmock.h>

#include "linux/icons/IconFixture.h"
#include "linux/icons/IconTheme.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;

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
