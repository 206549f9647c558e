#pragma once

#include <gtest/gtest.h>
#include <memory>
#include <set>
#include <string>

#include "linux/FaultyWatcher.h"
#include "linux/VolumeFixture.h"

namespace mirabel {

/// An index that follows what happens, by each kind of watcher that this kernel has.
class FollowerTest : public VolumeFixture, public ::testing::WithParamInterface<WatcherKind> {
 protected:
  FollowerTest() : VolumeFixture(Where::inMemory) {}

  void SetUp() override {
    makeWatcher_ = [this]() -> Result<std::unique_ptr<FolderWatcher>> {
      return makeFaultyWatcher(makeWatcher(GetParam()), faults_);
    };
    if (!makeWatcher(GetParam())) GTEST_SKIP() << "not on this kernel";
  }

  std::uint64_t anchor() { return index().currentEventID().value(); }

  /// Paths below the documents that events since then name.
  std::set<std::string> told(std::uint64_t since) {
    std::set<std::string> paths;
    const auto records = index().events(since, 10'000'000);
    EXPECT_TRUE(records);
    for (const JournalRecord& record : *records) {
      if (!record.isDocument) paths.insert(record.path.substr(documents_.size()));
    }
    return paths;
  }

  void expectInStep(const char* what) {
    const std::uint64_t last = anchor();
    EXPECT_TRUE(index().reconcile());
    EXPECT_EQ(told(last), std::set<std::string>()) << what;
  }

  std::shared_ptr<WatcherFaults> faults_ = std::make_shared<WatcherFaults>();
};

}  // namespace mirabel
