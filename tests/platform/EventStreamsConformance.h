#pragma once

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "foundation/SerialQueue.h"
#include "platform/EventStreams.h"

// What every event history keeps to, in memory or on disk. Whoever has one says how a change comes
// about:
//
//   INSTANTIATE_TEST_SUITE_P(Fake, EventStreamsConformance, ::testing::Values(makeFakeHistory));

namespace mirabel::testing {

/// A history, with a folder in which things can be made to happen.
class HistoryUnderTest {
 public:
  virtual ~HistoryUnderTest() = default;
  [[nodiscard]] virtual EventStreams& streams() = 0;
  /// The folder that is watched; another lies beside it.
  [[nodiscard]] virtual std::string folder() const = 0;
  [[nodiscard]] virtual std::string otherFolder() const = 0;
  /// Something happens at the file of that name in the folder.
  virtual void change(const std::string& path) = 0;
  /// The document at that path passes to another object.
  virtual void save(const std::string& path) = 0;
  /// What has happened is told to running streams, if need be by a nudge.
  virtual void deliver() = 0;
};
using HistoryFactory = std::function<std::unique_ptr<HistoryUnderTest>()>;

/// Collects what a stream delivers.
class StreamListener {
 public:
  explicit StreamListener(HistoryUnderTest& history) : history_(history) {}
  ~StreamListener() { stop(); }

  void startForPaths(std::vector<std::string> paths, std::uint64_t since) {
    start(history_.streams().createForPaths(std::move(paths), since, latency, 0, callback()));
  }
  void startForDocuments(std::uint64_t since) {
    start(history_.streams().createRelativeToDevice(1, {"/.docid"}, since, latency, 0, callback()));
  }
  void stop() {
    if (!stream_) return;
    queue_.sync([&] {
      stream_->stop();
      stream_->invalidate();
    });
    stream_.reset();
  }

  /// Waits until that holds of the events so far; false when it does not in time.
  bool waitFor(const std::function<bool(const std::vector<FileSystemEvent>&)>& holds) {
    std::unique_lock lock(state_->mutex);
    return state_->changed.wait_for(lock, std::chrono::seconds(20),
                                    [&] { return holds(state_->events); });
  }
  bool waitForFlag(std::uint32_t flag) {
    return waitFor([flag](const auto& events) {
      return !events.empty() && (events.back().flags & flag) != 0;
    });
  }
  bool waitForPath(const std::string& path) {
    return waitFor([&](const auto& events) {
      return std::ranges::any_of(events, [&](const auto& event) { return event.path == path; });
    });
  }
  [[nodiscard]] std::vector<FileSystemEvent> events() const {
    const std::lock_guard lock(state_->mutex);
    return state_->events;
  }
  /// All bits that were told of the path.
  [[nodiscard]] std::uint32_t flags(const std::string& path) const {
    std::uint32_t flags = 0;
    for (const FileSystemEvent& event : events())
      if (event.path == path) flags |= event.flags;
    return flags;
  }
  [[nodiscard]] std::size_t count(const std::string& path) const {
    return static_cast<std::size_t>(std::ranges::count(events(), path, &FileSystemEvent::path));
  }

 private:
  static constexpr std::chrono::milliseconds latency{50};
  struct State {
    std::mutex mutex;
    std::condition_variable changed;
    std::vector<FileSystemEvent> events;
  };

  EventStreams::Callback callback() {
    return [state = state_, queue = queue_](std::span<const FileSystemEvent> events) {
      EXPECT_TRUE(queue.isCurrent());
      const std::lock_guard lock(state->mutex);
      state->events.insert(state->events.end(), events.begin(), events.end());
      state->changed.notify_all();
    };
  }
  void start(Result<std::unique_ptr<EventStream>> stream) {
    ASSERT_TRUE(stream);
    stream_ = std::move(*stream);
    stream_->setDispatchQueue(queue_);
    stream_->start();
  }

  HistoryUnderTest& history_;
  SerialQueue queue_{"listener"};
  std::shared_ptr<State> state_ = std::make_shared<State>();
  std::unique_ptr<EventStream> stream_;
};

class EventStreamsConformance : public ::testing::TestWithParam<HistoryFactory> {
 protected:
  void SetUp() override {
    history_ = GetParam()();
    if (!history_) GTEST_SKIP() << "not for this user";
    // The history begins with the first question.
    since_ = history_->streams().currentEventID().value();
  }
  std::string at(const std::string& name) const { return history_->folder() + "/" + name; }

