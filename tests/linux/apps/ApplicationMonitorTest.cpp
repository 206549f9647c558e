#include <chrono>
#include <condition_variable>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <mutex>
#include <set>
#include <string>
#include <unistd.h>
#include <utility>

#include "linux/apps/ApplicationMonitor.h"
#include "linux/apps/ApplicationsHome.h"
#include "support/NoDescriptors.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using std::chrono::milliseconds;

constexpr std::string_view registered = notification::applicationRegistered;
constexpr std::string_view unregistered = notification::applicationUnregistered;

class ApplicationMonitorTest : public ::testing::Test {
 protected:
  ApplicationMonitorTest() {
    for (const std::string_view name : {registered, unregistered}) {
      center.addObserver(this, name, [this](std::string_view heard) {
        const std::lock_guard lock(mutex);
        names.emplace(heard);
        changed.notify_all();
      });
    }
  }
  ~ApplicationMonitorTest() override {
    monitor.reset();
    center.removeEveryObserver(this);
  }

  ApplicationPlaces places() const {
    return {{home.path() + "/.local/share/applications", home.path() + "/system/applications"},
            home.path() + "/.var/app"};
  }
  void start(ApplicationWatches::Bounds bounds = {}) {
    monitor = std::make_unique<ApplicationMonitor>(
        ApplicationMonitor::Options{places(), bounds, milliseconds(10)}, center);
  }
  /// Whether the name was posted since this was last asked, or is soon. What was posted besides is
  /// forgotten.
  bool hears(std::string_view name) { return heardUntil(name).contains(name); }
  std::set<std::string, std::less<>> heardUntil(std::string_view name) {
    std::unique_lock lock(mutex);
    changed.wait_for(lock, std::chrono::seconds(20), [&] { return names.contains(name); });
    return std::exchange(names, {});
  }
  /// Makes a change that is posted after all before it, so that those are known to be over.
  void passOn() {
    fs::create_directories(home.container("last/Documents"));
    ASSERT_TRUE(hears(registered));
    fs::remove_all(home.container("last"));
    ASSERT_TRUE(hears(unregistered));
  }

  ApplicationsHome home;
  LocalNotificationCenter center;
  std::mutex mutex;
  std::condition_variable changed;
  std::set<std::string, std::less<>> names;
  std::unique_ptr<ApplicationMonitor> monitor;
};

TEST_F(ApplicationMonitorTest, EntriesComeChangeAndGo) {
  start();
  EXPECT_TRUE(monitor->isComplete());
  for (const std::string& entry :
       {home.user("a.desktop"), home.system("b.desktop"), home.user("folder/deep/c.desktop")}) {
    home.write(entry, entryText());
    EXPECT_TRUE(hears(registered)) << entry;
    passOn();
    home.write(entry, entryText("Name=written in place"));
    EXPECT_TRUE(hears(registered)) << entry;
    home.write(home.path() + "/saved", entryText("Name=saved"));
    fs::rename(home.path() + "/saved", entry);
    EXPECT_TRUE(hears(registered)) << entry;
    fs::remove(entry);
    EXPECT_TRUE(hears(unregistered)) << entry;
  }
  fs::create_symlink("nowhere", home.user("link.desktop"));
  EXPECT_TRUE(hears(registered));
  fs::rename(home.user("link.desktop"), home.path() + "/link.desktop");
  EXPECT_TRUE(hears(unregistered));
}

TEST_F(ApplicationMonitorTest, DocumentFoldersComeAndGo) {
  home.makeDocuments("old");
  start();
  fs::remove(home.container("old/Documents"));
  EXPECT_TRUE(hears(unregistered));
  for (const char* identifier : {"old", "new"}) {
    fs::create_directories(home.container(identifier));
    fs::create_directory(home.container(identifier) + "/Documents");
    EXPECT_TRUE(hears(registered)) << identifier;
    passOn();
    // It may be closed, and opened again.
    for (const fs::perms permissions : {fs::perms::none, fs::perms::owner_all}) {
      fs::permissions(home.container(identifier) + "/Documents", permissions);
      EXPECT_TRUE(hears(registered)) << identifier;
      passOn();
    }
    fs::remove(home.container(identifier) + "/Documents");
    EXPECT_TRUE(hears(unregistered)) << identifier;
  }
  fs::rename(home.container("old"), home.container("moved"));
  EXPECT_TRUE(hears(registered));
  passOn();
  fs::create_directory(home.container("moved/Documents"));
  EXPECT_TRUE(hears(registered));
}

