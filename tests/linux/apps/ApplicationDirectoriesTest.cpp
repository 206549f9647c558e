#include <cstdlib>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

#include "linux/apps/ApplicationDirectories.h"
#include "linux/apps/ContainerFolders.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

/// Sets a variable, or takes it away, as long as it lives.
class Variable {
 public:
  Variable(const char* name, const char* value) : name_(name) {
    if (const char* before = std::getenv(name)) before_ = before;
    set(value);
  }
  ~Variable() { set(before_ ? before_->c_str() : nullptr); }
  Variable(const Variable&) = delete;
  Variable& operator=(const Variable&) = delete;

 private:
  void set(const char* value) {
    if (value == nullptr) {
      ::unsetenv(name_);
    } else {
      ::setenv(name_, value, 1);
    }
  }
  const char* name_;
  std::optional<std::string> before_;
};

ApplicationDirectories with(const char* dataHome, const char* dataDirectories,
                            ApplicationDirectories::Reach reach) {
  const Variable home("XDG_DATA_HOME", dataHome);
  const Variable directories("XDG_DATA_DIRS", dataDirectories);
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
