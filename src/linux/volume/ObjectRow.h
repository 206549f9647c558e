#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace mirabel {

/// Sorts of objects as the database numbers them.
enum class ObjectKind : std::uint8_t {
  regular = 0,
  folder = 1,
  symbolicLink = 2,
  other = 3,
  package = 4,
};

[[nodiscard]] constexpr bool isDocumentKind(ObjectKind kind) {
  return kind == ObjectKind::regular || kind == ObjectKind::package;
}

/// Where an object lies: a name in a folder. The roots have the folder 0 and their path as name.
struct Location {
  std::uint64_t folder = 0;  ///< file ID
  std::string name;

  friend bool operator==(const Location&, const Location&) = default;
};

/// One object that the volume has, or had: a row of the table `objects`.
struct ObjectRow {
  /// Key, never used twice. A document that was given its own ID has that as its slot; anything
  /// else has one from `upperSlots` on. Numbers are given as things are met, so a folder's rows lie
  /// together in the order in which it is read. 0: not in the table yet.
  std::uint64_t slot = 0;
  std::uint64_t fileID = 0;
  std::uint32_t documentID = 0;
  ObjectKind kind = ObjectKind::other;
  /// Absent for an object that is not where it was and was not found elsewhere. It keeps its
  /// identity in case it comes back, and its inode number stays spent.
  std::optional<Location> location;
  std::int64_t birthTime = 0;  ///< 0: the file system has none
  std::int64_t changeTime = 0;
  /// Whether the change time was old when it was read, so that an object made later cannot have
  /// the same one.
  bool isSettled = false;
  std::int64_t modificationTime = 0;
  std::uint64_t size = 0;
  std::uint64_t inode = 0;
  std::uint64_t fileSystem = 0;  ///< 0: the volume itself; else what is mounted there
  std::string handle;            ///< empty: the file system has none
};

}  // namespace mirabel
