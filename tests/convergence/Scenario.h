#pragma once

#include <string>
#include <vector>

namespace mirabel::testing {

/// One thing that happens to a home and to those who follow it. What a change is comes from its
/// seed and from what the tree then is, so that a step means something whichever were left out
/// before it.
struct Step {
  enum class Kind {
    change,   ///< to the tree, while the host runs
    install,  ///< applications come, go or change
    restart,  ///< the host ends in order and starts again
    kill,     ///< a process that catches up is killed while the tree is changed
    drop,     ///< the kernel's queue loses what it holds
    catchUp,  ///< the clients ask for changes, and must then hold what a fresh listing shows
  };
  Kind kind = Kind::change;
  unsigned seed = 0;
};

/// Steps of a random sequence, the same for the same seed.
std::vector<Step> stepsOf(unsigned seed);

struct Outcome {
  std::string failure;  ///< empty: every client held what it should
  std::string story;    ///< what led there, a line for each step
  int catchUps = 0;
  int startedOver = 0;  ///< of them those that were told to list again
};

/// Makes the steps in a home of their own, with clients of the working set, all directories, the
/// root and a folder. Several may run at a time, each on a thread.
Outcome run(const std::vector<Step>& steps);

/// The steps that are still needed for a failure; those of a failing sequence are given.
std::vector<Step> shrink(std::vector<Step> steps);

}  // namespace mirabel::testing