  std::unique_ptr<HistoryUnderTest> history_;
  std::uint64_t since_ = 0;
};

TEST_P(EventStreamsConformance, HistoryThenItsEndThenWhatComes) {
  history_->change(at("before"));
  const std::uint64_t last = history_->streams().currentEventID().value();
  ASSERT_GT(last, since_);
  StreamListener listener(*history_);
  listener.startForPaths({history_->folder()}, since_);
  ASSERT_TRUE(listener.waitForFlag(eventflag::historyDone));
  const auto history = listener.events();
  EXPECT_GE(listener.count(at("before")), 1u);
  EXPECT_FALSE(history.back().path);
  EXPECT_EQ(history.back().id, last);
  for (const FileSystemEvent& event : history)
    EXPECT_LE(event.id, last);

  history_->change(at("after"));
  history_->deliver();
  ASSERT_TRUE(listener.waitForPath(at("after")));
  std::uint64_t previous = 0;
  for (const FileSystemEvent& event : listener.events()) {
    EXPECT_GE(event.id, previous) << "IDs only grow";
    previous = event.id;
  }
}

TEST_P(EventStreamsConformance, OnlyWhatLiesInTheFolderIsTold) {
  history_->change(history_->otherFolder() + "/elsewhere");
  history_->change(at("here"));
  StreamListener listener(*history_), both(*history_);
  listener.startForPaths({history_->folder()}, since_);
  both.startForPaths({history_->folder(), history_->otherFolder()}, since_);
  ASSERT_TRUE(listener.waitForFlag(eventflag::historyDone));
  ASSERT_TRUE(both.waitForFlag(eventflag::historyDone));
  EXPECT_EQ(listener.count(history_->otherFolder() + "/elsewhere"), 0u);
  EXPECT_GE(both.count(history_->otherFolder() + "/elsewhere"), 1u);
  EXPECT_GE(both.count(at("here")), 1u);
}

TEST_P(EventStreamsConformance, DocumentRecordsAreAStreamOfTheirOwn) {
  history_->change(at("document"));
  const std::uint64_t made = history_->streams().currentEventID().value();
  history_->save(at("document"));
  StreamListener documents(*history_), paths(*history_);
  documents.startForDocuments(made);
  paths.startForPaths({history_->folder()}, made);
  ASSERT_TRUE(documents.waitForFlag(eventflag::historyDone));
  ASSERT_TRUE(paths.waitForFlag(eventflag::historyDone));
  const auto isDocument = [](const FileSystemEvent& event) {
    return event.path && event.path->starts_with(".docid/changed/");
  };
  const auto told = documents.events();
  EXPECT_TRUE(std::ranges::any_of(told, isDocument));
  EXPECT_TRUE(std::ranges::all_of(told, [&](const auto& e) { return !e.path || isDocument(e); }));
  EXPECT_FALSE(std::ranges::any_of(paths.events(), isDocument));
}

TEST_P(EventStreamsConformance, AnIDThatWasNeverGivenOutIsALoss) {
  StreamListener listener(*history_);
  listener.startForPaths({history_->folder()}, history_->streams().currentEventID().value() + 1000);
  ASSERT_TRUE(listener.waitFor([](const auto& events) { return !events.empty(); }));
  EXPECT_NE(listener.events().front().flags & eventflag::kernelDropped, 0u);
}

TEST_P(EventStreamsConformance, AStreamThatWasStoppedIsSilent) {
  StreamListener stopped(*history_), running(*history_);
  stopped.startForPaths({history_->folder()}, since_);
  running.startForPaths({history_->folder()}, since_);
  ASSERT_TRUE(stopped.waitForFlag(eventflag::historyDone));
  ASSERT_TRUE(running.waitForFlag(eventflag::historyDone));
  stopped.stop();
  history_->change(at("late"));
  history_->deliver();
  ASSERT_TRUE(running.waitForPath(at("late")));
  EXPECT_EQ(stopped.count(at("late")), 0u);
}

}  // namespace mirabel::testing
