#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "linux/EnvironmentVariable.h"
#include "linux/apps/ApplicationDirectories.h"
#include "linux/apps/ContainerFolders.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

ApplicationDirectories with(const char* dataHome, const char* dataDirectories,
                            ApplicationDirectories::Reach reach) {
  const EnvironmentVariable home("XDG_DATA_HOME", dataHome);
  const EnvironmentVariable directories("XDG_DATA_DIRS", dataDirectories);
  return ApplicationDirectories::of("/h", reach);
}

TEST(ApplicationDirectoriesTest, NothingOutsideOfAGivenHomeCounts) {
  const auto found = with("/data", "/one:/two", ApplicationDirectories::Reach::homeAlone);
  EXPECT_THAT(found.user, ElementsAre("/h/.local/share/applications",
                                      "/h/.local/share/flatpak/exports/share/applications"));
  EXPECT_THAT(found.system, IsEmpty());
}

TEST(ApplicationDirectoriesTest, VariablesHaveStandInsAndEachDirectoryCountsOnce) {
  constexpr auto whole = ApplicationDirectories::Reach::wholeMachine;
  for (const char* none : {static_cast<const char*>(nullptr), ""}) {
    const auto found = with(none, none, whole);
    EXPECT_THAT(found.user, ElementsAre("/h/.local/share/applications",
                                        "/h/.local/share/flatpak/exports/share/applications"));
    EXPECT_THAT(found.system,
                ElementsAre("/usr/local/share/applications", "/usr/share/applications",
                            "/var/lib/flatpak/exports/share/applications"));
  }
  const auto found =
      with("/data", "/data/flatpak/exports/share:/one/::two:/var/lib/flatpak/exports/share/:/one",
           whole);
  EXPECT_THAT(found.user,
              ElementsAre("/data/applications", "/data/flatpak/exports/share/applications"));
  EXPECT_THAT(found.system,
              ElementsAre("/one/applications", "/var/lib/flatpak/exports/share/applications"));
  EXPECT_EQ(with("data", "/one", whole).user.front(), "/h/.local/share/applications");
}

TEST(ContainerFoldersTest, PathsAreComparedInCanonicalForm) {
  for (const char* home : {"/h", "/var/h", "/", "/private/var/h"}) {
    const ContainerFolders containers(home, 0);
    const URL documents = containers.containerOf("org.a").appendingPathComponent("Documents");
    EXPECT_EQ(containers.identifierAt(documents), "org.a") << home;
    EXPECT_EQ(containers.identifierAt(documents.properURL()), "org.a") << home;
    EXPECT_EQ(containers.identifierAt(containers.containerOf("").appendingPathComponent("x")), "");
    EXPECT_EQ(containers.identifierAt(containers.containerOf("Documents")), "") << home;
  }
}

}  // namespace
}  // namespace mirabel::testing
