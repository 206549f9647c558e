// A client that lists a container once and then applies every change that it is handed holds
// exactly what a fresh listing shows. Compared are all properties of an item; of the anchor, the
// status change time and the path, which are none, nothing is held.
#include <atomic>
#include <cstdlib>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <mutex>
#include <optional>
#include <random>
#include <thread>
#include <unistd.h>

#include "convergence/Scenario.h"
#include "support/LogCapture.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

constexpr int parts = 4;

// How many sequences a part of a run tries; a longer run is asked for by the environment.
int sequencesToRun() {
  const char* given = std::getenv("MIRABEL_TEST_SEQUENCES");
  return (given != nullptr ? std::stoi(given) : 2000) / parts;
}

std::optional<unsigned> givenSeed() {
  const char* given = std::getenv("MIRABEL_TEST_SEED");
  if (given == nullptr) return {};
  return static_cast<unsigned>(std::stoul(given));
}

class Convergence : public ::testing::TestWithParam<int> {
 protected:
  // So many homes are made that a disk would be all that is measured, unless one was named.
  static void SetUpTestSuite() {
    const bool isFree = std::getenv("MIRABEL_TEST_DIR") == nullptr;
    if (isFree && ::access("/dev/shm", W_OK) == 0) ::setenv("TMPDIR", "/dev/shm", 1);
  }

  void runAll(int sequences, unsigned firstSeed) {
    std::atomic<int> next = 0;
    const auto work = [&] {
      for (int i = next++; i < sequences && !hasFailed_; i = next++)
        runOne(firstSeed + static_cast<unsigned>(i));
    };
    std::vector<std::thread> threads;
    threads.reserve(mostAtATime);
    for (int i = 0; i < mostAtATime; ++i)
      threads.emplace_back(work);
    for (std::thread& thread : threads)
      thread.join();
  }

  void runOne(unsigned seed) {
    const Outcome outcome = run(stepsOf(seed));
    catchUps_ += outcome.catchUps;
    startedOver_ += outcome.startedOver;
    if (outcome.failure.empty()) return;
    const std::lock_guard lock(mutex_);
    if (hasFailed_.exchange(true)) return;
    failedSeed_ = seed;
    failure_ = outcome.failure + "\nafter" + outcome.story;
  }

  // Half of the parts change the modes of folders to some purpose: to root they mean nothing.
  void becomeOrdinaryUser() {
    user_.emplace();
    const char* folder = std::getenv("MIRABEL_TEST_DIR");
    const bool hasRoom = folder == nullptr || mayUse(folder, W_OK | X_OK);
    if (!hasRoom || !mayUse(MIRABEL_PROGRAM, X_OK)) user_.reset();
  }
  static bool mayUse(const char* path, int how) {
    return ::faccessat(AT_FDCWD, path, how, AT_EACCESS) == 0;
  }

  std::optional<OrdinaryUser> user_;
  // Mostly they wait for the kernel to let go of what was watched.
  static constexpr int mostAtATime = 6;
  const LogCapture quiet_{LogLevel::error};
  std::mutex mutex_;
  std::atomic<bool> hasFailed_ = false;
  unsigned failedSeed_ = 0;
  std::string failure_;
  std::atomic<int> catchUps_ = 0;
  std::atomic<int> startedOver_ = 0;
};

TEST_P(Convergence, AReplicaEqualsAFreshListing) {
  const auto seed = givenSeed();
  if (seed && GetParam() > 1) GTEST_SKIP() << "one part as each user is enough for one seed";
  if (GetParam() % 2 != 0) becomeOrdinaryUser();
  runAll(seed ? 1 : sequencesToRun(), seed.value_or(std::random_device{}()));
  EXPECT_GT(catchUps_, 0);
  EXPECT_LE(startedOver_ * 5, catchUps_) << "nothing was lost that often";
  if (!hasFailed_) return;
  const auto steps = shrink(stepsOf(failedSeed_));
  const Outcome shortest = run(steps);
  ADD_FAILURE() << "MIRABEL_TEST_SEED=" << failedSeed_ << "\n"
                << failure_ << "\nThe shortest sequence that still fails has " << steps.size()
                << " steps:" << shortest.story << "\n"
                << (shortest.failure.empty() ? "(this time it did not)" : shortest.failure);
}

INSTANTIATE_TEST_SUITE_P(Parts, Convergence, ::testing::Range(0, parts));

}  // namespace
}  // namespace mirabel::testing
