#pragma once

#include <chrono>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "linux/kernel/MonitoredRoots.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel {

/// A folder "Documents" on real disk, a state folder beside it, and the index over both. Folders
/// named "*.package" are packages. Lies below $MIRABEL_TEST_DIR where that is set, and is removed
/// at the end.
class VolumeFixture : public ::testing::Test {
 protected:
  /// Bursts of files are made in memory unless a file system was named: some disks need a minute to
  /// be rid of them.
  enum class Where { onDisk, inMemory };
  explicit VolumeFixture(Where where = Where::onDisk);
  ~VolumeFixture() override;

  std::string path(std::string_view relative) const {
    return documents_ + "/" + std::string(relative);
  }
  void write(std::string_view relative, std::string_view contents = "x") const;
  void makeFolder(std::string_view relative) const;
  void rename(std::string_view from, std::string_view to) const;
  void exchange(std::string_view a, std::string_view b) const;
  void remove(std::string_view relative) const;
  void link(std::string_view from, std::string_view to) const;
  /// Does steps such as "write f; mkdir d; mv f d/g; ln d/g h; swap h i; rm d; look i; close". What
  /// is written is a further word, or "x".
  void run(const std::string& steps);
  std::uint64_t inode(std::string_view relative) const;
  ObjectStatus status(std::string_view relative) const;

  /// What MIRABEL_TEST_SEED says, or else that.
  static unsigned long seedOr(unsigned long otherwise);

  /// Closes the index in order; the next use opens it again.
  void close() { index_.reset(); }
  VolumeIndex& index();
  /// After everything that happened so far.
  std::uint64_t anchor();
  /// Where the state of the volume lies, which there must be.
  std::string volumeFolder() const;
  Result<std::unique_ptr<VolumeIndex>> tryOpen(std::chrono::milliseconds timeout = {});

  /// What the index makes of one name.
  Sighting see(std::string_view relative);
  std::uint32_t document(std::string_view relative) { return see(relative).documentID; }
  std::uint64_t file(std::string_view relative) { return see(relative).fileID; }
  /// What it makes of all names of a folder at once, as a listing does. In directory order.
  std::vector<Sighting> list(std::string_view folder = "");

  /// Relative path of a document or a file ID; empty when there is none.
  std::string findDocument(std::uint32_t documentID);
  std::string findFile(std::uint64_t fileID);

  /// How the index hears of changes: not at all, at first. Whoever asks brings it in step; no
  /// thread does.
  std::function<Result<std::unique_ptr<FolderWatcher>>()> makeWatcher_;

  std::string base_;
  std::string documents_;
  std::string state_;
  std::vector<std::string> notices_;
  int timesBroken_ = 0;
  /// What `see` and `list` add to the time of each look, in nanoseconds: as if what they see had
  /// not changed for that long.
  std::int64_t age_ = 0;

 private:
  std::unique_ptr<MonitoredRoots> roots_;
  std::unique_ptr<VolumeIndex> index_;
};

}  // namespace mirabel
