#pragma once

#include <chrono>
#include <filesystem>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace mirabel::bench {

/// A temporary home below $MIRABEL_BENCH_DIR, or else below the temporary folder.
class BenchHome {
 public:
  BenchHome();
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
};

/// One comparison: seconds of ours and of the plain loop, in turn, so that a machine whose speed
/// drifts is the same for both.
struct Comparison {
  std::string name;
  std::vector<double> ours;
  std::vector<double> reference;
  double target;  ///< greatest ratio of the medians that was promised
};

[[nodiscard]] double secondsOf(const std::function<void()>& work);
[[nodiscard]] double median(std::vector<double> values);
/// Resident memory of this process in KiB, now.
[[nodiscard]] std::size_t residentKiB();
/// Prints one row of the table.
void print(const Comparison& comparison);

/// Ends the program with a message: a benchmark whose result is wrong measures nothing.
void require(bool condition, const char* what);

void runListingBenchmarks(const Scale& scale);
void runPagesBenchmarks(const Scale& scale);

}  // namespace mirabel::bench
