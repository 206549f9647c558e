#pragma once

#include <functional>
#include <optional>
#include <set>
#include <shared_mutex>
#include <string>
#include <string_view>
#include <unordered_map>

#include "linux/files/NamePatterns.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {

/// Type identifiers by name and kind, never by contents: MIME types from the desktop's shared
/// database, and the built-in types of packages. Keeps what the database said for an ending, so
/// that asking for each entry of a large folder is cheap; a type that is installed later is seen
/// by the next process. Any thread may call it.
class TypeTable {
 public:
  /// Reads which patterns the database has, from the XDG data directories.
  TypeTable();
  TypeTable(const TypeTable&) = delete;
  TypeTable& operator=(const TypeTable&) = delete;

  /// The type of an object called `name` (bytes, any encoding). "inode/directory" for a folder
  /// that is no package, "application/octet-stream" for a file that the database does not know.
  /// The reference lives as long as the table.
  [[nodiscard]] const std::string& typeOf(std::string_view name, const ObjectStatus& status);

 private:
  struct Hash {
    using is_transparent = void;
    std::size_t operator()(std::string_view text) const {
      return std::hash<std::string_view>{}(text);
    }
  };
  using Endings = std::unordered_map<std::string, const std::string*, Hash, std::equal_to<>>;

  const std::string& fileType(std::string_view name);
  /// Nothing for an ending not met before; null for one that does not decide alone.
  std::optional<const std::string*> typeForEnding(std::string_view ending);
  const std::string& askDatabase(std::string_view name);
  const std::string& kept(std::string type);
  void keep(std::string_view ending, const std::string* type);

  NamePatterns patterns_;
  std::shared_mutex mutex_;
  Endings endings_;
  std::set<std::string> types_;  // nodes stay where they are
};

}  // namespace mirabel