TEST_F(ApplicationMonitorTest, WhatIsNoneOfItIsNotPosted) {
  home.makeDocuments("a");
  start();
  home.write(home.user("mimeinfo.cache"), "");
  home.write(home.container("a/Documents/letter"), "");
  home.write(home.container("a/cache/file"), "");
  home.write(home.path() + "/file", "");
  fs::rename(home.container("a"), home.path() + "/away");
  using Names = std::set<std::string, std::less<>>;
  EXPECT_EQ(heardUntil(unregistered), Names{std::string(unregistered)});
  passOn();
  fs::rename(home.path() + "/away/Documents", home.path() + "/away/other");
  home.write(home.user("last.desktop"), entryText());
  EXPECT_EQ(heardUntil(registered), Names{std::string(registered)});
}

TEST_F(ApplicationMonitorTest, WithoutDescriptorsItTellsLaterAndEnds) {
  if (NoDescriptors::areNeeded) GTEST_SKIP() << "the sanitizer takes descriptors itself";
  {
    const NoDescriptors none;
    start();
  }
  home.write(home.user("a.desktop"), entryText());
  EXPECT_TRUE(hears(registered));
}

TEST_F(ApplicationMonitorTest, FoldersThatAreNotThereYetAreWaitedFor) {
  for (const char* folder : {"/.var", "/.local", "/system"})
    fs::remove_all(home.path() + folder);
  start();
  home.write(home.user("a.desktop"), entryText());
  EXPECT_TRUE(hears(registered));
  home.makeDocuments("a");
  EXPECT_TRUE(hears(registered));
  passOn();
  fs::remove(home.container("a/Documents"));
  EXPECT_TRUE(hears(unregistered));
  const std::string share = home.path() + "/.local/share", aside = home.path() + "/share";
  fs::rename(share, aside);
  EXPECT_TRUE(hears(unregistered));
  fs::rename(aside, share);
  EXPECT_TRUE(hears(registered));
  passOn();
  fs::remove(home.user("a.desktop"));
  EXPECT_TRUE(hears(unregistered));
}

TEST_F(ApplicationMonitorTest, TimesOfFoldersStandInForWatchesThatRanOut) {
  home.makeDocuments("a");
  const ApplicationWatches::Bounds cases[] = {{.watches = 0}, {.containers = 0}};
  for (const ApplicationWatches::Bounds& bounds : cases) {
    start(bounds);
    EXPECT_FALSE(monitor->isComplete());
    home.write(home.user("a.desktop"), entryText());
    EXPECT_TRUE(hears(registered));
    fs::remove(home.user("a.desktop"));
    EXPECT_TRUE(hears(unregistered));
    monitor.reset();
  }
  // Of containers, no more are looked at than may be watched.
  start({.watches = 1});
  fs::remove(home.container("a/Documents"));
  EXPECT_TRUE(hears(unregistered));
  home.makeDocuments("a");
  EXPECT_TRUE(hears(registered));
}

TEST_F(ApplicationMonitorTest, LostRecordsCountAsBoth) {
  std::size_t queued = 0;
  std::ifstream("/proc/sys/fs/inotify/max_queued_events") >> queued;
  if (queued == 0 || queued > 100'000) GTEST_SKIP() << "the kernel keeps too many";
  for (const char* name : {"a.desktop", "b.desktop"})
    home.write(home.user(name), "");
  ApplicationWatches watches(places(), {});
  watches.arm();
  // In turn: what repeats the record before it is not queued.
  for (std::size_t i = 0; i <= queued; ++i) {
    const std::string name = home.user(i % 2 == 0 ? "a.desktop" : "b.desktop");
    ::close(::open(name.c_str(), O_WRONLY | O_CLOEXEC));
  }
  const auto changes = watches.drain();
  EXPECT_TRUE(changes.registered);
  EXPECT_TRUE(changes.unregistered);
  EXPECT_TRUE(watches.isComplete());
  fs::remove(home.user("a.desktop"));
  EXPECT_TRUE(watches.drain().unregistered);
  const auto nothing = watches.drain();
  EXPECT_FALSE(nothing.registered || nothing.unregistered);
}

}  // namespace
}  // namespace mirabel::testing
