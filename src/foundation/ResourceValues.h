#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <variant>

#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

class URL;

/// What can be asked of a file through its URL's resource cache.
enum class ResourceKey {
  name,                     ///< string: the last path component, bytes as on disk
  typeIdentifier,           ///< string: a MIME type
  fileSize,                 ///< number: bytes; regular files and symbolic links only
  creationDate,             ///< date
  contentModificationDate,  ///< date
  isDirectory,              ///< boolean; true for packages too
  isPackage,                ///< boolean: a folder that is shown as one document
  isWritable,               ///< boolean: this process may write it
  isReachable,              ///< boolean: something is there
  fileIdentifier,           ///< number: the file ID
  documentIdentifier,       ///< number: the document ID, absent when none was assigned yet
  linkCount,                ///< number: how many names it has on its file system; 1 for a folder
};

/// The key's name as messages print it ("documentIdentifier").
std::string_view nameOf(ResourceKey key);

/// Absent, or a value of one of the five types that resources have.
using ResourceValue = std::variant<std::monostate, std::string, Number, Date, bool, Data>;

/// What sort of thing a name on disk is.
enum class FileKind : std::uint8_t { regular, folder, symbolicLink, other };

/// Everything that one look at a file tells; filled by the platform in one go.
struct ResourceValues {
  FileKind kind = FileKind::regular;
  bool isPackage = false;
  bool isWritable = false;
  std::uint64_t fileID = 0;
  std::uint32_t documentID = 0;  ///< 0: none assigned yet
  std::uint32_t linkCount = 1;   ///< 1 for a folder
  std::uint64_t size = 0;
  std::optional<Date> creationDate = {};
  std::optional<Date> contentModificationDate = {};
  std::string typeIdentifier = {};
};

/// The value of one key as a look at a file of that name tells it.
[[nodiscard]] ResourceValue resourceValue(const ResourceValues& values, ResourceKey key,
                                          std::string_view name);

/// Where resource values come from. Implemented by the platform; any thread may call it.
class ResourceValueSource {
 public:
  virtual ~ResourceValueSource() = default;

  /// One look at the object that `url` names, a final symbolic link not followed. Errors: the
  /// file error `noSuchFile` where nothing is there, else a POSIX error.
  [[nodiscard]] virtual Result<ResourceValues> readValues(const URL& url) = 0;

  /// Whether a folder of that name can be a package at all. False spares a look, and is for ever.
  [[nodiscard]] virtual bool mayBePackage(std::string_view name) const {
    static_cast<void>(name);
    return true;
  }

  /// Looks at many names at once and leaves what it saw in the resource caches of `urls`
  /// (values and attribute names). The URLs should be children of few folders. A URL that cannot
  /// be looked at keeps an empty cache: the next read of it tells the error. Returning means that
  /// every identity handed out is on disk. Errors: only those that concern all of them, such as a
  /// database that cannot be written.
  [[nodiscard]] virtual Result<void> prefetch(std::span<const URL> urls) = 0;
};

/// Typed readers over a source, through each URL's cache. Each answers nothing for an absent
/// value and, silently, for a value of another type; a failed read is logged at error level.
class ResourceReader {
 public:
  explicit ResourceReader(ResourceValueSource& source) : source_(source) {}

  [[nodiscard]] std::optional<std::string> string(ResourceKey key, const URL& url) const;
  [[nodiscard]] std::optional<Number> number(ResourceKey key, const URL& url) const;
  [[nodiscard]] std::optional<Date> date(ResourceKey key, const URL& url) const;
  [[nodiscard]] std::optional<bool> boolean(ResourceKey key, const URL& url) const;
  [[nodiscard]] std::optional<Data> data(ResourceKey key, const URL& url) const;

  /// The value whatever its type, with the error instead of a log line. Fills the URL's cache
  /// on the first call.
  [[nodiscard]] Result<ResourceValue> value(ResourceKey key, const URL& url) const;

  /// See `ResourceValueSource`.
  [[nodiscard]] bool mayBePackage(std::string_view name) const {
    return source_.mayBePackage(name);
  }

 private:
  ResourceValueSource& source_;
};

}  // namespace mirabel
