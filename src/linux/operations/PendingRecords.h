#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// A folder by its path and, so that it is found again when that has changed, by its file ID.
struct PendingFolder {
  std::string path;
  std::uint64_t fileID = 0;

  friend bool operator==(const PendingFolder&, const PendingFolder&) = default;
};

/// A folder that may hold what is to be removed: everything whose name begins with the prefix.
struct PendingRemovals {
  PendingFolder folder;
  std::string prefix;

  friend bool operator==(const PendingRemovals&, const PendingRemovals&) = default;
};

/// What a copy is known by when it is met again: nothing else ever has all of these.
struct PendingCopy {
  std::uint64_t inode = 0;
  std::string handle;           ///< empty where the file system has none
  std::uint64_t birthTime = 0;  ///< nanoseconds since 1970; 0 where the file system has none

  friend bool operator==(const PendingCopy&, const PendingCopy&) = default;
};

/// An item on its way from one file system to another. It gets a hidden name, then its copy gets
/// the name that it is to have, and then the item is removed.
struct PendingMove {
  PendingFolder sourceFolder;
  std::string sourceName;
  std::string hiddenSource;
  PendingFolder folder;
  std::string name;
  PendingCopy copy;

  friend bool operator==(const PendingMove&, const PendingMove&) = default;
};

/// An item that has a hidden name while it changes from one spelling of its name to another.
struct PendingRename {
  PendingFolder folder;
  std::string from;
  std::string hidden;
  std::string to;

  friend bool operator==(const PendingRename&, const PendingRename&) = default;
};

/// What has to be cleared away or finished when the process is killed; the contents of the file
/// "pending", see docs/formats/pending-work.md.
struct PendingRecords {
  std::vector<PendingRemovals> removals;
  std::vector<PendingMove> moves;
  std::vector<PendingRename> renames;

  [[nodiscard]] bool isEmpty() const {
    return removals.empty() && moves.empty() && renames.empty();
  }
  /// A digest and a binary property list.
  [[nodiscard]] Result<Data> encode() const;
  /// Nothing for bytes that were not written by `encode`.
  [[nodiscard]] static std::optional<PendingRecords> decode(std::span<const std::uint8_t> bytes);

  friend bool operator==(const PendingRecords&, const PendingRecords&) = default;
};

}  // namespace mirabel
