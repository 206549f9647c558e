// A tree of 100,000 files in 5,000 folders: what it costs to know what has changed in it. Beside
// watchman, where that is installed, on an equal tree of its own, so that neither hears of what the
// other leaves behind; and beside the system calls that following cannot do without.
#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <memory>
#include <optional>
#include <sstream>
#include <thread>

#include "BenchHome.h"
#include "BenchTree.h"
#include "ChildProcess.h"
#include "Following.h"
#include "Watchman.h"

namespace mirabel::bench {
namespace {

constexpr std::size_t filesPerFolder = 20;
constexpr std::size_t manyChanges = 10'000;
constexpr int roundsOfOne = 41;
constexpr const char* firstIndexRow = "first index / watchman's crawl";
constexpr const char* ingestRow = "events into index and journal / kernel's queue alone";
constexpr const char* slowdownRow = "a program that writes, followed / not";
constexpr const char* memoryRow = "memory of a following index / watchman";
// Between two changes both sides come to rest: what is measured is the first question.
constexpr std::chrono::milliseconds rest{60};

/// A home with the tree for ours, and one for watchman.
class Trees {
 public:
  explicit Trees(const Scale& scale)
      : tree_(ours_.documents(), scale.files / filesPerFolder, scale.files),
        other_(theirs_.documents(), scale.files / filesPerFolder, scale.files) {
    tree_.make();
    other_.make();
    entries_ = plainPass(tree_.root());
    require(entries_ == tree_.files() + tree_.folders(), "the tree holds its files");
  }

  [[nodiscard]] const BenchHome& home() const { return ours_; }
  [[nodiscard]] const BenchTree& tree() const { return tree_; }
  [[nodiscard]] const BenchTree& other() const { return other_; }
  [[nodiscard]] std::size_t entries() const { return entries_; }
  /// Null, with a word, where there is none.
  [[nodiscard]] std::unique_ptr<Watchman> watchman(const std::string& row) const {
    auto started = Watchman::start(theirs_.path() + "/watchman");
    if (!started) std::printf("%-54s left out: watchman is not installed\n", row.c_str());
    return started;
  }

