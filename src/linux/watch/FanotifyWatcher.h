#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "linux/watch/FolderWatcher.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

/// fanotify, with a mark on each folder or one on the file system. Records name their folder by
/// its handle.
class FanotifyWatcher final : public FolderWatcher {
 public:
  [[nodiscard]] static Result<std::unique_ptr<FolderWatcher>> create(WatcherKind kind);

  [[nodiscard]] Result<void> watch(int folder, std::uint64_t id) override;
  void forget(std::uint64_t id) override;
  [[nodiscard]] bool isWatched(std::uint64_t id) const override;
  [[nodiscard]] std::size_t watchedFolders() const override;
  [[nodiscard]] Result<Drained> drain(LookList& looks) override;
  [[nodiscard]] int descriptor() const override { return group_.get(); }
  [[nodiscard]] WatcherKind kind() const override { return kind_; }

 private:
  FanotifyWatcher(UniqueFd group, WatcherKind kind);
  [[nodiscard]] Result<void> mark(int folder);
  [[nodiscard]] std::optional<std::uint64_t> numberOf(std::string_view handle) const;

  struct Hash {
    using is_transparent = void;
    std::size_t operator()(std::string_view text) const {
      return std::hash<std::string_view>()(text);
    }
  };
  UniqueFd group_;
  WatcherKind kind_;
  bool hasFileSystemMark_ = false;
  using Numbers = std::unordered_map<std::string, std::uint64_t, Hash, std::equal_to<>>;
  using Handles = std::unordered_map<std::uint64_t, const std::string*>;
  /// Folders, and under which handle each has its number.
  struct Folders {
    Numbers numbers;
    Handles handles;  // keys of the other, one each
    void add(std::string handle, std::uint64_t id);
    void remove(std::uint64_t id);
  };
  Folders marked_;
  // Those that could not be marked: what happens to one of them itself comes with its own handle,
  // through the mark of the folder that it lies in.
  Folders closed_;
  std::unique_ptr<std::byte[]> buffer_;
};

}  // namespace mirabel
