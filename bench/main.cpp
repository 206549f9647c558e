#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

#include "BenchHome.h"
#include "Roles.h"

namespace {

int run(int count, char** arguments) {
  if (count > 2 && std::string_view(arguments[1]) == "--role") {
    return mirabel::bench::runRole({arguments + 2, arguments + count});
  }
  mirabel::bench::Scale scale;
  for (int i = 1; i < count; ++i) {
    if (std::string_view(arguments[i]) == "--short") {
      scale.files = 5'000;
      scale.rounds = 1;
    } else if (std::string_view(arguments[i]) == "--only" && i + 1 < count) {
      scale.only = arguments[++i];
    } else {
      std::fprintf(stderr, "usage: mirabel_bench [--short] [--only PART-OF-A-NAME]\n");
      return 2;
    }
  }
  mirabel::bench::runListingBenchmarks(scale);
  mirabel::bench::runPagesBenchmarks(scale);
  mirabel::bench::runFollowingBenchmarks(scale);
  mirabel::bench::runOperationBenchmarks(scale);
  mirabel::bench::runApplicationsBenchmarks(scale);
  mirabel::bench::runServiceBenchmarks(scale);
  mirabel::bench::runSearchBenchmarks(scale);
  return 0;
}

}  // namespace

int main(int count, char** arguments) {
  try {
    return run(count, arguments);
  } catch (const mirabel::bench::Failure& failure) {
    std::fprintf(stderr, "benchmark: it does not hold that %s\n", failure.what);
    return 1;
  }
}
