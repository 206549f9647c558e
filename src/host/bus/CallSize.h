#pragma once

#include <cstddef>
#include <sdbus-c++/Message.h>

namespace mirabel::bus {

/// About how many bytes the arguments of a call keep as long as it waits. It is looked no further
/// when they are more than `most`, so that a large one costs little. They are read from the first
/// again.
[[nodiscard]] std::size_t sizeOfArguments(sdbus::Message& call, std::size_t most);

}  // namespace mirabel::bus