 private:
  BenchHome ours_{BenchHome::Where::memory};
  BenchHome theirs_{BenchHome::Where::memory};
  BenchTree tree_;
  BenchTree other_;
  std::size_t entries_ = 0;
};

void benchFirstIndex(const Trees& trees, const Scale& scale) {
  Comparison comparison{firstIndexRow, {}, {}, 0.5};
  if (!scale.includes(comparison.name)) return;
  for (int round = 0; round < scale.rounds; ++round) {
    trees.home().forgetState();
    std::optional<OpenIndex> index;
    comparison.ours.push_back(secondsOf([&] {
      index.emplace(trees.home().path(), Marks::wanted);
      index->sync();
    }));
    require(index->isFollowing(), "changes are heard of");
    index.reset();
    const auto watchman = trees.watchman(comparison.name);
    if (!watchman) return;
    comparison.reference.push_back(secondsOf([&] { watchman->watch(trees.other().root()); }));
  }
  print(comparison);
}

std::string restartRow(Marks marks) {
  return std::string("comparing after a restart, ") +
         (marks == Marks::wanted ? "with" : "without") + " marks / plain pass";
}

void benchRestart(const Trees& trees, Marks marks, const Scale& scale) {
  Comparison comparison{restartRow(marks), {}, {}, 1.5};
  if (!scale.includes(comparison.name)) return;
  OpenIndex(trees.home().path(), marks).sync();
  for (int round = 0; round < scale.rounds; ++round) {
    const OpenIndex index(trees.home().path(), marks);
    comparison.reference.push_back(secondsOf([&] {
      require(plainPass(trees.tree().root()) == trees.entries(), "everything is passed");
    }));
    comparison.ours.push_back(secondsOf([&] { index.sync(); }));
  }
  print(comparison);
}

/// How many files change before somebody asks, and how often that is done.
struct Burst {
  const char* name;
  std::size_t files;
  int rounds;
};

/// `ask` answers how many changes there were.
void benchSince(const Trees& trees, const std::string& row, const Burst& burst,
                const std::function<std::size_t()>& ask) {
  Comparison comparison{row, {}, {}, 0.5};
  const auto watchman = trees.watchman(row);
  if (!watchman) return;
  watchman->watch(trees.other().root());
  ask();
  for (int round = 0; round < burst.rounds; ++round) {
    const auto change = [&](const BenchTree& tree) {
      std::this_thread::sleep_for(rest);
      for (std::size_t i = 0; i < burst.files; ++i)
        tree.rewrite((static_cast<std::size_t>(round) + i) % tree.files());
    };
    std::size_t told = 0;
    change(trees.tree());
    comparison.ours.push_back(secondsOf([&] { told = ask(); }));
    require(told >= burst.files, "we tell each change");
    std::string answer;
    change(trees.other());
    comparison.reference.push_back(secondsOf([&] { answer = watchman->changes(); }));
    require(watchman->take(answer) >= burst.files, "watchman tells each change");
  }
  print(comparison);
}

std::array<Burst, 2> bursts(const Scale& scale) {
  return {Burst{"1 change", 1, scale.rounds == 1 ? 3 : roundsOfOne},
          Burst{"10,000 changes", std::min(manyChanges, scale.files), scale.rounds}};
}

std::string sinceRow(const Burst& burst, const char* what) {
  return std::string("since, after ") + burst.name + ", " + what + " / watchman";
}

void benchIndexSince(const Trees& trees, const Scale& scale) {
  for (const Burst& burst : bursts(scale)) {
    const std::string row = sinceRow(burst, "index");
    if (!scale.includes(row)) continue;
    const OpenIndex index(trees.home().path(), Marks::wanted);
    std::uint64_t since = index.sync();
    benchSince(trees, row, burst, [&] {
      index.sync();
      return index.read(since);
    });
  }
}

void benchProviderSince(const Trees& trees, const Scale& scale) {
  for (const Burst& burst : bursts(scale)) {
    const std::string row = sinceRow(burst, "client");
    if (!scale.includes(row)) continue;
    const OpenProvider provider(trees.home().path());
    Data anchor = provider.anchor();
    benchSince(trees, row, burst, [&] { return provider.changes(anchor); });
  }
}

/// One run of the writer, while somebody listens or nobody does.
struct WriterRun {
  double writing = 0;  ///< seconds that the writer took
  double heard = 0;    ///< seconds until the listener had heard of all of it
  std::size_t events = 0;
};

WriterRun runWriter(const BenchTree& tree, const ChildProcess* listener) {
  const ChildProcess writer(ChildProcess::role(
      {"write", tree.root(), std::to_string(tree.folders()), std::to_string(tree.files())}));
  require(writer.hear() == "ready", "the writer starts");
  WriterRun run;
  const auto sync = [&] {
    listener->tell("sync");
    return std::stoul(listener->hear());
  };
  const std::size_t before = listener != nullptr ? sync() : 0;
  run.heard = secondsOf([&] {
    writer.tell("go");
    run.writing = std::stod(writer.hear());
    if (listener != nullptr) run.events = sync() - before;
  });
  if (listener != nullptr) require(run.events >= tree.files(), "the listener hears of each file");
  return run;
}

void benchIngest(const Trees& trees, const Scale& scale) {
  const BenchTree& tree = trees.tree();
  Comparison ingest{ingestRow, {}, {}, 0.6, Unit::perSecond, Bound::atLeast};
  Comparison slowdown{slowdownRow, {}, {}, 1.15};
  if (!scale.includes(ingest.name) && !scale.includes(slowdown.name)) return;
  const auto perSecond = [&](const WriterRun& run) {
    return static_cast<double>(tree.files()) / run.heard;
  };
  std::vector<double> bareWriting;
  for (int round = 0; round < scale.rounds; ++round) {
    slowdown.reference.push_back(runWriter(tree, nullptr).writing);
    for (const char* role : {"drain", "hold"}) {
      const bool isOurs = std::string_view(role) == "hold";
      const ChildProcess listener(
          ChildProcess::role({role, isOurs ? trees.home().path() : tree.root()}));
      require(listener.hear() == "ready", "the listener starts");
      const WriterRun run = runWriter(tree, &listener);
      (isOurs ? ingest.ours : ingest.reference).push_back(perSecond(run));
      (isOurs ? slowdown.ours : bareWriting).push_back(run.writing);
    }
  }
  print(ingest);
  print(slowdown);
  std::printf("%-54s %11.2f ms\n", "  the same, with the kernel's queue drained alone",
              1000 * median(bareWriting));
}

void benchMemory(const Trees& trees, const Scale& scale) {
  Comparison comparison{memoryRow, {}, {}, 0.25, Unit::kibibytes};
  if (!scale.includes(comparison.name)) return;
  const auto watchman = trees.watchman(comparison.name);
  if (!watchman) return;
  trees.home().forgetState();
  watchman->watch(trees.other().root());
  const ChildProcess holder(ChildProcess::role({"hold", trees.home().path()}));
  require(holder.hear() == "ready", "the index is held");
  comparison.ours.push_back(static_cast<double>(residentKiB(holder.id())));
  comparison.reference.push_back(static_cast<double>(residentKiB(watchman->process())));
  print(comparison);
}

void runOnTree(const Scale& scale) {
  const Trees trees(scale);
  printHeading(std::to_string(trees.tree().files()) + " files in " +
               std::to_string(trees.tree().folders()) + " folders, median of " +
               std::to_string(scale.rounds) + " rounds");
  benchFirstIndex(trees, scale);
  benchRestart(trees, Marks::wanted, scale);
  benchRestart(trees, Marks::unwanted, scale);
  benchIndexSince(trees, scale);
  benchProviderSince(trees, scale);
  benchIngest(trees, scale);
  benchMemory(trees, scale);
}

void benchLargeListing(const Scale& scale) {
  const std::size_t files = 10 * scale.files;
  Comparison comparison{
      "memory, all of " + std::to_string(files) + " files listed / a tenth of them",
      {},
      {},
      1.1,
      Unit::kibibytes};
  if (!scale.includes(comparison.name)) return;
  const BenchHome home(BenchHome::Where::memory);
  BenchTree(home.documents(), scale.files / filesPerFolder, files).make();
  const ChildProcess lister(ChildProcess::role({"list", home.path(), std::to_string(files)}));
  require(lister.hear() == "ready", "the provider opens");
  lister.tell("list");
  std::istringstream answer(lister.hear());
  double early = 0;
  double late = 0;
  require(static_cast<bool>(answer >> early >> late), "everything is listed");
  comparison.ours.push_back(late);
  comparison.reference.push_back(early);
  print(comparison);
}

}  // namespace

void runFollowingBenchmarks(const Scale& scale) {
  if (scale.includesAny({firstIndexRow, restartRow(Marks::wanted), restartRow(Marks::unwanted),
                         sinceRow(bursts(scale)[0], "index"), sinceRow(bursts(scale)[1], "index"),
                         sinceRow(bursts(scale)[0], "client"), sinceRow(bursts(scale)[1], "client"),
                         ingestRow, slowdownRow, memoryRow})) {
    runOnTree(scale);
  }
  benchLargeListing(scale);
}

}  // namespace mirabel::bench
