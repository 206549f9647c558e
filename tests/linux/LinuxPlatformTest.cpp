#include <filesystem>

#include "linux/EnvironmentVariable.h"
#include "linux/FailingLooks.h"
#include "linux/FilesFixture.h"
#include "linux/PrivateMount.h"
#include "linux/files/LinuxPlatform.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

class OpeningThePlatform : public ::testing::Test {
 protected:
  TempHome home;
};

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
  const std::string states = other.path() + "/states", data = other.path() + "/data";
  const EnvironmentVariable variable("HOME", home.path().c_str());
  const EnvironmentVariable state("XDG_STATE_HOME", states.c_str());
  const EnvironmentVariable share("XDG_DATA_HOME", data.c_str());
  const auto folders = [](LinuxPlatform::Options options) {
    const auto opened = LinuxPlatform::open(std::move(options)).value();
    return std::pair(opened->stateFolder(),
                     opened->platform().caches.applicationSupportURL().path());
  };
  const std::pair own(home.stateFolder(), home.path() + "/.local/share");
  EXPECT_EQ(folders({}), std::pair(states + "/mirabel", data));
  EXPECT_EQ(folders({.home = home.path()}), own);
  for (const EnvironmentVariable* each : {&state, &share})
    each->set("relative");
  EXPECT_EQ(folders({}), own);
}

TEST_F(OpeningThePlatform, FailsWhereALookFailsAndOpensNoOtherVolume) {
  for (const bool isMounted : {false, true}) {
    std::optional<PrivateMount> mounted;
    if (isMounted) mounted.emplace(home.documents());
    if (isMounted && !mounted->isThere()) GTEST_SKIP() << "may not mount";
    home.writeFile("a.txt", "1");
    const auto history = [this](const LinuxPlatform& opened) {
      return opened.platform().history.historyUUID(home.url()).value();
    };
    const UUID expected = history(*LinuxPlatform::open({.home = home.path()}).value());
    for (int n = 1;; ++n) {
      const FailingNthLook failing(n, EIO);
      const auto opened = LinuxPlatform::open({.home = home.path()});
      if (!failing.wasMet()) break;
      EXPECT_TRUE(opened || failureOf(opened) != ENOENT) << n;
      if (!opened) continue;
      EXPECT_EQ(history(**opened), expected) << n;
      EXPECT_NE(failureOf((*opened)->platform().objects.open(home.url("a.txt"))), ENOENT) << n;
    }
  }
}

}  // namespace
}  // namespace mirabel::testing
