#include "foundation/SplitWork.h"

#include <algorithm>
#include <atomic>
#include <memory>

#include "foundation/ThreadPool.h"

namespace mirabel {
namespace {

// Outlives the caller's frame: the borrowed thread may come when everything is done already, and
// then looks at `next` only.
struct Progress {
  std::size_t pieces;
  std::atomic<std::size_t> next{0};
  std::atomic<std::size_t> done{0};
};

template <class Piece>
void takePieces(Progress& progress, const Piece& runPiece) {
  while (true) {
    const std::size_t piece = progress.next.fetch_add(1, std::memory_order_relaxed);
    if (piece >= progress.pieces) return;
    runPiece(piece);
    if (progress.done.fetch_add(1, std::memory_order_acq_rel) + 1 == progress.pieces) {
      progress.done.notify_all();
    }
  }
}

}  // namespace

void splitWork(std::size_t count, std::size_t size,
               const std::function<void(std::size_t, std::size_t)>& work) {
  const auto progress = std::make_shared<Progress>((count + size - 1) / size);
  // `work` is touched only for a piece that was taken, and the caller stays until all are done.
  const auto runPiece = [&work, count, size](std::size_t piece) {
    work(piece * size, std::min(count, (piece + 1) * size));
  };
  if (progress->pieces > 1) {
    ThreadPool::shared().submit([progress, runPiece] { takePieces(*progress, runPiece); });
  }
  takePieces(*progress, runPiece);
  for (std::size_t done = progress->done.load(std::memory_order_acquire); done < progress->pieces;
       done = progress->done.load(std::memory_order_acquire)) {
    progress->done.wait(done, std::memory_order_acquire);
  }
}

}  // namespace mirabel
