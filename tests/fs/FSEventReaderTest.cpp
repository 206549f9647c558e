#include <algorithm>
#include <cerrno>

#include "fs/FSEventReader.h"
#include "support/FakeEventStreams.h"
#include "support/ItemsFixture.h"
#include "support/ReaderLog.h"

namespace mirabel::testing {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr auto pathBased = FSEventReaderMode::pathBased;
constexpr auto docIDBased = FSEventReaderMode::docIDBased;

class FSEventReaderTest : public ItemsFixture {
 protected:
  FSEventReaderTest() {
    fake.install("org.example.draw", "/apps/draw", "Draw");
    folderID = fake.volume.makeFolder(fake.path("folder")).fileID;
    fileID = fake.volume.writeFile(fake.path("folder/file")).fileID;
    folder = "fid=" + std::to_string(folderID);
  }
  ~FSEventReaderTest() override { stop(); }

  void start(FSEventReaderMode mode, std::uint64_t since = 0) {
    stop();
    delegate = std::make_shared<ReaderLog>();
    reader =
        FSEventReader::create(context, events, {fake.url(), URL::fileURL("/apps/draw/Documents")},
                              since, mode, Verbosity::verbose);
    reader->setDelegate(delegate);
    onQueue([&] { reader->start(); });
    events.settle();
    EXPECT_THAT(delegate->take(), ElementsAre("history done", "batch"));
    log.clear();
  }
  void stop() {
    if (reader) onQueue([&] { reader->stop(); });
    reader.reset();
  }
  void onQueue(const std::function<void()>& block) {
    SerialQueue queue = reader->streamQueue();
    queue.sync(block);
  }
  /// What is told of everything that was appended; one batch at most.
  std::vector<std::string> told() {
    log.clear();
    events.deliver();
    return delegate->take();
  }
  std::string urlText(std::string_view relative) { return fake.url(relative).description(); }
  static LogLine debug(const std::string& text) { return {LogLevel::debug, "[DEBUG] " + text}; }
  static LogLine error(const std::string& text) { return {LogLevel::error, "[ERROR] " + text}; }

