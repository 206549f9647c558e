#include <algorithm>
#include <filesystem>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>
#include <sys/stat.h>
#include <utility>
#include <vector>

#include "linux/apps/ApplicationsHome.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class HostileEntriesTest : public RegistryTest {
 protected:
  bool hasContainer(std::string_view identifier) {
    return registry.proxyForBundleIdentifier(identifier)->dataContainerURL.has_value();
  }
};

TEST_F(HostileEntriesTest, NamesThatCanBeNoIdentifierAreRefused) {
  constexpr const char* reason = "its name can't be an identifier";
  const std::string half(200, 'n');
  const std::string names[] = {"",     ".",    "..",    ".hidden",        "a b",
                               "a\nb", "\xff", "d e/f", "\x1b[31m",       "\xC3\xBC",
                               "a\\b", "#a",   "a%2Fb", half + "/" + half};
  fs::create_directories(home.path() + "/.var/Documents");
  fs::create_directories(home.path() + "/.var/app/Documents");
  for (const std::string& name : names)
    home.write(home.user(name) + ".desktop", entryText());
  for (const char* name :
       {".hidden/a.desktop", "a.desktop~", "a.DESKTOP", "desktop", "a.desktop.b"})
    home.write(home.user(name), entryText());
  home.write(home.user("a-b_c+d@e.f.desktop"), entryText());
  EXPECT_THAT(users(), ElementsAre("a-b_c+d@e.f"));
  for (std::string identifier : names) {
    std::ranges::replace(identifier, '/', '-');
    EXPECT_EQ(reasonFor(registry, identifier), reason) << identifier;
    EXPECT_FALSE(registry.proxyForBundleIdentifier(identifier)) << identifier;
  }
  for (const char* place :
       {"/.var/app/../Documents", "/.var/app/./Documents", "/.var/app/Documents"})
    EXPECT_FALSE(registry.proxyAt(URL::fileURL(home.path() + place))) << place;
}

TEST_F(HostileEntriesTest, WhatIsNoDesktopEntryIsReportedAsNothing) {
  home.write(home.user("a.desktop"), "\177ELF\2" + std::string(1000, '\0'));
  home.write(home.user("b.desktop"), std::string(300u << 10, '\n'));
  home.write(home.user("c.desktop"), entryText("Name=" + std::string(1u << 20, 'n')));
  ASSERT_EQ(::mkfifo(home.user("d.desktop").c_str(), 0644), 0);
  fs::create_directory(home.user("e.desktop"));
  fs::create_symlink("/dev/zero", home.user("f.desktop"));
  fs::create_symlink("g.desktop", home.user("g.desktop"));
  EXPECT_THAT(users(), SizeIs(7));
  EXPECT_THAT(users(), Each(""));
  const std::pair<const char*, const char*> cases[] = {
      {"a", "its entry is no desktop entry"}, {"b", "its entry is too large"},
      {"c", "its entry is too large"},        {"d", "its entry is no regular file"},
      {"e", "its entry is no regular file"},  {"f", "its entry is no regular file"},
      {"g", "its entry can't be read"}};
  for (const auto& [identifier, reason] : cases) {
    EXPECT_EQ(reasonFor(registry, identifier), reason) << identifier;
    EXPECT_FALSE(registry.proxyForBundleIdentifier(identifier)) << identifier;
  }
}

TEST_F(HostileEntriesTest, NoLinkLeadsOutOfTheHome) {
  constexpr const char* reason = "its documents are reached through a symbolic link";
  fs::create_directories(home.path() + "/elsewhere/Documents");
  home.install("real");
  for (const char* identifier : {"container", "documents", "absolute", "inside", "file"})
    home.write(home.user(identifier) + ".desktop", entryText());
  fs::create_directory_symlink("../../elsewhere", home.container("container"));
  fs::create_directory(home.container("documents"));
  fs::create_directory_symlink("../../../elsewhere", home.container("documents/Documents"));
  fs::create_directory_symlink(home.path() + "/elsewhere", home.container("absolute"));
  fs::create_directory_symlink("real", home.container("inside"));
  home.write(home.container("file/Documents"), "");
  for (const char* identifier : {"container", "documents", "absolute", "inside"}) {
    EXPECT_FALSE(hasContainer(identifier)) << identifier;
    EXPECT_EQ(reasonFor(registry, identifier), reason) << identifier;
  }
  EXPECT_FALSE(hasContainer("file"));
  EXPECT_EQ(reasonFor(registry, "file"), "its documents are in no folder");
  EXPECT_TRUE(hasContainer("real"));

  fs::rename(home.path() + "/.var", home.path() + "/other");
  fs::create_directory_symlink("other", home.path() + "/.var");
  EXPECT_FALSE(hasContainer("real"));
  EXPECT_EQ(reasonFor(registry, ".var/app"), reason);
}

