#include "linux/volume/IdentifierAllocator.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <limits>
#include <utility>

namespace mirabel {
namespace {

// Large enough that writing the witness costs nothing per ID, small enough that losing the rest
// of a block with the database does not matter.
constexpr std::uint64_t documentBlock = 1u << 16;
constexpr std::uint64_t fileBlock = 1u << 20;
constexpr std::uint64_t documentEnd = std::uint64_t{1} << 32;
constexpr std::uint64_t fileEnd = std::uint64_t{1} << 63;

// A sixteenth of what is left, and as much again at random, so that two leaps from the same place
// do not meet.
std::uint64_t leapt(std::uint64_t from, std::uint64_t end, const UUID& random, std::size_t at) {
  const std::uint64_t part = (end - std::min(from, end)) / 16;
  std::uint32_t number = 0;
  std::memcpy(&number, random.bytes.data() + at, sizeof number);
  return from + part + static_cast<std::uint64_t>(static_cast<double>(part) * number / 0x1p32);
}

}  // namespace

Result<IdentifierAllocator> IdentifierAllocator::open(IdentityStore& store, Witness& witness,
                                                      const StateFolder& folder) {
  IdentifierAllocator allocator(store, witness, folder);
  auto document = store.number("next_document_id");
  auto file = store.number("next_file_id");
  auto slot = store.number("next_slot");
  auto spent = store.number("inode_numbers_spent");
  auto spentBelow = store.number("inode_numbers_spent_below");
  for (const auto* number : {&document, &file, &slot, &spent, &spentBelow}) {
    if (!*number) return fail(number->error());
  }
  allocator.savedDocument_ = document->value_or(0);
  allocator.savedFile_ = file->value_or(0);
  allocator.savedSlot_ = slot->value_or(0);
  allocator.nextSlot_ = std::max(upperSlots, allocator.savedSlot_);
  allocator.nextDocument_ = std::max<std::uint64_t>(1, allocator.savedDocument_);
  allocator.nextFile_ = std::max(upperFileIDs, allocator.savedFile_);
  allocator.spentBelow_ = spentBelow->value_or(0);
  allocator.inodesSpent_ = spent->value_or(0) != 0;
  return allocator;
}

Result<std::uint32_t> IdentifierAllocator::nextDocumentID() {
  if (nextDocument_ > std::numeric_limits<std::uint32_t>::max()) {
    return fail(Error::posix(EOVERFLOW, "all document IDs of this volume have been given"));
  }
  if (nextDocument_ >= witness_->documentLimit) {
    auto reserved = reserve(witness_->documentLimit, nextDocument_ + documentBlock);
    if (!reserved) return fail(reserved.error());
  }
  return static_cast<std::uint32_t>(nextDocument_++);
}

Result<std::uint64_t> IdentifierAllocator::nextFileID() {
  if (nextFile_ >= witness_->fileLimit) {
    auto reserved = reserve(witness_->fileLimit, nextFile_ + fileBlock);
    if (!reserved) return fail(reserved.error());
  }
  return nextFile_++;
}

Result<void> IdentifierAllocator::reserve(std::uint64_t& limit, std::uint64_t end) {
  const std::uint64_t before = std::exchange(limit, end);
  auto written = witness_->write(*folder_);
  if (!written) limit = before;
  return written;
}

Result<void> IdentifierAllocator::save() {
  if (nextDocument_ != savedDocument_) {
    if (auto set = store_->setNumber("next_document_id", nextDocument_); !set) return set;
    savedDocument_ = nextDocument_;
  }
  if (nextFile_ != savedFile_) {
    if (auto set = store_->setNumber("next_file_id", nextFile_); !set) return set;
    savedFile_ = nextFile_;
  }
  if (nextSlot_ != savedSlot_) {
    if (auto set = store_->setNumber("next_slot", nextSlot_); !set) return set;
    savedSlot_ = nextSlot_;
  }
  return {};
}

Result<void> IdentifierAllocator::spendInodeNumbers() {
  inodesSpent_ = true;
  nextDocument_ = std::max(nextDocument_, witness_->documentLimit);
  nextFile_ = std::max(nextFile_, witness_->fileLimit);
  return store_->setNumber("inode_numbers_spent", 1);
}

Result<void> IdentifierAllocator::spendInodeNumbersBelow(std::uint64_t limit) {
  if (limit <= spentBelow_) return {};
  spentBelow_ = limit;
  return store_->setNumber("inode_numbers_spent_below", limit);
}

Result<void> IdentifierAllocator::leap() {
  const UUID random = UUID::random();
  nextDocument_ = leapt(nextDocument_, documentEnd, random, 0);
  nextFile_ = leapt(nextFile_, fileEnd, random, 12);
  return spendInodeNumbers();
}

}  // namespace mirabel
