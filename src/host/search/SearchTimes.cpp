#include "host/search/SearchTimes.h"

namespace mirabel {

Result<void> SearchTimes::load(Database& database) {
  if (isLoaded_) return {};
  auto rows = database.prepare("SELECT place, modified FROM items ORDER BY place");
  if (!rows) return fail(rows.error());
  std::vector<std::int64_t> times;
  while (true) {
    const auto row = rows->step();
    if (!row) return fail(row.error());
    if (!*row) break;
    times.resize(static_cast<std::size_t>(rows->integer(0)), undated);
    times.push_back(rows->isNull(1) ? undated : rows->integer(1));
  }
  times_ = std::move(times);
  isLoaded_ = true;
  return {};
}

void SearchTimes::set(std::int64_t place, std::optional<std::int64_t> time) {
  if (isLoaded_) changes_.emplace_back(place, time.value_or(undated));
}

void SearchTimes::commit() {
  for (const auto& [place, time] : changes_) {
    const auto index = static_cast<std::size_t>(place);
    if (index >= times_.size()) times_.resize(index + 1, undated);
    times_[index] = time;
  }
  changes_.clear();
}

}  // namespace mirabel
