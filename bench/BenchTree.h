#pragma once

#include <cstddef>
#include <string>

namespace mirabel::bench {

/// Folders of equally many files, nested up to three deep, below a folder that exists.
class BenchTree {
 public:
  BenchTree(std::string root, std::size_t folders, std::size_t files)
      : root_(std::move(root)), folders_(folders), files_(files) {}

  void make() const;
  [[nodiscard]] const std::string& root() const { return root_; }
  [[nodiscard]] std::size_t files() const { return files_; }
  [[nodiscard]] std::size_t folders() const { return folders_; }
  [[nodiscard]] std::string folder(std::size_t number) const;
  /// Files with neighbouring numbers lie in different folders.
  [[nodiscard]] std::string file(std::size_t number) const;
  /// Writes a block over the beginning of a file, as a program that saves in place does.
  void rewrite(std::size_t number) const;

 private:
  std::string root_;
  std::size_t folders_;
  std::size_t files_;
};

/// The least that comparing the tree with anything takes: reads each folder and makes one statx
/// for each entry, and keeps nothing. Answers how many there were.
[[nodiscard]] std::size_t plainPass(const std::string& root);

}  // namespace mirabel::bench
