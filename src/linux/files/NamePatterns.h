#pragma once

#include <array>
#include <cstdint>
#include <set>
#include <string>
#include <string_view>
#include <vector>

namespace mirabel {

/// Knows which part of a file name the desktop's type database looks at, so that a type found for
/// one name can be kept for all names with the same ending. It errs on the side of "the whole
/// name". Filled first, then read from any thread.
class NamePatterns {
 public:
  /// Takes in the patterns of one "globs2" file: lines "weight:type:pattern[:flags]".
  void read(const std::string& path);
  /// Takes in one pattern, such as "*.txt", "*.tar.gz", "makefile" or "readme*".
  void add(std::string_view given);

  /// The name from its last dot on, empty without a dot.
  [[nodiscard]] static std::string_view endingOf(std::string_view name);
  /// Whether some pattern looks at more of this name than its ending.
  [[nodiscard]] bool needsWholeName(std::string_view name) const;
  /// Whether more than the ending counts for every name that ends in `ending`: for ".gz", since
  /// there is "*.tar.gz".
  [[nodiscard]] bool isAmbiguousEnding(std::string_view ending) const;

 private:
  void addWithWildcards(std::string_view pattern);
  void addWholeName(std::string name);
  void addBeginning(std::string beginning);

  // In lower case. Before any of them is compared, one byte of the name has to fit.
  std::set<std::string, std::less<>> wholeNames_;
  std::vector<std::string> beginnings_;
  std::vector<std::string> endsWithoutDot_;  // "~", ",v"
  std::vector<std::string> insides_;
  std::set<std::string, std::less<>> ambiguousEndings_;
  std::array<std::uint64_t, 256> lengthsByFirstByte_{};  // of whole names: bit N is length N
  std::array<bool, 256> mayBegin_{};
  std::array<bool, 256> mayEnd_{};
  bool alwaysWhole_ = false;
};

}  // namespace mirabel
