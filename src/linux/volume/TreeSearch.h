#pragma once

#include <cstdint>
#include <functional>
#include <set>
#include <string>

#include "linux/kernel/MonitoredRoots.h"
#include "mirabel/Error.h"

namespace mirabel {

/// An entry that bears an inode number which was asked for. It may be another object that was
/// given the number since: the caller compares.
struct Candidate {
  std::string folderPath;
  int folder;  ///< open on `folderPath`; valid during the call
  std::string name;
  std::uint64_t inode;
};

/// Told of each candidate; answers whether it was the object, which is then no longer looked for.
using CandidateVisitor = std::function<Result<bool>(const Candidate&)>;

/// Looks through one folder, or through everything below the roots, for entries with the inode
/// numbers in `wanted`; those found are taken out of it. Costs a reading of directories, not a
/// look at each file. Unreadable folders and other file systems are passed over. Ends early when
/// nothing is wanted any more. Errors: the visitor's, and the passing ones of a look, see
/// `LookFailure`.
[[nodiscard]] Result<void> searchFolder(const MonitoredRoots& roots, const std::string& folderPath,
                                        std::set<std::uint64_t>& wanted,
                                        const CandidateVisitor& visitor);
[[nodiscard]] Result<void> searchRoots(const MonitoredRoots& roots, std::set<std::uint64_t>& wanted,
                                       const CandidateVisitor& visitor);

}  // namespace mirabel
