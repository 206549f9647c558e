#include "convergence/Scenario.h"

#include <filesystem>
#include <memory>
#include <random>

#include "cli/Printing.h"
#include "cli/Running.h"
#include "convergence/Host.h"
#include "convergence/RandomApplications.h"
#include "convergence/RandomTree.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

constexpr int mostShrinkingRuns = 300;

/// What a client holds wrongly; empty when it holds what a fresh listing shows.
std::string difference(const Replica& replica, const Replica& fresh) {
  for (const auto& [identifier, item] : fresh.items) {
    const auto held = replica.items.find(identifier);
    if (held == replica.items.end()) {
      return replica.container + ": " + identifier + " " + item.filename + " was not told";
    }
    if (held->second == item) continue;
    return replica.container + ": " + identifier + " is held as " + held->second.filename + " in " +
           held->second.parent + " " + held->second.text + "\nand is " + item.filename + " in " +
           item.parent + " " + item.text;
  }
  for (const auto& [identifier, item] : replica.items) {
    if (!fresh.items.contains(identifier)) {
      return replica.container + ": " + identifier + " " + item.filename +
             " is gone and was not told";
    }
  }
  return {};
}

class Run {
 public:
  Run()
      : outside_(home_.path() + "/outside"),
        applications_(home_.path()),
        tree_(
            home_.documents(), applications_.libraries(),
            [this](const std::string& library) { return applications_.isInstalled(library); },
            outside_, 0) {
    std::filesystem::create_directory(outside_);
    home_.makeFolder("watched");
    open();
    watched_ = host_->identifierOf(home_.at("watched"));
    for (const std::string& container :
         {std::string(VesselWorkingSetContainerItemIdentifier),
          std::string(VesselAllDirectoriesContainerItemIdentifier),
          std::string(VesselRootContainerItemIdentifier), watched_}) {
      replicas_.push_back(host_->list(container));
    }
    tree_.noteFollowed();
  }

  ~Run() {
    host_.reset();
    RandomTree::openAll(home_.path());
  }
  Run(const Run&) = delete;
  Run& operator=(const Run&) = delete;

  /// False when the sequence has failed.
  bool make(const Step& step) {
    tree_.reseed(step.seed);
    switch (step.kind) {
      case Step::Kind::change:
        tell(tree_.change());
        return true;
      case Step::Kind::install:
        tell(applications_.change(tree_));
        return true;
      case Step::Kind::restart:
        tell("restart");
        host_.reset();
        for (std::size_t damages = tree_.pick(3); damages > 0; --damages)
          tell("  " + applications_.damage(tree_));
        open();
        return true;
      case Step::Kind::kill:
        kill();
        return true;
      case Step::Kind::drop:
        tell("drop");
        host_->dropRecords();
        return true;
      case Step::Kind::catchUp:
        return catchUp();
    }
    return true;
  }

  Outcome outcome;

 private:
  void open() { host_ = std::make_unique<Host>(home_.path()); }
  void tell(const std::string& what) { outcome.story += "\n  " + what; }

  void kill() {
    tell("killed while it catches up:");
    host_.reset();
    {
      const Running follower({MIRABEL_PROGRAM, "--home", home_.path(), "changes", "--since",
                              base64(stringView(replicas_.front().anchor)), "workingset"});
      for (std::size_t changes = tree_.pick(40); changes > 0; --changes)
        tell("  " + tree_.change());
    }
    open();
  }

  bool catchUp() {
    tree_.makeUnheardHeard();
    // As whoever hears of applications does. Until then an app library whose folder is gone is
    // left out of listings, and its going is not told yet.
    host_->refreshAppLibraries();
    for (Replica& replica : replicas_) {
      if (replica.container == watched_ && !isWatchedListed()) continue;
      const int before = replica.restarts;
      host_->catchUp(replica);
      ++outcome.catchUps;
      outcome.startedOver += replica.restarts - before;
      outcome.failure = difference(replica, host_->list(replica.container));
      if (!outcome.failure.empty()) return false;
    }
    tree_.noteFollowed();
    tell("caught up");
    return true;
  }

  // A folder that is gone or out of sight is nobody's container any more, and one that is closed
  // can't be listed.
  bool isWatchedListed() const {
    const std::string folder = home_.at("watched");
    return host_->identifierOf(folder) == watched_ && RandomTree::isOpen(folder);
  }

  TempHome home_;
  std::string outside_;
  RandomApplications applications_;
  RandomTree tree_;
  std::unique_ptr<Host> host_;
  std::string watched_;
  std::vector<Replica> replicas_;
};

}  // namespace

std::vector<Step> stepsOf(unsigned seed) {
  std::mt19937 random(seed);
  const auto pick = [&](unsigned n) { return static_cast<unsigned>(random() % n); };
  std::vector<Step> steps;
  const auto add = [&](Step::Kind kind) { steps.push_back({kind, pick(1u << 31)}); };
  for (int i = 0; i < 25; ++i)
    add(Step::Kind::change);
  for (int round = 0; round < 8; ++round) {
    for (unsigned changes = 1 + pick(12); changes > 0; --changes)
      add(pick(10) == 0 ? Step::Kind::install : Step::Kind::change);
    const unsigned interruption = pick(12);
    if (interruption < 3) add(Step::Kind::restart);
    if (interruption == 3) add(Step::Kind::kill);
    if (interruption == 4) add(Step::Kind::drop);
    add(Step::Kind::catchUp);
  }
  return steps;
}

Outcome run(const std::vector<Step>& steps) {
  Run sequence;
  for (const Step& step : steps) {
    if (!sequence.make(step)) break;
  }
  return sequence.outcome;
}

// Leaves out ever smaller pieces as long as what is left fails.
std::vector<Step> shrink(std::vector<Step> steps) {
  int runs = 0;
  for (std::size_t piece = steps.size() / 2; piece > 0; piece /= 2) {
    for (std::size_t at = 0; at + piece <= steps.size() && runs < mostShrinkingRuns;) {
      std::vector<Step> fewer = steps;
      const auto begin = fewer.begin() + static_cast<std::ptrdiff_t>(at);
      fewer.erase(begin, begin + static_cast<std::ptrdiff_t>(piece));
      ++runs;
      if (run(fewer).failure.empty()) {
        at += piece;
      } else {
        steps = std::move(fewer);
      }
    }
  }
  return steps;
}

}  // namespace mirabel::testing
