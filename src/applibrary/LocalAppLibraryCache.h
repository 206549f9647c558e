#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/SerialQueue.h"
#include "foundation/URL.h"
#include "mirabel/Error.h"
#include "platform/ApplicationRegistry.h"
#include "platform/CacheFiles.h"

namespace mirabel {

/// Which cache a manager reads: the one that the registry's refresh writes, or the one that the
/// working set is fed from.
enum class LocalAppLibraryCacheSource { main, workingSet };

/// Its name in logs: "main cache", "working-set cache".
[[nodiscard]] std::string_view rawValue(LocalAppLibraryCacheSource source);

/// The records of the applications that show their documents, in one file in the folder "Mirabel"
/// of the user's application support, with a version token that tells one content from another.
/// Everything happens on the cache's own queue, on the calling thread: any thread may call, and
/// the two caches never wait for each other. Other processes may write the same file.
class LocalAppLibraryCache {
 public:
  /// What a file held. Its token is older than the cache's where another process went back.
  struct Content {
    std::vector<BundleProxy> records;
    std::uint64_t versionToken = 0;
  };
  /// Where the token that is written comes from.
  enum class Increment { no, yes };

  /// Touches nothing yet. `files` outlives the cache.
  LocalAppLibraryCache(CacheFiles& files, LocalAppLibraryCacheSource source);

  /// Of the content that was last loaded or saved; 0 before.
  [[nodiscard]] std::uint64_t versionToken() const;
  void setVersionToken(std::uint64_t token);

  /// Replaces the file, and answers the token written, which is the cache's from then on: the one
  /// given, or, with an increment, the cache's own plus one. Where a number that high was already
  /// given out, by another process or before the file was lost, the next that never was. On disk
  /// when this returns; on an error the former file and token stay. Fatal when the token is
  /// at its largest.
  [[nodiscard]] Result<std::uint64_t> save(const std::vector<BundleProxy>& records,
                                           std::uint64_t versionToken, Increment increment);
  /// Nothing, with a debug line, where no file can be read and understood whole; the file is left
  /// alone. The cache's token takes the file's where that is greater, and never goes down.
  [[nodiscard]] std::optional<Content> load();

  [[nodiscard]] LocalAppLibraryCacheSource source() const { return source_; }
  /// For logs.
  [[nodiscard]] std::string description() const { return std::string(rawValue(source_)); }

 private:
  [[nodiscard]] Result<std::uint64_t> saveOnQueue(const std::vector<BundleProxy>& records,
                                                  std::uint64_t versionToken, Increment increment);
  [[nodiscard]] std::optional<Content> loadOnQueue();
  [[nodiscard]] Result<std::uint64_t> nextVersionToken();

  CacheFiles& files_;
  LocalAppLibraryCacheSource source_;
  mutable SerialQueue queue_;
  URL cacheURL_;
  std::uint64_t _versionToken = 0;  // on queue_
};

/// The caches of one process.
struct AppLibraryCaches {
  explicit AppLibraryCaches(CacheFiles& files)
      : main(files, LocalAppLibraryCacheSource::main),
        workingSet(files, LocalAppLibraryCacheSource::workingSet) {}

  [[nodiscard]] LocalAppLibraryCache& of(LocalAppLibraryCacheSource source) {
    return source == LocalAppLibraryCacheSource::main ? main : workingSet;
  }

  LocalAppLibraryCache main;
  LocalAppLibraryCache workingSet;
};

}  // namespace mirabel
