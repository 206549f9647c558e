#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "mirabel/Error.h"

struct sqlite3;
struct sqlite3_stmt;

namespace mirabel {

/// A prepared statement: bind, step, read columns, reset, again. Views of columns live until the
/// next step or reset.
class Statement {
 public:
  explicit Statement(sqlite3_stmt* handle) : handle_(handle) {}
  Statement(Statement&& other) noexcept : handle_(std::exchange(other.handle_, nullptr)) {}
  Statement& operator=(Statement&& other) noexcept {
    std::swap(handle_, other.handle_);
    return *this;
  }
  ~Statement();

  Statement& bind(int index, std::int64_t value);
  Statement& bind(int index, std::uint64_t value) {
    return bind(index, static_cast<std::int64_t>(value));
  }
  Statement& bindBlob(int index, std::string_view bytes);
  Statement& bindNull(int index);
  template <class T>
  Statement& bind(int index, const std::optional<T>& value) {
    return value ? bind(index, static_cast<std::int64_t>(*value)) : bindNull(index);
  }

  /// Whether there is a row to read.
  [[nodiscard]] Result<bool> step();
  /// Steps to the end and resets.
  [[nodiscard]] Result<void> run();
  void reset();

  [[nodiscard]] bool isNull(int column) const;
  [[nodiscard]] std::int64_t integer(int column) const;
  [[nodiscard]] std::uint64_t unsignedInteger(int column) const {
    return static_cast<std::uint64_t>(integer(column));
  }
  [[nodiscard]] std::string_view blob(int column) const;

 private:
  sqlite3_stmt* handle_;
};

/// A connection to one SQLite database in WAL mode, fully synchronous, locked for this process
/// alone. Each page has a sum of its own, see PageSums.h: reading one that was damaged fails with
/// SQLITE_CORRUPT. The write-ahead log stays beside the database when that is closed. Used under
/// the lock of its owner.
class Database {
 public:
  /// Opens or creates. Errors, here and below: POSIX ENOSPC or EDQUOT for want of room, after which
  /// all is as before; EBUSY; else `ErrorDomain::store` with SQLite's result code.
  [[nodiscard]] static Result<std::unique_ptr<Database>> open(const std::string& path);
  ~Database();
  Database(const Database&) = delete;
  Database& operator=(const Database&) = delete;

  [[nodiscard]] Result<void> begin();
  [[nodiscard]] Result<void> commit();
  /// Runs statements that answer nothing.
  [[nodiscard]] Result<void> execute(const char* sql);
  [[nodiscard]] Result<Statement> prepare(std::string_view sql);
  [[nodiscard]] Error lastError() const;
  /// How many rows were written since it was opened.
  [[nodiscard]] std::int64_t changeCount() const;
  /// Whether a damaged page was met.
  [[nodiscard]] bool metDamage() const;
  /// Gives back what it keeps in memory of pages; they are read again where they are needed.
  void releaseMemory();
  /// How many pages the write-ahead log held after the last commit; it grows until a checkpoint.
  [[nodiscard]] int logPages() const { return logPages_; }
  /// Moves all that the write-ahead log holds into the database, durably; then the log is begun
  /// anew by the next write, or at once.
  enum class Log { kept, emptied };
  [[nodiscard]] Result<void> checkpoint(Log log);

 private:
  explicit Database(sqlite3* handle) : handle_(handle) {}
  [[nodiscard]] Result<void> runKept(std::optional<Statement>& statement, const char* sql);

  sqlite3* handle_;
  std::optional<Statement> begin_;
  std::optional<Statement> commit_;
  int logPages_ = 0;
};

/// Resets a statement at the end of a scope, so that it holds no read lock.
class StatementScope {
 public:
  explicit StatementScope(Statement& statement) : statement_(statement) {}
  ~StatementScope() { statement_.reset(); }
  StatementScope(const StatementScope&) = delete;
  StatementScope& operator=(const StatementScope&) = delete;

 private:
  Statement& statement_;
};

}  // namespace mirabel
