// A client that lists a container once and then applies every change that it is handed holds
// exactly what a fresh listing shows. Compared are all properties of an item. Left out: hard
// links, of which a listing may show several names.
#include <cstdlib>
#include <filesystem>
#include <gtest/gtest.h>
#include <random>

#include "convergence/Host.h"
#include "convergence/RandomTree.h"
#include "support/LogCapture.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

class Convergence : public ::testing::TestWithParam<int> {
 protected:
  // What led to a difference, newest last.
  std::string story() const {
    std::string text;
    for (const std::string& step : steps_)
      text += "\n  " + step;
    return text;
  }

  void expectEqual(const Replica& replica, const Replica& fresh) {
    for (const auto& [identifier, item] : fresh.items) {
      const auto held = replica.items.find(identifier);
      if (held == replica.items.end()) {
        ADD_FAILURE() << replica.container << ": " << identifier << " " << item.filename
                      << " was not told after" << story();
        return;
      }
      if (held->second == item) continue;
      ADD_FAILURE() << replica.container << ": " << identifier << " is held as "
                    << held->second.filename << " in " << held->second.parent << " "
                    << held->second.text << "\nand is " << item.filename << " in " << item.parent
                    << " " << item.text << "\nafter" << story();
      return;
    }
    for (const auto& [identifier, item] : replica.items) {
      if (fresh.items.contains(identifier)) continue;
      ADD_FAILURE() << replica.container << ": " << identifier << " " << item.filename
                    << " is gone and was not told after" << story();
      return;
    }
  }

  const LogCapture quiet_;
  TempHome home_;
  std::vector<std::string> steps_;
};

TEST_P(Convergence, AReplicaEqualsAFreshListing) {
  const char* given = std::getenv("MIRABEL_TEST_SEED");
  const unsigned seed =
      given != nullptr ? static_cast<unsigned>(std::stoul(given)) : std::random_device{}();
  SCOPED_TRACE("MIRABEL_TEST_SEED=" + std::to_string(seed));
  const std::string outside = home_.path() + "/outside";
  std::filesystem::create_directory(outside);
  home_.makeFolder("watched");
  RandomTree tree(home_.documents(), outside, seed);
  for (int i = 0; i < 25; ++i)
    tree.change();

  auto host = std::make_unique<Host>(home_.path());
  if (!std::filesystem::is_directory(home_.at("watched"))) home_.makeFolder("watched");
  const std::string watched = host->identifierOf(home_.at("watched"));
  std::vector<Replica> replicas;
  for (const std::string& container : {std::string(VesselWorkingSetContainerItemIdentifier),
                                       std::string(VesselAllDirectoriesContainerItemIdentifier),
                                       std::string(VesselRootContainerItemIdentifier), watched}) {
    replicas.push_back(host->list(container));
  }
  for (int round = 0; round < 8 && !HasFailure(); ++round) {
    const std::size_t changes = 1 + tree.pick(12);
    for (std::size_t i = 0; i < changes; ++i)
      steps_.push_back(tree.change());
    if (tree.pick(2) == 0) {
      host.reset();
      host = std::make_unique<Host>(home_.path());
      steps_.emplace_back("restart");
    }
    for (Replica& replica : replicas) {
      // A folder that is gone or out of sight is nobody's container any more.
      if (replica.container == watched && host->identifierOf(home_.at("watched")) != watched) {
        continue;
      }
      host->catchUp(replica);
      expectEqual(replica, host->list(replica.container));
      EXPECT_EQ(replica.restarts, 0) << "nothing was lost";
    }
    steps_.emplace_back("caught up");
  }
}

INSTANTIATE_TEST_SUITE_P(Sequences, Convergence, ::testing::Range(0, 20));

}  // namespace
}  // namespace mirabel::testing
