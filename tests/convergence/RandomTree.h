#pragma once

#include <functional>
#include <random>
#include <string>
#include <vector>

namespace mirabel::testing {

/// Random changes to a tree on real disk, of every kind that people and programs make. What the
/// file system refuses is no change.
class RandomTree {
 public:
  /// `others` are further folders in which things happen, whenever they are there. What is written
  /// to a file through a name in one of them that is not presented at the time is no change that
  /// its other names must tell.
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

  [[nodiscard]] bool mayBeWritten(const std::string& file) const;
  [[nodiscard]] bool isRoot(const std::string& folder) const;

  std::string root_;
  std::vector<std::string> others_;
  std::function<bool(const std::string&)> isPresented_;
  std::string outside_;  ///< a folder on the same file system that is not presented
  std::mt19937 random_;
};

}  // namespace mirabel::testing
