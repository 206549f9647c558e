#pragma once

#include <cstdint>
#include <functional>
#include <random>
#include <set>
#include <string>
#include <vector>

namespace mirabel::testing {

/// Random changes to a tree on real disk, of every kind that people and programs make. What the
/// file system refuses is no change.
class RandomTree {
 public:
  /// `others` are further folders in which things happen, whenever they are there.
  RandomTree(std::string root, std::vector<std::string> others,
             std::function<bool(const std::string&)> isPresented, std::string outside,
             unsigned seed)
      : root_(std::move(root)),
        others_(std::move(others)),
        isPresented_(std::move(isPresented)),
        outside_(std::move(outside)),
        random_(seed) {}

  /// Makes one, and answers what it was, for people.
  std::string change();
  /// Everything was caught up with: from now on the folders that are presented are followed.
  void noteFollowed();
  /// Before it is caught up: what was written to a file through a name that is gone, in a folder
  /// that nobody followed, is a change of which nothing tells. Makes another, which shows.
  void makeUnheardHeard();
  /// Whether this user can read the folder and look up what lies in it.
  [[nodiscard]] static bool isOpen(const std::string& folder);
  /// Opens every folder below that one, to be removed with it.
  static void openAll(const std::string& folder);
  /// What comes next depends on the seed and on the tree alone.
  void reseed(unsigned seed) { random_.seed(seed); }
  [[nodiscard]] std::size_t pick(std::size_t n) { return random_() % n; }

 private:
  [[nodiscard]] std::vector<std::string> all(bool folders) const;
  [[nodiscard]] std::string any(bool folders);
  [[nodiscard]] std::string anyName();
  [[nodiscard]] std::string anyLinked();
  void save(const std::string& path, std::size_t way);
  std::string link(const std::string& file, const std::string& to);
  void linkNameless(const std::string& to);
  std::string changeLinked(const std::string& to);
  std::string changeMode(const std::string& folder);

  struct Written {
    std::uint64_t file, folder;  ///< inode numbers
    std::string name;
  };
  void noteWriting(const std::string& file);
  [[nodiscard]] bool isShown(const std::string& path) const;
  [[nodiscard]] std::set<std::uint64_t> shownFolders() const;
  [[nodiscard]] bool isRoot(const std::string& folder) const;

  std::string root_;
  std::vector<std::string> others_;
  std::function<bool(const std::string&)> isPresented_;
  std::string outside_;  ///< a folder on the same file system that is not presented
  std::mt19937 random_;
  std::set<std::uint64_t> followed_;  // inode numbers of folders
  std::vector<Written> unheard_;
};

}  // namespace mirabel::testing
