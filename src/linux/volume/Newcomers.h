#pragma once

#include <cstdint>
#include <string_view>
#include <unordered_set>

namespace mirabel {

/// What one batch has brought into a folder so far. An object that is new and comes under a free
/// name moves nobody: as long as there were no others, the index has nothing but these besides what
/// it had when the batch began, and need not be asked.
class Newcomers {
 public:
  /// `hadNames` says whether the index had any in the folder when the batch began.
  explicit Newcomers(bool hadNames) : hadNames_(hadNames) {}

  /// Names live as long as this.
  void add(std::string_view name, std::uint64_t inode) {
    names_.insert(name);
    inodes_.insert(inode);
  }
  /// Another was placed, which may have moved anything.
  void addOther() { areAlone_ = false; }

  /// Whether the index surely has nothing under the name.
  [[nodiscard]] bool isFree(std::string_view name) const {
    return areAlone_ && !hadNames_ && !names_.contains(name);
  }
  /// Whether the index surely still has nothing under the inode number.
  [[nodiscard]] bool isStillNew(std::uint64_t inode) const {
    return areAlone_ && !inodes_.contains(inode);
  }

 private:
  bool hadNames_;
  bool areAlone_ = true;
  std::unordered_set<std::string_view> names_;
  std::unordered_set<std::uint64_t> inodes_;
};

}  // namespace mirabel
