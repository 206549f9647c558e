#include "BenchHome.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <fstream>
#include <unistd.h>

namespace mirabel::bench {

namespace fs = std::filesystem;

BenchHome::BenchHome() {
  const char* given = std::getenv("MIRABEL_BENCH_DIR");
  std::string pattern =
      (given != nullptr ? fs::path(given) : fs::temp_directory_path()) / "mirabel-bench-XXXXXX";
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
  std::ifstream status("/proc/self/statm");
  std::size_t total = 0;
  std::size_t resident = 0;
  status >> total >> resident;
  return resident * static_cast<std::size_t>(::sysconf(_SC_PAGESIZE)) / 1024;
}

void print(const Comparison& comparison) {
  std::vector<double> ratios;
  for (std::size_t i = 0; i < comparison.ours.size(); ++i) {
    ratios.push_back(comparison.ours[i] / comparison.reference[i]);
  }
  const double ratio = median(ratios);
  std::printf("%-52s %9.1f ms %9.1f ms   %5.2f  (at most %.1f)%s\n", comparison.name.c_str(),
              1000 * median(comparison.ours), 1000 * median(comparison.reference), ratio,
              comparison.target, ratio <= comparison.target ? "" : "  MISSED");
  std::fflush(stdout);
}

void require(bool condition, const char* what) {
  if (condition) return;
  std::fprintf(stderr, "benchmark: it does not hold that %s\n", what);
  std::exit(1);
}

}  // namespace mirabel::bench
