#pragma once

#include <string>
#include <vector>

namespace mirabel::bench {

/// What this program does as a child of itself, where a process of its own is to be measured.
/// Each role says "ready" on standard output, then does one piece of work for each line on standard
/// input and answers with a line, until the input ends.
///
///   hold HOME                holds the open, following index; a line brings it in step: the number
///                            of the last event
///   drain FOLDER             a bare reader of the kernel's queue, with a mark on each folder; a
///                            line drains it: the number of records so far
///   write FOLDER FOLDERS FILES  a line has each file written over: the seconds that it took
///   serve HOME               serves it on the session bus until the input ends
///   list HOME FILES           a line has everything listed: resident KiB after the first tenth of
///                            the items, and at the end
///
/// Answers the exit status.
[[nodiscard]] int runRole(const std::vector<std::string>& arguments);

}  // namespace mirabel::bench
