#include <filesystem>
#include <fstream>
#include <functional>
#include <set>
#include <sys/stat.h>
#include <unistd.h>

#include "linux/FailingWrites.h"
#include "linux/VolumeFixture.h"
#include "linux/volume/Database.h"
#include "linux/volume/IdentityStore.h"

namespace mirabel {
namespace {

class VolumeStateTest : public VolumeFixture {
 protected:
  std::string database() const { return volumeFolder() + "/volume.db"; }
};

TEST_F(VolumeStateTest, WhatIsLongGoneIsForgottenAndItsIdentifiersAreNotGivenAgain) {
  const auto inDatabase = [this](const char* sql) {
    close();
    auto opened = Database::open(database()).value();
    auto statement = opened->prepare(sql).value();
    return statement.step().value() ? statement.integer(0) : 0;
  };
  const char* const count = "SELECT count(*) FROM objects";
  run("mkdir folder/inner; write kept; write gone; write folder/a; write folder/inner/b");
  std::set<std::uint64_t> files;
  std::set<std::uint32_t> documents;
  for (const char* name :
       {"folder", "folder/inner", "kept", "gone", "folder/a", "folder/inner/b"}) {
    files.insert(file(name));
    documents.insert(document(name));
  }
  ASSERT_TRUE(index().keptAttributes().set(file("gone"), "name", Data{}));
  const std::uint64_t kept = file("kept");
  run("rm gone; rm folder");
  ASSERT_TRUE(index().reconcile());
  EXPECT_EQ(inDatabase(count), 7);
  index();  // notes when they were gone
  EXPECT_EQ(inDatabase(count), 7);
  inDatabase("UPDATE objects SET place = 1 WHERE folder IS NULL AND place IS NOT NULL");
  EXPECT_TRUE(index().keptAttributes().isEmpty());
  EXPECT_EQ(inDatabase(count), 2);
  EXPECT_EQ(file("kept"), kept);
  for (int i = 0; i < 30; ++i) {
    const std::string name = "new" + std::to_string(i);
    write(name);
    EXPECT_TRUE(files.insert(file(name)).second) << i;
    EXPECT_TRUE(documents.insert(document(name)).second) << i;
    if (i == 15) close();
  }
}

TEST_F(VolumeStateTest, ALockThatWasRemovedLetsNobodyIn) {
  index();
  std::filesystem::remove(volumeFolder() + "/lock");
  EXPECT_TRUE(tryOpen().error().isPosix(EBUSY));
}

TEST_F(VolumeStateTest, AStateFolderThatIsNotOursIsRefused) {
  write("doc");
  std::filesystem::create_directory(base_ + "/real");
  std::filesystem::create_symlink(base_ + "/real", state_);
  EXPECT_TRUE(tryOpen().error().isPosix(EPERM));
  EXPECT_TRUE(std::filesystem::is_empty(base_ + "/real"));
  std::filesystem::remove(state_);

  write("../state", "a file");
  EXPECT_FALSE(tryOpen());
  std::filesystem::remove(state_);

  if (::geteuid() != 0) GTEST_SKIP() << "only root can give a folder away";
  std::filesystem::create_directory(state_);
  ASSERT_EQ(::chown(state_.c_str(), 65534, 65534), 0);
  EXPECT_TRUE(tryOpen().error().isPosix(EPERM));
  EXPECT_TRUE(std::filesystem::is_empty(state_));
}

TEST_F(VolumeStateTest, TheStateIsForItsOwnerOnly) {
  std::filesystem::create_directory(state_);
  ASSERT_EQ(::chmod(state_.c_str(), 0755), 0);
  write("doc");
  see("doc");
  for (const auto& entry : std::filesystem::recursive_directory_iterator(state_)) {
    struct stat status {};
    ASSERT_EQ(::lstat(entry.path().c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0077, 0u) << entry.path();
  }
}

// Whatever happened to the database, nothing that comes after gets an identity of before.
using DamagedState = VolumeStateTest;
TEST_F(DamagedState, NewIdentitiesAreNotMixedWithOld) {
  std::set<std::uint64_t> files;
  std::set<std::uint32_t> documents;
  std::set<UUID> histories;
  const std::function<void()> losses[] = {[] {}, [&] { std::filesystem::remove(database()); },
                                          [&] {
                                            std::ofstream(database(), std::ios::in | std::ios::out)
                                                << "not a database";
                                            std::filesystem::remove(volumeFolder() + "/witness");
                                          }};
  for (const auto& lose : losses) {
    lose();
    std::filesystem::remove_all(documents_);
    makeFolder("folder");
    for (int i = 0; i < 40; ++i)
      write(std::to_string(i));
    for (const Sighting& sighting : list()) {
      EXPECT_TRUE(files.insert(sighting.fileID).second) << sighting.name;
      if (sighting.name == "folder") continue;
      EXPECT_TRUE(documents.insert(sighting.documentID).second) << sighting.name;
    }
    EXPECT_TRUE(histories.insert(index().historyUUID()).second);
    close();
  }
}

// Nobody can say then how old the database is: identities stay, the history does not.
TEST_F(VolumeStateTest, AWitnessThatIsOlderOrMissingCostsNoIdentity) {
  write("doc");
  const std::uint32_t document = this->document("doc");
  std::set<UUID> histories{index().historyUUID()};
  close();
  const std::string witness = volumeFolder() + "/witness";
  std::filesystem::copy_file(witness, base_ + "/witness");
  write("another");
  see("another");
  close();
  std::filesystem::rename(base_ + "/witness", witness);
  for (std::size_t round = 1; round <= 2; ++round) {
    EXPECT_EQ(this->document("doc"), document);
    EXPECT_TRUE(histories.insert(index().historyUUID()).second);
    EXPECT_EQ(notices_.size(), round);
    close();
    std::filesystem::remove(witness);
  }
}

TEST_F(VolumeStateTest, AFullDiskOrQuotaPasses) {
  write("before");
  see("before");
  const UUID history = index().historyUUID();
  const std::string reserve = volumeFolder() + "/reserve";
  for (const int error : {ENOSPC, EDQUOT}) {
    const std::string name = "doc" + std::to_string(error);
    write(name);
    ASSERT_TRUE(std::filesystem::exists(reserve));
    {
      const FailingWrites full(error, reserve);
      EXPECT_NE(document(name), 0u) << "the reserve was to be given up";
      EXPECT_FALSE(std::filesystem::exists(reserve));
    }
    write(name + " is not alone");
    {
      const FailingWrites full(error);
      const auto refused = index().currentEventID();
      ASSERT_FALSE(refused);
      EXPECT_TRUE(refused.error().isPosix(error)) << refused.error().description();
    }
    EXPECT_TRUE(index().currentEventID());
    close();
    index();
  }
  EXPECT_EQ(index().historyUUID(), history);
  EXPECT_EQ(timesBroken_, 0);
}

TEST_F(VolumeStateTest, AFailingDiskEndsItUntilItIsOpenedAnew) {
  write("doc");
  const std::uint32_t document = this->document("doc");
  const UUID history = index().historyUUID();
  {
    const FailingWrites broken(EIO);
    EXPECT_FALSE(index().currentEventID());
    EXPECT_EQ(timesBroken_, 1);
  }
  EXPECT_FALSE(index().currentEventID());
  EXPECT_EQ(timesBroken_, 1);
  close();
  EXPECT_TRUE(index().currentEventID());
  EXPECT_EQ(this->document("doc"), document);
  EXPECT_EQ(index().historyUUID(), history);
}

TEST_F(VolumeStateTest, WithoutItsFolderNothingIsAnsweredAnyMore) {
  namespace fs = std::filesystem;
  const std::function<void()> ways[] = {
      [this] { fs::remove_all(state_); }, [this] { fs::remove_all(volumeFolder()); },
      [this] { fs::rename(state_, base_ + "/aside"); },
      // Another process has begun a state of its own in its place.
      [this] {
        const fs::path folder = volumeFolder();
        fs::rename(folder, base_ + "/elsewhere");
        fs::create_directory(folder);
        std::ofstream(folder / "lock") << "";
      }};
  write("doc");
  int times = 0;
  for (const auto& way : ways) {
    const std::uint64_t file = this->file("doc");
    const std::uint32_t document = this->document("doc");
    EXPECT_TRUE(index().currentEventID());
    way();
    EXPECT_FALSE(index().pathOfFileID(file)) << times;
    EXPECT_FALSE(index().fileIDOfDocument(document)) << times;
    EXPECT_FALSE(index().currentEventID()) << times;
    EXPECT_EQ(timesBroken_, ++times);
    close();
  }
  EXPECT_TRUE(index().currentEventID());
}

}  // namespace
}  // namespace mirabel
