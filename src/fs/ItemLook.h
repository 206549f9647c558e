#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include "fs/HiddenTest.h"
#include "items/LocalItem.h"

namespace mirabel {

/// Builds items of what lies in monitored folders and, where none can be built, tells whether
/// that is because nothing is there. Taking a thing for gone that merely could not be looked at
/// would make a client forget it. Any thread may call it.
class ItemLook {
 public:
  /// What is passed in outlives this.
  ItemLook(const ItemContext& context, const HiddenTest& hiddenTest);

  /// The item at `url`; null when nothing is there any more, or nothing of the monitored folders.
  /// An error says that something is there and why it cannot be told: POSIX.
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> at(const URL& url) const;
  /// The app library whose folder this is; null when it is none's.
  [[nodiscard]] std::shared_ptr<LocalItem> appLibraryAt(const URL& url) const;
  /// What `at` answers for the object of that file ID, wherever it lies now.
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> ofFileID(std::uint64_t fileID) const;
  /// Where the object lies; nothing when there is none.
  [[nodiscard]] Result<std::optional<URL>> placeOf(std::uint64_t fileID) const;

 private:
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> again(const URL& url) const;
  [[nodiscard]] Result<std::optional<URL>> placeAgain(std::uint64_t fileID) const;

  ItemContext context_;
  const HiddenTest& hiddenTest_;
};

}  // namespace mirabel
