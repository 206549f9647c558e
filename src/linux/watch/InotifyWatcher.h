#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <unordered_map>

#include "linux/watch/FolderWatcher.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

/// inotify, with a watch on each folder.
class InotifyWatcher final : public FolderWatcher {
 public:
  [[nodiscard]] static Result<std::unique_ptr<FolderWatcher>> create();

  [[nodiscard]] Result<void> watch(int folder, std::uint64_t id) override;
  void forget(std::uint64_t id) override;
  [[nodiscard]] bool isWatched(std::uint64_t id) const override;
  [[nodiscard]] std::size_t watchedFolders() const override;
  [[nodiscard]] Result<Drained> drain(LookList& looks) override;
  [[nodiscard]] int descriptor() const override { return instance_.get(); }
  [[nodiscard]] WatcherKind kind() const override { return WatcherKind::inotify; }

 private:
  explicit InotifyWatcher(UniqueFd instance);
  void end(std::uint64_t id);
  void drop(int watch);

  UniqueFd instance_;
  std::unordered_map<int, std::uint64_t> folders_;  // by watch
  std::unordered_map<std::uint64_t, int> watches_;
  std::unique_ptr<std::byte[]> buffer_;
};

}  // namespace mirabel
