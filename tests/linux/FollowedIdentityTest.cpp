// What happens on disk is taken for what it is: a document that is saved, moved or replaced keeps
// its identity or loses it, and no change is too soon after the last one.
#include <fcntl.h>
#include <string>
#include <utility>

#include "linux/FollowerTest.h"

namespace mirabel {
namespace {

TEST_P(FollowerTest, AnUnlinkedDocumentEndsAndASavedOneGoesOn) {
  write("saved");
  write("unlinked");
  anchor();
  const std::uint32_t saved = document("saved"), unlinked = document("unlinked");
  write("temporary", "new");
  rename("temporary", "saved");
  remove("unlinked");
  write("unlinked", "another");
  anchor();
  EXPECT_EQ(document("saved"), saved);
  EXPECT_NE(document("unlinked"), unlinked);
  EXPECT_TRUE(index().fileIDOfDocument(unlinked).error().isPosix(ENOENT));
}

TEST_P(FollowerTest, AnUnlinkedDocumentEndsThoughTheNextOneGetsItsNumber) {
  const auto number = [&] { return statusAt(AT_FDCWD, path("file")).value().inode; };
  bool wasGivenAgain = false;
  write("file");
  for (int attempt = 0; attempt < 20; ++attempt) {
    anchor();
    const std::uint32_t ended = document("file");
    const std::uint64_t before = number();
    remove("file");
    write("file", "another");
    wasGivenAgain |= number() == before;
    anchor();
    EXPECT_NE(document("file"), ended);
    EXPECT_FALSE(index().fileIDOfDocument(ended));
  }
  if (!wasGivenAgain) GTEST_SKIP() << "this file system gives no number twice in a row";
}

TEST_P(FollowerTest, ADocumentGoesIntoAFolderThatIsNewWithItsIdentity) {
  makeFolder("f");
  for (const char* name : {"f/first", "f/second"})
    write(name);
  for (int round = 0; round < 20; ++round) {
    anchor();
    const std::uint32_t first = document("f/first");
    const std::uint32_t second = document("f/second");
    const std::string folder = "f/new" + std::to_string(round);
    // One while nobody looks, and one while the new folder of the first is read.
    bool isLate = false;
    faults_->afterWatch = [&] {
      if (std::exchange(isLate, true)) return;
      makeFolder(folder + "/late");
      rename("f/second", folder + "/late/moved");
      write("f/second", "other");
    };
    makeFolder(folder + "/deep");
    rename("f/first", folder + "/deep/moved");
    write("f/first", "other");
    write("f/second", "changed");
    anchor();
    faults_->afterWatch = nullptr;
    EXPECT_EQ(document(folder + "/deep/moved"), first) << round;
    EXPECT_NE(document("f/first"), first) << round;
    EXPECT_EQ(document(folder + "/late/moved"), second) << round;
    EXPECT_NE(document("f/second"), second) << round;
  }
}

TEST_P(FollowerTest, AWriteWithinTheSecondOfTheLastIsTold) {
  write("f", "aa");
  if (!isCoarseStamp(status("f").changeTime)) GTEST_SKIP() << "times are fine here";
  anchor();
  for (int round = 0; round < 5; ++round) {
    write("f", "bb");
    age_ = 200'000'000;  // less than the step of the times
    see("f");
    const std::uint64_t since = anchor();
    write("f", "cc");
    anchor();
    EXPECT_TRUE(told(since).contains("/f")) << round;
  }
}

}  // namespace
}  // namespace mirabel