  FakeEventStreams events;
  std::shared_ptr<ReaderLog> delegate;
  std::shared_ptr<FSEventReader> reader;
  std::uint64_t folderID = 0, fileID = 0;
  std::string folder;
};

TEST_F(FSEventReaderTest, DiskDecidesWhatAnEventMeans) {
  start(pathBased);
  const std::string file = fake.path("folder/file");
  const std::string gone = fake.path("gone");
  fake.volume.rename(fake.path("folder/file"), fake.path("moved"));
  fake.volume.makeFolder(fake.path(".hidden"));
  fake.volume.writeFile(file);  // another object takes the name
  events.append(fake.path("folder"), folderID);
  events.append(file, fileID);
  events.append(file);
  events.append(gone, 4711);
  events.append(gone);
  events.append(fake.path(".hidden/x"), folderID);
  events.append("/apps/draw/Documents", 1);
  EXPECT_THAT(told(),
              ElementsAre("update " + folder + " at " + fake.path("folder"),
                          "update did=1 at " + file + " now " + fake.path("moved"),
                          "update did=2 at " + file, "delete fid=4711 at " + gone,
                          "drop noObject at " + gone, "drop hidden at " + fake.path(".hidden/x"),
                          "update #org.example.draw at /apps/draw/Documents", "batch"));
  const auto lines = log.messages();
  for (const LogLine& line :
       {debug("fsevent: received 7 events"), debug("did delete fid=4711"),
        debug("dropping fsevent at \"" + gone + "\"; No object at path"),
        debug("dropping fsevent at " + urlText(".hidden/x") + "; URL is hidden"),
        debug("did change <LocalItem itemIdentifier: did=1, parentItemIdentifier: "
              "VesselRootContainerItemIdentifier, filename: moved>")}) {
    EXPECT_THAT(lines, Contains(line));
  }
  EXPECT_EQ(reader->lastProcessedFSEventID(), 7U);
}

TEST_F(FSEventReaderTest, NothingIsToldAfterTheDelegateHasHeardEnough) {
  class EnoughAtFirst final : public ReaderLog {
   public:
    void didUpdateItem(FSEventReader& reader, const std::shared_ptr<LocalItem>& item,
                       const URL& url) override {
      ReaderLog::didUpdateItem(reader, item, url);
      reader.endTelling();
    }
  };
  start(pathBased);
  delegate = std::make_shared<EnoughAtFirst>();
  onQueue([&] { reader->setDelegate(delegate); });
  const std::string path = fake.path("folder");
  events.append(path, folderID);
  events.append(path);
  EXPECT_THAT(told(), ElementsAre("update " + folder + " at " + path, "batch"));
  EXPECT_EQ(reader->lastProcessedFSEventID(), 1U);
  events.append(path);
  EXPECT_THAT(told(), IsEmpty());
}

TEST_F(FSEventReaderTest, ABatchIsLookedAtInOneGo) {
  start(pathBased);
  for (int i = 0; i < 50; ++i) {
    const std::string path = fake.path("folder/" + std::to_string(i));
    events.append(path, fake.volume.writeFile(path).fileID);
    fake.volume.at(path).documentID = static_cast<std::uint32_t>(100 + i);
  }
  fake.faults.reset();
  EXPECT_EQ(told().size(), 51U);
  EXPECT_EQ(fake.faults.calls(Op::prefetch), 1U);
  EXPECT_EQ(fake.faults.calls(Op::pathOfFileID), 0U);
  EXPECT_LE(fake.faults.calls(Op::readValues), 2U);  // the folder and its parent
}

TEST_F(FSEventReaderTest, StreamFlagsComeBeforeEverythingElse) {
  start(pathBased);
  using namespace eventflag;
  struct Case {
    std::uint32_t flags;
    std::optional<std::string> path;
    std::vector<std::string> told;
    std::string line;
    bool isRecorded;
  };
  const std::string path = fake.path("folder");
  const std::string update = "update " + folder + " at " + path;
  const std::string change = "did change <LocalItem itemIdentifier: " + folder +
                             ", parentItemIdentifier: VesselRootContainerItemIdentifier, "
                             "filename: folder>";
  const Case cases[] = {
      {eventIDsWrapped | historyDone, path, {"restart"}, "fsevents id wrapped", false},
      {eventIDsWrapped | kernelDropped, {}, {"restart"}, "fsevents id wrapped", false},
      {kernelDropped, path, {"restart"}, "dropped fsevents", false},
      {userDropped, {}, {"restart"}, "dropped fsevents", false},
      {historyDone, {}, {"history done"}, "done processing history", true},
      {mustScanSubdirectories, path, {update}, change, true},
      {0x1f00 & ~0x1fU, path, {update}, change, true},
      {0, {}, {"drop noPath"}, "", false},
  };
  for (const Case& c : cases) {
    const std::uint64_t before = reader->lastProcessedFSEventID();
    const std::uint64_t id = events.append({0, c.flags, c.path, {}, {}});
    auto expected = c.told;
    expected.emplace_back("batch");
    EXPECT_EQ(told(), expected) << c.flags;
    const LogLine line =
        c.line.empty() ? error("ignore event 0 because no path can be extracted") : debug(c.line);
    EXPECT_THAT(log.messages(), ElementsAre(debug("fsevent: received 1 events"), line));
    EXPECT_EQ(reader->lastProcessedFSEventID(), c.isRecorded ? id : before);
  }
}

TEST_F(FSEventReaderTest, DocumentRecordsLeadToTheDocumentThatLiesThere) {
  fake.volume.makeFolder("/elsewhere");
  const auto document = [&](std::string_view path, std::uint32_t id) {
    FakeNode& node = fake.volume.writeFile(path);
    node.documentID = id;
    return node.fileID;
  };
  const std::uint64_t file = document(fake.path("folder/file"), 21);
  const std::uint64_t hidden = document(fake.path(".hidden"), 22);
  const std::uint64_t outside = document("/elsewhere/file", 23);
  start(docIDBased);
  fake.faults.reset();
  events.appendDocument(7, 3, 0);
  EXPECT_THAT(told(), ElementsAre("delete did=7", "batch"));
  EXPECT_EQ(fake.faults.calls(), 0U);

  const struct {
    std::uint32_t document;
    std::uint64_t destination;
    std::string told;
    std::string line;
  } cases[] = {
      {21, file, "update did=21 at " + fake.path("folder/file"), ""},
      {24, file, "drop mismatch at " + fake.path("folder/file"),
       "dropping fsevent at " + urlText("folder/file") +
           "; fileObjectIDs don't match (did=21 vs did=24)"},
      {22, hidden, "drop hidden at " + fake.path(".hidden"),
       "dropping fsevent at " + urlText(".hidden") + "; URL is hidden"},
      {23, outside, "drop notMonitored at /elsewhere/file",
       "dropping fsevent at file:///elsewhere/file; URL is not monitored"},
      {9, 4711, "drop noPlace", "can't compute url for did=9"},
  };
  for (const auto& c : cases) {
    events.appendDocument(c.document, 1, c.destination);
    EXPECT_THAT(told(), ElementsAre(c.told, "batch"));
    EXPECT_TRUE(c.line.empty() || std::ranges::count(log.messages(), debug(c.line)) == 1) << c.line;
  }
  events.append(".docid/changed/7/src=3,dst=5x");
  EXPECT_THAT(told(), ElementsAre("drop unparsable", "batch"));
  EXPECT_THAT(
      log.messages(),
      Contains(error("can't parse docID path \".docid/changed/7/src=3,dst=5x\"; format expected is "
                     "\"/.docid/$dev/changed/$docid/src=$src,dst=$dst\"")));
}

TEST_F(FSEventReaderTest, WhatCannotBeLookedAtIsNotTakenForGone) {
  start(pathBased);
  const std::string file = fake.path("folder/file");
  ASSERT_TRUE(identity.itemIdentifier(fake.url("folder/file")));
  std::size_t n = 1;
  for (;; ++n) {
    events.append(file, fileID);
    fake.faults.reset();
    fake.faults.failCall(n, Error::posix(EMFILE));
    const auto calls = told();
    EXPECT_THAT(calls, Not(Contains("delete fid=" + std::to_string(fileID) + " at " + file))) << n;
    ASSERT_EQ(calls.size(), 2U);
    if (fake.faults.calls() < n) break;
  }
  EXPECT_GT(n, 3U);
  // Not only for a moment: the error is told.
  fake.faults.reset();
  fake.faults.fail(Op::readValues, Error::posix(EMFILE), 1, 1000);
  fake.faults.fail(Op::prefetch, Error::posix(EMFILE), 1, 1000);
  fake.faults.fail(Op::pathOfFileID, Error::posix(EIO), 1, 1000);
  events.append(file);
  events.append(file, fileID);
  EXPECT_THAT(told(), ElementsAre("drop lookFailed at " + file + " (24)",
                                  "drop lookFailed at " + file + " (5)", "batch"));
}

TEST_F(FSEventReaderTest, StartAndStopAreToldInTheLog) {
  start(pathBased);
  const std::string description = reader->description();
  EXPECT_THAT(description, ::testing::MatchesRegex(
                               "<FSEventReader:0x[0-9a-f]+ last:0 mode:pathBased urls:\\[\"" +
                               fake.path("") + "\", \"/apps/draw/Documents\"\\]>"));
  onQueue([&] { reader->stop(); });
  EXPECT_FALSE(reader->isRunning());
  EXPECT_THAT(log.lines(), ElementsAre(debug("stopped " + description)));
  events.append(fake.path("folder"));
  EXPECT_THAT(told(), IsEmpty());

  log.clear();
  events.failCreation(Error::posix(EMFILE));
  onQueue([&] { reader->start(); });
  EXPECT_FALSE(reader->isRunning());
  EXPECT_THAT(log.lines(),
              ElementsAre(debug("starting " + description),
                          error("can't create FSEvent stream for [" + fake.url().description() +
                                ", file:///apps/draw/Documents]")));
}

TEST_F(FSEventReaderTest, ReleasedWhileRunningIsAnErrorAndEndsTheStream) {
  start(pathBased);
  const std::string description = reader->description();
  reader.reset();
  EXPECT_THAT(log.lines(),
              ElementsAre(error("stream deleted without being stopped; " + description)));
  EXPECT_EQ(events.runningStreams(), 0U);
}

TEST_F(FSEventReaderTest, OwnerIsNotKeptAlive) {
  start(pathBased);
  const std::weak_ptr<ReaderLog> owner = delegate;
  delegate.reset();
  EXPECT_TRUE(owner.expired());
  events.append(fake.path("folder"), folderID);
  events.deliver();
  EXPECT_EQ(reader->lastProcessedFSEventID(), 1U);
}

}  // namespace
}  // namespace mirabel::testing
