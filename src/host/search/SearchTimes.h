#pragma once

#include <cstdint>
#include <limits>
#include <optional>
#include <utility>
#include <vector>

#include "linux/volume/Database.h"
#include "mirabel/Error.h"

namespace mirabel {

/// When the items of a search index were modified, by their places: eight bytes in memory for each,
/// so that the newest of very many can be told without reading their rows. Used under the lock of
/// the index.
class SearchTimes {
 public:
  static constexpr std::int64_t undated = std::numeric_limits<std::int64_t>::min();

  /// Reads them all, unless that was done.
  [[nodiscard]] Result<void> load(Database& database);
  [[nodiscard]] std::int64_t at(std::int64_t place) const {
    const auto index = static_cast<std::size_t>(place);
    return index < times_.size() ? times_[index] : undated;
  }

  /// What a transaction changes counts once it is committed.
  void set(std::int64_t place, std::optional<std::int64_t> time);
  void commit();
  void rollBack() { changes_.clear(); }

 private:
  bool isLoaded_ = false;
  std::vector<std::int64_t> times_;
  std::vector<std::pair<std::int64_t, std::int64_t>> changes_;
};

}  // namespace mirabel
