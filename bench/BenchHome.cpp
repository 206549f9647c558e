#include "BenchHome.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <fstream>
#include <unistd.h>

namespace mirabel::bench {

namespace fs = std::filesystem;

namespace {

constexpr const char* memoryFolder = "/dev/shm";

fs::path parentFolder(BenchHome::Where where) {
  const char* given = std::getenv("MIRABEL_BENCH_DIR");
  if (given != nullptr) return given;
  const bool isInMemory = where == BenchHome::Where::memory && fs::is_directory(memoryFolder);
  return isInMemory ? memoryFolder : fs::temp_directory_path();
}

std::string text(double value, Unit unit) {
  std::array<char, 32> buffer;
  switch (unit) {
    case Unit::seconds:
      std::snprintf(buffer.data(), buffer.size(), "%.2f ms", 1000 * value);
      break;
    case Unit::kibibytes:
      std::snprintf(buffer.data(), buffer.size(), "%.0f KiB", value);
      break;
    case Unit::perSecond:
      std::snprintf(buffer.data(), buffer.size(), "%.0f /s", value);
      break;
  }
  return buffer.data();
}

}  // namespace

BenchHome::BenchHome(Where where) {
  std::string pattern = parentFolder(where) / "mirabel-bench-XXXXXX";
  require(::mkdtemp(pattern.data()) != nullptr, "a temporary home can be made");
  path_ = fs::canonical(pattern);
  fs::create_directory(documents());
}

BenchHome::~BenchHome() {
  std::error_code ignored;
  fs::remove_all(path_, ignored);
}

std::string BenchHome::makeFolder(const std::string& name, std::size_t files) const {
  const std::string folder = documents() + "/" + name;
  fs::create_directory(folder);
  for (std::size_t i = 0; i < files; ++i) {
    const std::string file = folder + "/document " + std::to_string(i) + ".txt";
    const int fd = ::open(file.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
    require(fd >= 0, "a file can be made");
    ::close(fd);
  }
  return folder;
}

void BenchHome::forgetState() const {
  fs::remove_all(path_ + "/.local");
}

double secondsOf(const std::function<void()>& work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

double median(std::vector<double> values) {
  std::ranges::sort(values);
  return values[values.size() / 2];
}

std::size_t residentKiB() {
  return residentKiB(::getpid());
}

std::size_t residentKiB(pid_t process) {
  std::ifstream status("/proc/" + std::to_string(process) + "/statm");
  std::size_t total = 0;
  std::size_t resident = 0;
  status >> total >> resident;
  return resident * static_cast<std::size_t>(::sysconf(_SC_PAGESIZE)) / 1024;
}

void printHeading(const std::string& text) {
  std::printf("%s\n%-54s %14s %14s   %s\n", text.c_str(), "", "ours", "reference", "ratio");
}

void print(const Comparison& comparison) {
  std::vector<double> ratios;
  for (std::size_t i = 0; i < comparison.ours.size(); ++i) {
    ratios.push_back(comparison.ours[i] / comparison.reference[i]);
  }
  const double ratio = median(ratios);
  std::printf("%-54s %14s %14s   %5.2f", comparison.name.c_str(),
              text(median(comparison.ours), comparison.unit).c_str(),
              text(median(comparison.reference), comparison.unit).c_str(), ratio);
  if (comparison.target) {
    const bool isAtMost = comparison.bound == Bound::atMost;
    const bool holds = isAtMost ? ratio <= *comparison.target : ratio >= *comparison.target;
    std::printf("  (%s %.2f)%s", isAtMost ? "at most" : "at least", *comparison.target,
                holds ? "" : "  MISSED");
  }
  std::printf("\n");
  std::fflush(stdout);
}

void require(bool condition, const char* what) {
  if (!condition) throw Failure{what};
}

}  // namespace mirabel::bench
