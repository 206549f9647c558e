#include <algorithm>
#include <cerrno>
#include <chrono>

#include "provider/HostedFixture.h"

namespace mirabel::testing {
namespace {

using namespace std::chrono_literals;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr std::string_view rootContainer = VesselRootContainerItemIdentifier;
constexpr std::string_view workingSet = VesselWorkingSetContainerItemIdentifier;

class ApplicationsTest : public HostedFixture {
 protected:
  /// What has been logged and signalled since it was asked last.
  struct Seen {
    std::vector<std::string> infos;
    std::vector<std::string> signals;
  };
  Seen seen() {
    Seen seen{texts(LogLevel::info), std::exchange(fake.signals.containers, {})};
    log.clear();
    return seen;
  }
  /// The messages of a level, without its word.
  std::vector<std::string> texts(LogLevel level) const {
    std::vector<std::string> texts;
    for (const LogLine& line : log.messages())
      if (line.level == level) texts.push_back(line.text.substr(line.text.find(' ') + 1));
    return texts;
  }
  void notify(std::string_view name) {
    notifications.post(name);
    pass(500ms);
  }
  void pass(std::chrono::milliseconds length) {
    time.pass(length);
    vessel->waitForAppLibraries();
  }
};

TEST_F(ApplicationsTest, AreRefreshedAtTheStart) {
  install("org.example.draw", "Draw");
  log.clear();
  start();
  EXPECT_THAT(libraries.shared().appLibraries(), SizeIs(1));
  EXPECT_THAT(
      log.sectionLabels(),
      ElementsAre("pacer event", "retrieving app libraries from kestrel",
                  "loading bundle proxies from main cache", "saving bundle proxies to main cache",
                  "upgrading content from main cache", "loading bundle proxies from main cache"));
  EXPECT_THAT(texts(LogLevel::debug), Contains("auto-upgrading shared app library manager"));
  const Seen first = seen();
  // The start tells of the working set by itself; both happen at the same time.
  EXPECT_THAT(first.infos,
              ::testing::UnorderedElementsAre(
                  "auto notify changes on VesselWorkingSetContainerItemIdentifier at startup",
                  "notify changes on VesselRootContainerItemIdentifier",
                  "notify changes on VesselWorkingSetContainerItemIdentifier"));
  EXPECT_THAT(first.signals,
              ::testing::UnorderedElementsAre(workingSet, rootContainer, workingSet));
  ASSERT_THAT(events.libraries(), SizeIs(1));
  EXPECT_EQ(events.libraries().front().label, "Draw");
}

TEST_F(ApplicationsTest, ThatComeOrGoAreToldOf) {
  install("org.example.draw", "Draw");
  start();
  seen();
  install("org.example.write", "Write");
  notify(notification::applicationRegistered);
  EXPECT_THAT(seen().signals, ElementsAre(rootContainer, workingSet));
  EXPECT_THAT(events.libraries(), SizeIs(2));
  fake.applications.installed.erase(fake.applications.installed.begin());
  notify(notification::applicationUnregistered);
  EXPECT_THAT(seen().signals, ElementsAre(rootContainer, workingSet));
  EXPECT_THAT(fake.signals.deletedDomains, ElementsAre(ElementsAre("org.example.draw")));

  // What is as it was writes and signals nothing, but for another display name, which is no other
  // list.
  const auto files = fake.caches.files;
  notify(notification::applicationRegistered);
  EXPECT_THAT(seen().signals, IsEmpty());
  EXPECT_EQ(fake.caches.files, files);
  fake.applications.installed.front().localizedName = "Schreiben";
  notify(notification::applicationRegistered);
  EXPECT_THAT(seen().signals, IsEmpty());
  EXPECT_EQ(events.libraries().front().label, "Schreiben") << "the history tells of the folder";
}

TEST_F(ApplicationsTest, AFailureLeavesThemAsTheyAreForAWhile) {
  start();
  seen();
  std::size_t count = 0;
  for (const Op op : {Op::enumerateApplications, Op::cacheReplace}) {
    install("org.example.app" + std::to_string(count));
    fake.faults.fail(op, Error::posix(EIO));
    notify(notification::applicationRegistered);
    EXPECT_THAT(seen().signals, IsEmpty());
    EXPECT_THAT(libraries.shared().appLibraries(), SizeIs(count));
    pass(10s);
    EXPECT_THAT(seen().signals, ElementsAre(rootContainer, workingSet));
    EXPECT_THAT(events.libraries(), SizeIs(++count));
  }
  install("org.example.draw");
  events.failFollowing(Error::posix(EIO));
  notify(notification::applicationRegistered);
  EXPECT_THAT(texts(LogLevel::error),
              Contains(::testing::StartsWith("can't follow the app libraries; ")));
  pass(10s);
  events.failFollowing({});
  EXPECT_THAT(events.libraries(), SizeIs(count));
  pass(10s);
  EXPECT_THAT(events.libraries(), SizeIs(count + 1));
  log.clear();
  pass(1h);
  EXPECT_THAT(log.sectionLabels(), IsEmpty()) << "all is well";
}

TEST_F(ApplicationsTest, ALateNotificationDoesNothing) {
  start();
  EXPECT_EQ(notifications.observers(), 2U);
  vessel.reset();
  EXPECT_EQ(notifications.observers(), 0U);
  log.clear();
  notifications.post(notification::applicationRegistered);
  EXPECT_THAT(log.sectionLabels(), IsEmpty());
}

}  // namespace
}  // namespace mirabel::testing
