#include <cerrno>
#include <filesystem>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>
#include <utility>
#include <vector>

#include "linux/FailingLooks.h"
#include "linux/apps/ApplicationsHome.h"
#include "linux/apps/LinuxApplicationRegistry.h"
#include "support/NoDescriptors.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class LinuxApplicationRegistryTest : public RegistryTest {
 protected:
  std::string nameOf(std::string_view identifier) {
    const auto proxy = registry.proxyForBundleIdentifier(identifier);
    return proxy ? proxy->localizedName.value_or("unnamed") : "absent";
  }
};

TEST_F(LinuxApplicationRegistryTest, EntryWithoutKeysIsJudgedByWhatItDoes) {
  const std::string opens = "Exec=x %f\nMimeType=text/plain;\n";
  struct Case {
    std::string lines;
    bool hasDocuments, inPlace, sharing;
  };
  const Case cases[] = {
      {"Name=a\nNoDisplay=true\nHidden=false", true, false, true},
      {opens, true, true, true},
      {opens, false, true, false},
      {opens + "X-Vessel-SupportsDocumentBrowser=false", true, false, false},
      {opens + "X-Vessel-SupportsOpenInPlace=true", true, true, false},
      {"X-Vessel-FileSharingEnabled=true", false, false, true},
      {opens + "X-Vessel-FileSharingEnabled=false", true, false, false},
  };
  int number = 0;
  for (const Case& one : cases) {
    const std::string identifier = "app" + std::to_string(number++);
    home.write(home.user(identifier + ".desktop"), entryText(one.lines));
    if (one.hasDocuments) home.makeDocuments(identifier);
    const BundleProxy proxy = registry.proxyForBundleIdentifier(identifier).value();
    EXPECT_EQ(proxy.supportsOpenInPlace, one.inPlace) << one.lines;
    EXPECT_EQ(proxy.fileSharingEnabled, one.sharing) << one.lines;
    EXPECT_EQ(proxy.dataContainerURL.has_value(), one.hasDocuments) << one.lines;
  }
}

TEST_F(LinuxApplicationRegistryTest, EarlierDirectoryHidesTheLaterOne) {
  for (const char* name : {"a", "b", "c", "d", "sub-e"})
    home.write(home.system(name) + ".desktop", entryText("Name=system"));
  home.write(home.user("a.desktop"), entryText("Name=user"));
  home.write(home.user("b.desktop"), entryText("Hidden=true"));
  home.write(home.user("c.desktop"), "[Desktop Entry]\nType=Link\n");
  home.write(home.user("f.desktop"), "[Desktop Entry]\nName=A\n");
  fs::create_symlink("nowhere", home.user("d.desktop"));
  home.write(home.user("sub/e.desktop"), entryText("Name=user"));
  EXPECT_THAT(users(), ElementsAre("a", "sub-e"));
  EXPECT_THAT(systems(), ElementsAre("d"));
  LinuxApplicationRegistry fresh(home.options());
  for (LinuxApplicationRegistry* each : {&registry, &fresh}) {
    for (const char* identifier : {"a", "sub-e"})
      EXPECT_EQ(each->proxyForBundleIdentifier(identifier)->localizedName, "user");
    EXPECT_EQ(each->proxyForBundleIdentifier("d")->localizedName, "system");
    for (const char* hidden : {"b", "c", "f"})
      EXPECT_FALSE(each->proxyForBundleIdentifier(hidden)) << hidden;
  }
}

TEST_F(LinuxApplicationRegistryTest, ContainerComesAndGoesWithItsDocuments) {
  home.write(home.user("a.desktop"), entryText());
  const auto container = [&] { return registry.proxyForBundleIdentifier("a")->dataContainerURL; };
  EXPECT_FALSE(container());
  fs::create_directory(home.container("a"));
  EXPECT_FALSE(container());
  home.makeDocuments("a");
  EXPECT_EQ(container(), URL::fileURL(home.container("a")));
  fs::remove(home.container("a") + "/Documents");
  EXPECT_FALSE(container());
  EXPECT_EQ(reasonFor(registry, "a"), "");
}

