#pragma once

#include <cstddef>
#include <functional>

namespace mirabel {

/// Runs `work(begin, end)` over pieces of `size` indices that together make 0..`count`, on the
/// calling thread and one borrowed from the process's pool, and returns when all is done. The
/// caller waits for no thread to become free: it does what is left by itself.
void splitWork(std::size_t count, std::size_t size,
               const std::function<void(std::size_t begin, std::size_t end)>& work);

}  // namespace mirabel
