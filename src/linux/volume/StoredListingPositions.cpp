#include "linux/volume/StoredListingPositions.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "linux/kernel/FileReplacement.h"

namespace mirabel {
namespace {

constexpr const char* listingsFile = "listings";

}  // namespace

Result<void> StoredListingPositions::keep(std::string_view container, const Data& cursor,
                                          const Data& position) {
  const std::scoped_lock lock(mutex_);
  if (container.size() + cursor.size() + position.size() > slotSize - ListingSlot::headerSize) {
    return fail(Error::posix(EMSGSIZE));
  }
  load();
  if (!file_) {
    if (auto made = make(); !made) return made;
  }
  Slot& slot = slotFor(container, cursor);
  // Whatever becomes of the write, what was in the slot is gone.
  slot = {};
  Slot kept{++lastNumber_, std::string(container), cursor, position};
  const auto at = (&slot - slots_.data()) * static_cast<std::int64_t>(slotSize);
  if (auto written = writeAllAt(file_.get(), stringView(kept.encode()), at); !written)
    return written;
  if (::fdatasync(file_.get()) != 0) return fail(Error::posix(errno, folder_.file(listingsFile)));
  slot = std::move(kept);
  return {};
}

std::optional<Data> StoredListingPositions::find(std::string_view container, const Data& cursor) {
  const std::scoped_lock lock(mutex_);
  load();
  const auto found = std::ranges::find_if(slots_, [&](const Slot& slot) {
    return slot.number != 0 && slot.container == container && slot.cursor == cursor;
  });
  if (found == slots_.end()) return std::nullopt;
  return found->position;
}

/// A file that is not there, or not of this size, holds nothing and is made anew when it is needed.
void StoredListingPositions::load() {
  if (std::exchange(isLoaded_, true)) return;
  UniqueFd file(::openat(folder_.descriptor(), listingsFile, O_RDWR | O_NOFOLLOW | O_CLOEXEC));
  struct stat status {};
  if (!file || ::fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode) ||
      status.st_size != static_cast<off_t>(slotCount * slotSize)) {
    return;
  }
  Data bytes(slotSize);
  for (std::size_t i = 0; i < slotCount; ++i) {
    const ssize_t count =
        ::pread(file.get(), bytes.data(), slotSize, static_cast<off_t>(i * slotSize));
    if (count != static_cast<ssize_t>(slotSize)) continue;
    // A free slot where the bytes are none that were written whole.
    slots_[i] = ListingSlot::decode(bytes).value_or(Slot());
    lastNumber_ = std::max(lastNumber_, slots_[i].number);
  }
  file_ = std::move(file);
}

/// Filled with zeros, so that writing a slot changes no more than its bytes.
Result<void> StoredListingPositions::make() {
  const auto failure = [&] { return fail(Error::posix(errno, folder_.file(listingsFile))); };
  const int directory = folder_.descriptor();
  if (::unlinkat(directory, listingsFile, 0) != 0 && errno != ENOENT) return failure();
  UniqueFd file(
      ::openat(directory, listingsFile, O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600));
  if (!file) return failure();
  if (auto written = writeAllAt(file.get(), std::string(slotCount * slotSize, '\0'), 0); !written)
    return written;
  if (::fsync(file.get()) != 0 || ::fsync(directory) != 0) return failure();
  file_ = std::move(file);
  return {};
}

/// The one of the same cursor, else a free one, else the oldest: of this container where that has
/// enough, or of all.
StoredListingPositions::Slot& StoredListingPositions::slotFor(std::string_view container,
                                                              const Data& cursor) {
  const auto isOfIt = [&](const Slot& slot) {
    return slot.number != 0 && slot.container == container;
  };
  for (Slot& slot : slots_)
    if (isOfIt(slot) && slot.cursor == cursor) return slot;
  const bool hasEnough =
      std::ranges::count_if(slots_, isOfIt) >= static_cast<std::ptrdiff_t>(mostOfOne);
  Slot* oldest = nullptr;
  for (Slot& slot : slots_) {
    if (hasEnough && !isOfIt(slot)) continue;
    if (oldest == nullptr || slot.number < oldest->number) oldest = &slot;
  }
  return *oldest;
}

}  // namespace mirabel
