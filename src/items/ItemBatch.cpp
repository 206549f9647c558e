#include "items/ItemBatch.h"

#include "foundation/SplitWork.h"

namespace mirabel {
namespace {

// Handing work to another thread costs as much as a few items.
constexpr std::size_t pieceSize = 32;

}  // namespace

Result<std::vector<std::shared_ptr<LocalItem>>> makeItems(const ItemContext& context,
                                                          std::span<const URL> urls) {
  if (auto fetched = context.platform.resources.prefetch(urls); !fetched) {
    return fail(fetched.error());
  }
  std::vector<std::shared_ptr<LocalItem>> items(urls.size());
  splitWork(urls.size(), pieceSize, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i)
      items[i] = LocalItem::create(context, urls[i]);
  });
  return items;
}

}  // namespace mirabel
