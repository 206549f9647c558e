#pragma once

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <functional>
#include <initializer_list>
#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

namespace mirabel::bench {

/// A temporary home below $MIRABEL_BENCH_DIR. Where that is not set: below the temporary folder, or
/// in memory, for what makes and removes so much that the disk would be all that is measured.
class BenchHome {
 public:
  enum class Where { temporaryFolder, memory };
  explicit BenchHome(Where where = Where::temporaryFolder);
  ~BenchHome();
  BenchHome(const BenchHome&) = delete;
  BenchHome& operator=(const BenchHome&) = delete;

  [[nodiscard]] const std::string& path() const { return path_; }
  [[nodiscard]] std::string documents() const { return path_ + "/Documents"; }
  /// Empty files in one folder below the documents; answers the folder.
  std::string makeFolder(const std::string& name, std::size_t files) const;
  void forgetState() const;

 private:
  std::string path_;
};

/// How often each side is measured, and on how much.
struct Scale {
  std::size_t files = 100'000;
  int rounds = 5;
  std::string only;  ///< part of the names of what is to be measured; empty for all

  [[nodiscard]] bool includes(std::string_view name) const {
    return name.find(only) != std::string_view::npos;
  }
  /// Whether anything of a table is: what it is measured on need not be made otherwise.
  [[nodiscard]] bool includesAny(std::initializer_list<std::string_view> names) const {
    return std::ranges::any_of(names, [this](std::string_view name) { return includes(name); });
  }
};

enum class Unit { seconds, kibibytes, perSecond };
enum class Bound { atMost, atLeast };

/// One comparison: what was measured of ours and of the reference, in turn, so that a machine whose
/// speed drifts is the same for both.
struct Comparison {
  std::string name;
  std::vector<double> ours;
  std::vector<double> reference;
  /// Of the median of the ratios: what was promised, if anything was.
  std::optional<double> target{};
  Unit unit = Unit::seconds;
  Bound bound = Bound::atMost;
};

[[nodiscard]] double secondsOf(const std::function<void()>& work);
[[nodiscard]] double median(std::vector<double> values);
/// Resident memory of this process, or of another, in KiB, now.
[[nodiscard]] std::size_t residentKiB();
[[nodiscard]] std::size_t residentKiB(pid_t process);
/// The heading of a table, and one row of it.
void printHeading(const std::string& text);
void print(const Comparison& comparison);

/// What `require` throws, so that homes are removed and children are ended on the way out.
struct Failure {
  const char* what;
};
/// A benchmark whose result is wrong measures nothing.
void require(bool condition, const char* what);

void runListingBenchmarks(const Scale& scale);
void runPagesBenchmarks(const Scale& scale);
void runFollowingBenchmarks(const Scale& scale);
void runOperationBenchmarks(const Scale& scale);
void runApplicationsBenchmarks(const Scale& scale);
void runServiceBenchmarks(const Scale& scale);
void runSearchBenchmarks(const Scale& scale);

}  // namespace mirabel::bench
