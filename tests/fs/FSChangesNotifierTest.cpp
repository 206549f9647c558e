#include <cerrno>

#include "fs/FSChangesNotifier.h"
#include "support/FakeEventStreams.h"
#include "support/ItemsFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::AllOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::StartsWith;

const std::string root(VesselRootContainerItemIdentifier);
const std::string workingSet(VesselWorkingSetContainerItemIdentifier);

class FSChangesNotifierTest : public ItemsFixture {
 protected:
  FSChangesNotifierTest() {
    fileID = fake.volume.writeFile(fake.path("file")).fileID;
    events.append(fake.path("before"), fileID);
  }
  ~FSChangesNotifierTest() override { stop(); }

  void start(const std::string& container, FSChangesNotifier::Options options = {}) {
    stop();
    notifier = FSChangesNotifier::create(context, events, fake.diagnostics, container, {fake.url()},
                                         options);
    onQueue([&] {
      notifier->reader()->setDelegate(notifier);
      notifier->reader()->start();
    });
    events.settle();
    EXPECT_THAT(signals(), IsEmpty());  // the history that it starts with
    log.clear();
  }
  void stop() {
    if (notifier) onQueue([&] { notifier->reader()->stop(); });
    notifier.reset();
  }
  void onQueue(const std::function<void()>& block) {
    SerialQueue queue = notifier->reader()->streamQueue();
    queue.sync(block);
  }
  std::vector<std::string> signals() { return std::exchange(fake.signals.containers, {}); }
  std::vector<std::string> signalsAfter(std::string_view path, std::uint32_t flags = 0) {
    std::optional<std::string> place;
    if (!path.empty()) place = path;
    events.append({0, flags, place, {}, {}});
    events.deliver();
    return signals();
  }

  FakeEventStreams events;
  std::shared_ptr<FSChangesNotifier> notifier;
  std::uint64_t fileID = 0;
};

TEST_F(FSChangesNotifierTest, EachBatchWithChangesIsOneSignal) {
  start("fid=5");
  const auto both = ElementsAre(root, workingSet);
  for (int i = 0; i < 100; ++i)
    events.append(fake.path("file"), fileID);
  EXPECT_THAT(signalsAfter(fake.path("file")), both);
  EXPECT_THAT(signalsAfter(fake.path("file")), both);
  EXPECT_THAT(signalsAfter("", eventflag::kernelDropped), both);
  events.append(fake.path("gone"), 4711);
  EXPECT_THAT(signalsAfter("", eventflag::historyDone), both);

  EXPECT_THAT(signalsAfter("", eventflag::historyDone), IsEmpty());
  EXPECT_THAT(signalsAfter(fake.path(".hidden")), IsEmpty());
  EXPECT_THAT(signalsAfter("/elsewhere"), IsEmpty());
  start(workingSet);
  EXPECT_THAT(signalsAfter(fake.path("file")), ElementsAre(workingSet));
}

TEST_F(FSChangesNotifierTest, SignalsAreBracketedAndTellHowFarTheyGo) {
  start("fid=5");
  static_cast<void>(signalsAfter(fake.path("file")));
  EXPECT_THAT(log.sectionLabels(), ElementsAre(AllOf(StartsWith("<FSChangesNotifier:0x"),
                                                     HasSubstr(" notifies changes on [\"" + root +
                                                               "\", \"" + workingSet + "\"]"))));
  EXPECT_EQ(log.messages().back().text, "[DEBUG] notified changes up to FSEventID 2");
  EXPECT_THAT(log.lines().back().text, StartsWith("[DEBUG] ┗"));
}

TEST_F(FSChangesNotifierTest, RefusedSignalIsLoggedAndTheOthersAreGiven) {
  start("fid=5");
  const Error refusal = Error::posix(ECONNREFUSED);
  fake.signals.refusals[root] = refusal;
  EXPECT_THAT(signalsAfter(fake.path("file")), ElementsAre(root, workingSet));
  EXPECT_THAT(log.messages(),
              Contains(LogLine{LogLevel::error, "[ERROR] can't signal changes for \"" + root +
                                                    "\"; " + refusal.description()}));
  EXPECT_THAT(fake.diagnostics.reports, IsEmpty());
}

TEST_F(FSChangesNotifierTest, HostThatDoesNotAnswerIsReportedAndNotWaitedForEver) {
  start("fid=5", {.patience = std::chrono::milliseconds(0)});
  fake.signals.answers = false;
  EXPECT_THAT(signalsAfter(fake.path("file")), ElementsAre(root, workingSet));
  EXPECT_THAT(fake.diagnostics.reports,
              ElementsAre("notifying changes up to FSEventID 2 timed out"));
  EXPECT_THAT(signalsAfter(fake.path("file")), ElementsAre(root, workingSet));
  // Answers that come late do no harm.
  for (const auto& handler : fake.signals.waiting)
    handler(std::nullopt);
}

}  // namespace
}  // namespace mirabel::testing
