#include "linux/volume/KeptAttributes.h"

#include <cerrno>
#include <utility>

namespace mirabel {
namespace {

constexpr std::size_t largestValue = 64u << 10;

std::string_view textOf(const Data& bytes) {
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

Result<std::map<std::uint64_t, KeptAttributes::Attributes>> readAll(Database& database) {
  auto statement = database.prepare("SELECT file_id, name, value FROM kept_attributes");
  if (!statement) return fail(statement.error());
  std::map<std::uint64_t, KeptAttributes::Attributes> all;
  for (;;) {
    const auto row = statement->step();
    if (!row) return fail(row.error());
    if (!*row) return all;
    std::optional<Data> value;
    if (!statement->isNull(2)) {
      const std::string_view bytes = statement->blob(2);
      value.emplace(bytes.begin(), bytes.end());
    }
    all[statement->unsignedInteger(0)].emplace(statement->blob(1), std::move(value));
  }
}

Result<void> removeRows(Database& database, std::uint64_t fileID) {
  auto statement = database.prepare("DELETE FROM kept_attributes WHERE file_id = ?1");
  if (!statement) return fail(statement.error());
  return statement->bind(1, fileID).run();
}

}  // namespace

Result<void> KeptAttributes::load(
    const std::function<Result<bool>(std::uint64_t fileID)>& isKnown) {
  return transact_([&](Database& database) -> Result<void> {
    auto all = readAll(database);
    if (!all) return fail(all.error());
    for (auto next = all->begin(); next != all->end();) {
      const auto known = isKnown(next->first);
      if (!known) return fail(known.error());
      if (*known) {
        ++next;
        continue;
      }
      if (auto removed = removeRows(database, next->first); !removed) return removed;
      next = all->erase(next);
    }
    attributes_ = *std::move(all);
    isEmpty_ = attributes_.empty();
    return {};
  });
}

KeptAttributes::Attributes KeptAttributes::of(std::uint64_t fileID) const {
  if (isEmpty_) return {};
  const std::scoped_lock lock(mutex_);
  const auto found = attributes_.find(fileID);
  return found == attributes_.end() ? Attributes() : found->second;
}

Result<void> KeptAttributes::set(std::uint64_t fileID, std::string_view name,
                                 const std::optional<Data>& value) {
  if (value && value->size() > largestValue) return fail(Error::posix(E2BIG));
  const std::scoped_lock writing(writing_);
  auto done = transact_([&](Database& database) -> Result<void> {
    auto statement = database.prepare(
        "INSERT OR REPLACE INTO kept_attributes(file_id, name, value) VALUES(?1,?2,?3)");
    if (!statement) return fail(statement.error());
    statement->bind(1, fileID).bindBlob(2, name);
    if (value) {
      statement->bindBlob(3, textOf(*value));
    } else {
      statement->bindNull(3);
    }
    return statement->run();
  });
  if (!done) return done;
  const std::scoped_lock lock(mutex_);
  attributes_[fileID].insert_or_assign(std::string(name), value);
  isEmpty_ = false;
  return {};
}

Result<void> KeptAttributes::forget(std::uint64_t fileID, std::string_view name) {
  if (isEmpty_) return {};
  const std::scoped_lock writing(writing_);
  if (!of(fileID).contains(name)) return {};
  auto done = transact_([&](Database& database) -> Result<void> {
    auto statement =
        database.prepare("DELETE FROM kept_attributes WHERE file_id = ?1 AND name = ?2");
    if (!statement) return fail(statement.error());
    return statement->bind(1, fileID).bindBlob(2, name).run();
  });
  if (!done) return done;
  const std::scoped_lock lock(mutex_);
  const auto found = attributes_.find(fileID);
  found->second.erase(found->second.find(name));
  if (found->second.empty()) attributes_.erase(found);
  isEmpty_ = attributes_.empty();
  return {};
}

}  // namespace mirabel
