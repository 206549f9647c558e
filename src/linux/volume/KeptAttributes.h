#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "linux/volume/Database.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// Extended attributes that the volume's database keeps for objects which can't hold them
/// themselves, by file ID, and what else is remembered of an object under a name. They go with the
/// object through every rename, and are on disk when a call has returned. All of them are held in
/// memory too: they are few. Any thread may call it.
class KeptAttributes {
 public:
  /// Runs work on the database in a transaction, under the lock of the index.
  using Transact =
      std::function<Result<void>(const std::function<Result<void>(Database& database)>&)>;
  explicit KeptAttributes(Transact transact) : transact_(std::move(transact)) {}

  /// By name. A name without a value: the object has no such attribute, whatever it says itself.
  using Attributes = std::map<std::string, std::optional<Data>, std::less<>>;

  /// Reads the table "kept_attributes". `isKnown` says whether there still is an object of a file
  /// ID; what is kept of others goes. Errors of `ErrorDomain::store`.
  [[nodiscard]] Result<void> load(const std::function<Result<bool>(std::uint64_t fileID)>& isKnown);

  /// Quick; nothing is kept on most volumes.
  [[nodiscard]] bool isEmpty() const { return isEmpty_; }
  [[nodiscard]] Attributes of(std::uint64_t fileID) const;
  /// Errors of `ErrorDomain::store`; POSIX E2BIG for a value that is larger than any that is meant.
  [[nodiscard]] Result<void> set(std::uint64_t fileID, std::string_view name,
                                 const std::optional<Data>& value);
  /// From now on the object speaks for itself.
  [[nodiscard]] Result<void> forget(std::uint64_t fileID, std::string_view name);

 private:
  Transact transact_;
  std::mutex writing_;        ///< one writer at a time, held while the database is written
  mutable std::mutex mutex_;  ///< of what follows
  std::map<std::uint64_t, Attributes> attributes_;
  std::atomic<bool> isEmpty_ = true;
};

}  // namespace mirabel
