#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>

#include "linux/FilesFixture.h"
#include "linux/files/LinuxPlatform.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;

class OpeningThePlatform : public ::testing::Test {
 protected:
  static std::string detailOf(const Error& error) {
    const auto found = error.userInfo.find(errorkey::detail);
    return found == error.userInfo.end() ? "" : found->second;
  }
  /// Sets variables of the environment until the test ends.
  void setEnvironment(const char* name, const std::string& value) {
    const char* before = std::getenv(name);
    saved_.emplace_back(name,
                        before == nullptr ? std::nullopt : std::optional(std::string(before)));
    ::setenv(name, value.c_str(), 1);
  }
  void TearDown() override {
    for (const auto& [name, value] : saved_) {
      if (value) ::setenv(name, value->c_str(), 1);
      if (!value) ::unsetenv(name);
    }
  }

  TempHome home;

 private:
  std::vector<std::pair<const char*, std::optional<std::string>>> saved_;
};

TEST_F(OpeningThePlatform, FailsWithAWordForWhatIsNoHome) {
  home.makeFolder("inner");
  home.makeFolder("inner/Documents");
  std::ofstream(home.path() + "/file") << "x";
  struct Case {
    std::string home;
    int code;
    std::string detail;
  };
  const Case cases[] = {{home.path() + "/missing", ENOENT, "cannot be reached"},
                        {home.path() + "/file", ENOTDIR, "is not a folder"},
                        {home.at("inner"), EINVAL, "below another folder named \"Documents\""},
                        {"", EINVAL, "cannot be reached"}};
  for (const Case& c : cases) {
    const auto opened = LinuxPlatform::open({.home = c.home});
    ASSERT_EQ(failureOf(opened), c.code) << c.home;
    EXPECT_THAT(detailOf(opened.error()), HasSubstr(c.detail)) << c.home;
  }
  fs::remove_all(home.documents());
  std::ofstream(home.documents()) << "x";
  EXPECT_EQ(failureOf(LinuxPlatform::open({.home = home.path()})), ENOTDIR);
  EXPECT_FALSE(fs::exists(home.path() + "/.local"));
}

TEST_F(OpeningThePlatform, ResolvesSymlinksOnTheWayToTheDocumentsOnce) {
  const TempHome elsewhere;
  elsewhere.writeFile("a.txt", "1");
  fs::remove(home.documents());
  fs::create_directory_symlink(elsewhere.documents(), home.documents());
  fs::create_directory_symlink(home.path(), home.path() + "/alias");
  const auto opened = LinuxPlatform::open({.home = home.path() + "/alias"}).value();
  EXPECT_EQ(opened->platform().manager.documentStorageURL(), elsewhere.url());
  EXPECT_EQ(opened->home(), home.path());
  EXPECT_TRUE(opened->platform().resources.readValues(elsewhere.url("a.txt")));
}

TEST_F(OpeningThePlatform, LeavesAMissingDocumentStorageMissing) {
  fs::remove(home.documents());
  const auto opened = LinuxPlatform::open({.home = home.path()}).value();
  EXPECT_EQ(opened->platform().manager.documentStorageURL(), home.url());
  EXPECT_EQ(failureOf(opened->platform().directories.open(home.url())), ENOENT);
  EXPECT_TRUE(opened->platform().history.historyUUID(home.url()));
  EXPECT_EQ(failureOf(opened->platform().operations.createDirectory(home.url("new"))), ENOENT);
  EXPECT_FALSE(fs::exists(home.documents()));
}

TEST_F(OpeningThePlatform, HonoursTheEnvironmentOnlyWithoutAnExplicitHome) {
  const TempHome other;
  setEnvironment("HOME", home.path());
  setEnvironment("XDG_STATE_HOME", other.path() + "/states");
  EXPECT_EQ(LinuxPlatform::open({}).value()->stateFolder(), other.path() + "/states/mirabel");
  EXPECT_EQ(LinuxPlatform::open({.home = home.path()}).value()->stateFolder(), home.stateFolder());
  setEnvironment("XDG_STATE_HOME", "relative");
  EXPECT_EQ(LinuxPlatform::open({}).value()->stateFolder(), home.stateFolder());

  const auto applicationSupport = [](LinuxPlatform::Options options) {
    const auto opened = LinuxPlatform::open(std::move(options)).value();
    return opened->platform().caches.applicationSupportURL().path();
  };
  setEnvironment("XDG_DATA_HOME", other.path() + "/data");
  EXPECT_EQ(applicationSupport({}), other.path() + "/data");
  EXPECT_EQ(applicationSupport({.home = home.path()}), home.path() + "/.local/share");
  setEnvironment("XDG_DATA_HOME", "relative");
  EXPECT_EQ(applicationSupport({}), home.path() + "/.local/share");
}

}  // namespace
}  // namespace mirabel::testing
