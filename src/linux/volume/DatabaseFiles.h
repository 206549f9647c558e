#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "linux/volume/StateFolder.h"
#include "mirabel/Error.h"

namespace mirabel {

/// The files of the volume's database as they lie in its state folder, looked at without SQLite.
class DatabaseFiles {
 public:
  /// `folder` outlives it.
  explicit DatabaseFiles(const StateFolder& folder) : folder_(folder) {}

  [[nodiscard]] std::string path() const { return folder_.file("volume.db"); }
  [[nodiscard]] bool exist() const { return has("volume.db"); }
  [[nodiscard]] bool haveLog() const { return has("volume.db-wal"); }
  /// Makes an empty database file, for its owner only, where there is none. POSIX errors.
  [[nodiscard]] Result<void> make() const;

  struct Stamp {
    std::uint64_t size = 0;
    std::int64_t modificationTime = 0;
    friend bool operator==(const Stamp&, const Stamp&) = default;
  };
  [[nodiscard]] std::optional<Stamp> stamp() const;
  /// SQLite's "user version" of the file itself, whatever its log says; 0 when it has none.
  [[nodiscard]] std::uint32_t userVersion() const;

  /// Damage that a process met while it ran is noted for the next one to act on.
  void markAsDamaged() const;
  [[nodiscard]] bool areMarkedAsDamaged() const { return has("damaged"); }
  /// Renames them to "volume.db.damaged-N" and answers the path. POSIX errors.
  [[nodiscard]] Result<std::string> setAside() const;
  [[nodiscard]] bool wereSetAside() const { return has("volume.db.damaged-1"); }

 private:
  [[nodiscard]] bool has(std::string_view name) const;
  const StateFolder& folder_;
};

}  // namespace mirabel