TEST_F(HostileEntriesTest, ContainersOnAnotherVolumeAreLeftOut) {
  home.install("a");
  auto options = home.options();
  ++options.device;
  LinuxApplicationRegistry other(std::move(options));
  EXPECT_FALSE(other.proxyForBundleIdentifier("a")->dataContainerURL);
  EXPECT_FALSE(other.proxyAt(URL::fileURL(home.container("a") + "/Documents")));
  EXPECT_EQ(reasonFor(other, "a"), "its documents are on another volume");
}

TEST_F(HostileEntriesTest, OneContainerIsOneApplications) {
  home.install("a-b", "Name=flat");
  home.write(home.user("a/b.desktop"), entryText("Name=in a folder"));
  home.write(home.system("a-b.desktop"), entryText("Name=system"));
  EXPECT_THAT(users(), ElementsAre("a-b"));
  EXPECT_THAT(systems(), IsEmpty());
  EXPECT_EQ(registry.proxyForBundleIdentifier("a-b")->localizedName, "flat");
  EXPECT_EQ(reasonFor(registry, "a-b"), "another entry of its directory has the same identifier");
}

TEST_F(HostileEntriesTest, FoldersOfEntriesAreNotFollowedWithoutEnd) {
  home.write(home.user("1/2/3/4/a.desktop"), entryText());
  home.write(home.user("1/2/3/4/5/b.desktop"), entryText());
  fs::create_directory_symlink("..", home.user("1/again"));
  EXPECT_THAT(users(), ElementsAre("1-2-3-4-a"));
}

TEST_F(HostileEntriesTest, NumbersAreBoundedTheSameWayEachTime) {
  for (int i = 3'000; i > 0; --i)
    home.write(home.user("app" + std::to_string(10'000 + i) + ".desktop"), entryText());
  home.write(home.system("system.desktop"), entryText());
  auto options = home.options();
  options.mostApplications = 1'000;
  LinuxApplicationRegistry bounded(std::move(options));
  for (int time = 0; time < 2; ++time) {
    const auto reported = identifiersOf(bounded, ApplicationType::user);
    ASSERT_THAT(reported, SizeIs(1'000));
    EXPECT_EQ(reported.front(), "app10001");
    EXPECT_EQ(reported.back(), "app11000");
    EXPECT_THAT(identifiersOf(bounded, ApplicationType::system), IsEmpty());
  }
  constexpr const char* reason = "there are more applications than are looked at";
  const auto leftOut = bounded.leftOut();
  ASSERT_THAT(leftOut, SizeIs(1'002));
  EXPECT_EQ(leftOut.front(), (LeftOut{"app11001", reason}));
  EXPECT_EQ(leftOut[1'000], (LeftOut{"", "and 1000 more"}));
  EXPECT_EQ(leftOut.back(), (LeftOut{"system", reason}));

  options = home.options();
  options.mostDirectoryEntries = 100;
  LinuxApplicationRegistry shortened(std::move(options));
  EXPECT_THAT(identifiersOf(shortened, ApplicationType::user), SizeIs(100));
  EXPECT_EQ(reasonFor(shortened, home.path() + "/.local/share/applications"),
            "it has more entries than are read");
}

TEST_F(HostileEntriesTest, CommandsAreNeverRun) {
  const std::string witness = home.path() + "/witness";
  const std::string command = "/bin/touch " + witness;
  home.install("a", "Exec=" + command + " %f\nTryExec=" + command +
                        "\nMimeType=text/plain;\nName=$(" + command + ")");
  EXPECT_THAT(users(), ElementsAre("a"));
  EXPECT_EQ(registry.proxyForBundleIdentifier("a")->localizedName, "$(" + command + ")");
  EXPECT_FALSE(fs::exists(witness));
}

}  // namespace
}  // namespace mirabel::testing