TEST_F(LinuxApplicationRegistryTest, ChangedEntryIsSeenAtOnce) {
  home.install("a", "Name=one");
  EXPECT_EQ(nameOf("a"), "one");
  const auto time = fs::last_write_time(home.user("a.desktop"));
  for (const char* name : {"two", "six", "ten"}) {
    // Of the same size and with the same time of its own, right after it was read.
    home.write(home.user("a.desktop"), entryText("Name=" + std::string(name)));
    fs::last_write_time(home.user("a.desktop"), time);
    EXPECT_EQ(nameOf("a"), name);
    home.write(home.user("new"), entryText("Name=x" + std::string(name)));
    fs::rename(home.user("new"), home.user("a.desktop"));
    EXPECT_THAT(users(), ElementsAre("a"));
    EXPECT_EQ(nameOf("a"), "x" + std::string(name));
  }
  fs::remove(home.user("a.desktop"));
  EXPECT_THAT(users(), IsEmpty());
  EXPECT_EQ(nameOf("a"), "absent");
}

TEST_F(LinuxApplicationRegistryTest, ExportedEntryIsALinkThatIsFollowed) {
  home.write(home.path() + "/app/one/a.desktop", entryText("Name=one"));
  home.write(home.path() + "/app/two/a.desktop", entryText("Name=two"));
  fs::create_directory_symlink("one", home.path() + "/app/active");
  fs::create_symlink("../../../app/active/a.desktop", home.user("a.desktop"));
  EXPECT_EQ(nameOf("a"), "one");
  fs::remove(home.path() + "/app/active");
  fs::create_directory_symlink("two", home.path() + "/app/active");
  EXPECT_EQ(nameOf("a"), "two");
}

TEST_F(LinuxApplicationRegistryTest, NamesAreInThePersonsLanguage) {
  home.install("a", "Name=Notes\nName[de]=Notizen");
  auto options = home.options();
  options.locales = {"de_AT.UTF-8"};
  LinuxApplicationRegistry german(std::move(options));
  EXPECT_EQ(german.proxyForBundleIdentifier("a")->localizedName, "Notizen");
  EXPECT_EQ(nameOf("a"), "Notes");
}

TEST_F(LinuxApplicationRegistryTest, MissingAndClosedDirectoriesAreEmpty) {
  home.install("a");
  home.write(home.system("b.desktop"), entryText());
  auto options = home.options();
  options.directories.system.push_back(home.path() + "/missing/applications");
  options.directories.system.push_back(home.user("a.desktop"));
  LinuxApplicationRegistry other(std::move(options));
  fs::permissions(home.system(), fs::perms::none);
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  const OrdinaryUser user;
  EXPECT_THAT(identifiersOf(other, ApplicationType::user), ElementsAre("a"));
  EXPECT_THAT(identifiersOf(other, ApplicationType::system), IsEmpty());
}

TEST_F(LinuxApplicationRegistryTest, TooManyOpenFilesAreAnErrorAndNotAnEmptyMachine) {
  home.install("a");
  int reported = 0;
  const auto count = [&](const std::optional<BundleProxy>&) { ++reported; };
  for (const auto type : {ApplicationType::user, ApplicationType::system}) {
    const NoDescriptors none;
    const auto done = registry.enumerateApplicationsOfType(type, count);
    ASSERT_FALSE(done);
    EXPECT_TRUE(done.error().isPosix(EMFILE)) << done.error().description();
  }
  EXPECT_EQ(reported, 0);
  EXPECT_THAT(users(), ElementsAre("a"));
}

TEST_F(LinuxApplicationRegistryTest, AReadErrorIsAnErrorAndNoApplicationLess) {
  home.install("a");
  home.makeDocuments("a");
  for (int n = 1;; ++n) {
    // In another registry: nothing of it is known yet.
    LinuxApplicationRegistry fresh(home.options());
    const FailingNthLook failing(n, EIO);
    std::vector<bool> haveDocuments;
    const auto done = fresh.enumerateApplicationsOfType(ApplicationType::user, [&](auto& one) {
      haveDocuments.push_back(one && one->dataContainerURL);
    });
    if (!failing.wasMet()) break;
    EXPECT_TRUE(done ? haveDocuments == std::vector{true} : done.error().isPosix(EIO)) << n;
  }
}

}  // namespace
}  // namespace mirabel::testing
