#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "linux/apps/DesktopEntry.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {

/// What was found where an entry should be: the entry; or why there is none to be had; or nothing
/// at all, where nothing is there.
struct EntryReading {
  std::shared_ptr<const DesktopEntry> entry;
  std::string_view reason;  ///< of static storage; empty unless something is there

  [[nodiscard]] bool isAbsent() const { return entry == nullptr && reason.empty(); }
};

/// Reads desktop entries, and keeps what it read until the file changes. Any thread may call it.
class EntryReader {
 public:
  /// `languages` as `languagesOf` makes them. Files of more than `mostBytes` are not read.
  EntryReader(std::vector<std::string> languages, std::size_t mostBytes);

  /// The path may be that of a link to a regular file. Errors: passing ones, see
  /// `LookFailure`.
  [[nodiscard]] Result<EntryReading> read(const std::string& path);

  /// To be called after each look at many entries: drops what none of the last such looks read.
  void endPass();

 private:
  struct Kept {
    ObjectStatus status;
    EntryReading reading;
    std::uint64_t pass;
  };
  [[nodiscard]] bool findKept(const std::string& path, const ObjectStatus& now,
                              EntryReading& reading);
  void keep(const std::string& path, const ObjectStatus& status, const EntryReading& reading);
  [[nodiscard]] Result<EntryReading> readAnew(const std::string& path, ObjectStatus& status) const;

  const std::vector<std::string> languages_;
  const std::size_t mostBytes_;
  std::mutex mutex_;
  std::unordered_map<std::string, Kept> kept_;
  std::uint64_t pass_ = 0;
};

}  // namespace mirabel
