#include <cstdio>
#include <string_view>

#include "BenchHome.h"

int main(int count, char** arguments) {
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
  return 0;
}
